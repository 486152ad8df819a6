// SPDX-License-Identifier: Apache-2.0
//
// Queries and filters: which books or events are wanted. One thread at a time.
#pragma once

#include <string>
#include <vector>

#include "platform/calendar-service/store.h"
#include "platform/calendar-service/view.h"
#include "platform/include/calendar_service.h"

namespace device {

struct Condition {
    unsigned int property_id;
    int value;
};

// What a query asks for, as the end of an SQL text and the values bound to it.
struct Selection {
    const View& view;
    const std::vector<Condition>& conditions;  // all must hold
    int offset;
    int limit;  // 0: all

    std::string clauses() const;
    void bind(Run* run) const;
};

}  // namespace device

struct calendar_filter {
    const device::View& view;
    std::vector<device::Condition> conditions;
    bool complete = true;  // false after an operator, until the next condition
};

struct calendar_query {
    const device::View& view;
    std::vector<device::Condition> conditions;
};
