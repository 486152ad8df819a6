// SPDX-License-Identifier: Apache-2.0
//
// Books in the store. Used within a transaction, under the service's mutex. Everything here throws
// Failure.
#pragma once

#include "platform/calendar-service/list.h"
#include "platform/calendar-service/query.h"
#include "platform/calendar-service/record.h"
#include "platform/calendar-service/store.h"

namespace device {

int insert_book(Store& store, const calendar_record& book);
void update_book(Store& store, const calendar_record& book, int id);
bool delete_book(Store& store, int id, int version);  // whether events went with it
RecordOwner read_book(Store& store, int id);
std::unique_ptr<calendar_list> read_books(Store& store, const Selection& selection);

}  // namespace device
