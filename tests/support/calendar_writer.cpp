// SPDX-License-Identifier: Apache-2.0
//
// A second process that works on the calendar of the current directory: "calendar_writer BOOK
// COUNT" connects and inserts that many events into the book. Exits with 0, or 1 after naming the
// failure.
#include <cstdio>
#include <cstdlib>

#include "platform/include/calendar_service.h"

namespace {

int insert_event(int book) {
    calendar_record_h event = nullptr;
    int rc = calendar_record_create(_calendar_event._uri, &event);
    if (rc != CALENDAR_ERROR_NONE) {
        return rc;
    }
    rc = calendar_record_set_int(event, _calendar_event.calendar_book_id, book);
    if (rc == CALENDAR_ERROR_NONE) {
        rc = calendar_db_insert_record(event, nullptr);
    }
    static_cast<void>(calendar_record_destroy(event, true));  // a record of its own: cannot fail
    return rc;
}

}  // namespace

int main(int argc, char** argv) {
    const int book = argc > 1 ? std::atoi(argv[1]) : 0;
    const int count = argc > 2 ? std::atoi(argv[2]) : 0;
    int rc = calendar_connect();
    for (int i = 0; i < count && rc == CALENDAR_ERROR_NONE; ++i) {
        rc = insert_event(book);
    }
    if (rc == CALENDAR_ERROR_NONE) {
        rc = calendar_disconnect();
    }
    if (rc != CALENDAR_ERROR_NONE) {
        std::fprintf(stderr, "calendar_writer: %d\n", rc);
    }
    return rc == CALENDAR_ERROR_NONE ? 0 : 1;
}
