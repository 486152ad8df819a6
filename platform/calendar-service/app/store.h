// SPDX-License-Identifier: Apache-2.0
//
// The device's calendar store as the commands use it. Everything fails with a Failure that names
// the item. Nothing is kept between calls but the connection.
#pragma once

#include <string>
#include <vector>

#include "platform/calendar-service/app/event.h"

namespace calendar_app {

struct Book {
    int id = 0;
    int account_id = 0;  // 0: local
    int type = 0;        // calendar_book_type_e
    calendar_text::Text name;
    calendar_text::Text description;
};

// Connects on construction, after the device's folders were made and entered.
class Connection {
  public:
    explicit Connection(const std::string& device);
    ~Connection();
    Connection(const Connection&) = delete;
    Connection& operator=(const Connection&) = delete;
};

std::vector<Book> read_books();

// The book that new events go to: an account's event book before a local one; made when there is
// none.
int default_book();
Book find_book(int id);

std::vector<calendar_text::Event> read_all_events(int book_id);
calendar_text::Event find_event(int id);

// The exceptions of an event, in the order of their ids.
std::vector<calendar_text::Event> exceptions_of(int id);

int insert_event(const calendar_text::Event& event);
void replace_event(const calendar_text::Event& event);
void delete_event(int id);

// Writes the list of cancelled occurrences of an event and nothing else of it.
void write_exdate(int id, const calendar_text::Text& exdate);

}  // namespace calendar_app
