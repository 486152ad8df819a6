// SPDX-License-Identifier: Apache-2.0
//
// Lists of records with a current position. One thread at a time.
#pragma once

#include <cstddef>
#include <memory>
#include <vector>

#include "platform/calendar-service/record.h"
#include "platform/include/calendar_service.h"

struct calendar_list {
    calendar_list() = default;
    ~calendar_list();  // destroys the records that it still holds
    calendar_list(const calendar_list&) = delete;
    calendar_list& operator=(const calendar_list&) = delete;

    void append(device::RecordOwner record);  // throws std::bad_alloc, freeing the record

    std::vector<calendar_record_h> records;
    size_t current = 0;  // the number of records when past the last
};
