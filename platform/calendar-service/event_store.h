// SPDX-License-Identifier: Apache-2.0
//
// Events in the store: the event with its alarms, its place (book and parent), its changes. Used
// within a transaction, under the service's mutex. Everything here throws Failure.
#pragma once

#include "platform/calendar-service/list.h"
#include "platform/calendar-service/query.h"
#include "platform/calendar-service/record.h"
#include "platform/calendar-service/store.h"

namespace device {

int insert_event(Store& store, const calendar_record& event, int version);

// Writes the record over the event of its id.
void update_event(Store& store, const calendar_record& event, int version);

// Writes the record over an event, which keeps its book and parent where the record has none.
void replace_event(Store& store, const calendar_record& event, int id, int version);

void delete_event(Store& store, int id, int version);

// Deletes the events of a book, and their exceptions. Whether there were any.
bool delete_events_of_book(Store& store, int book_id, int version);

RecordOwner read_event(Store& store, int id);  // with all its children
std::unique_ptr<calendar_list> read_events(Store& store, const Selection& selection);
std::unique_ptr<calendar_list> read_changes(Store& store, int book_id, int version);

}  // namespace device
