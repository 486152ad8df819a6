// SPDX-License-Identifier: Apache-2.0
//
// A record's values as columns of a statement.
#pragma once

#include "platform/calendar-service/record.h"
#include "platform/calendar-service/store.h"

namespace device {

void bind_value(Run* run, Type type, const Value& value);
void read_value(Run* run, Type type, Value* value);

// The id of the row that the last statement inserted.
int inserted_id(Store& store);

}  // namespace device
