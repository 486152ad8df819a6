// SPDX-License-Identifier: Apache-2.0
#include "platform/calendar-service/app/store.h"

#include <filesystem>

#include "platform/calendar-service/app/app.h"

namespace calendar_app {
namespace {

using calendar_text::Event;
using calendar_text::ListOwner;
using calendar_text::RecordOwner;

constexpr char kLocalBookName[] = "My Calendar";

std::string reason(int rc) {
    switch (rc) {
        case CALENDAR_ERROR_OUT_OF_MEMORY:
            return "out of memory";
        case CALENDAR_ERROR_NO_DATA:
            return "it does not exist";
        case CALENDAR_ERROR_FILE_NO_SPACE:
            return "the disk is full; free some space and try again";
        case CALENDAR_ERROR_DB_LOCKED:
            return "another program keeps the calendar locked; try again";
        case CALENDAR_ERROR_DB_FAILED:
            return "the calendar store cannot be read or written; check the files under opt/usr";
        default:
            return fmt::format("the calendar service answered {}", rc);
    }
}

void check(int rc, const std::string& doing) {
    if (rc != CALENDAR_ERROR_NONE) {
        fail(Exit::kFailed, "{}: {}", doing, reason(rc));
    }
}

calendar_text::Text text_of(calendar_record_h record, unsigned int property, int* rc) {
    char* text = nullptr;
    *rc = *rc != 0 ? *rc : calendar_record_get_str_p(record, property, &text);
    return text == nullptr ? calendar_text::Text() : calendar_text::Text(text);
}

Book book_of(calendar_record_h record) {
    Book book;
    int rc = calendar_record_get_int(record, _calendar_book.id, &book.id);
    rc =
        rc != 0 ? rc : calendar_record_get_int(record, _calendar_book.account_id, &book.account_id);
    rc = rc != 0 ? rc : calendar_record_get_int(record, _calendar_book.store_type, &book.type);
    book.name = text_of(record, _calendar_book.name, &rc);
    book.description = text_of(record, _calendar_book.description, &rc);
    check(rc, "reading a calendar book");
    return book;
}

int make_local_book() {
    const std::string doing = fmt::format("making the book \"{}\"", kLocalBookName);
    calendar_record_h made = nullptr;
    check(calendar_record_create(_calendar_book._uri, &made), doing);
    const RecordOwner record(made);
    check(calendar_record_set_str(made, _calendar_book.name, kLocalBookName), doing);
    check(calendar_record_set_int(made, _calendar_book.store_type, CALENDAR_BOOK_TYPE_EVENT),
          doing);
    int id = 0;
    check(calendar_db_insert_record(made, &id), doing);
    return id;
}

RecordOwner fetch_event(int id) {
    calendar_record_h made = nullptr;
    const int rc = calendar_db_get_record(_calendar_event._uri, id, &made);
    if (rc == CALENDAR_ERROR_NO_DATA) {
        fail(Exit::kFailed, "there is no event {}; see 'qor-calendar list'", id);
    }
    check(rc, fmt::format("reading event {}", id));
    return RecordOwner(made);
}

RecordOwner record_of(const Event& event) {
    RecordOwner record;
    check(calendar_text::make_record(event, &record), "making an event record");
    return record;
}

}  // namespace

Connection::Connection(const std::string& device) {
    std::error_code error;
    for (const char* folder : {"opt/usr/data/cloud-qor", "opt/usr/dbspace"}) {
        std::filesystem::create_directories(std::filesystem::path(device) / folder, error);
        if (error) {
            fail(Exit::kFailed, "cannot make the folder {} of the device \"{}\": {}", folder,
                 device, error.message());
        }
    }
    std::filesystem::current_path(device, error);
    if (error) {
        fail(Exit::kFailed, "cannot enter the device \"{}\": {}", device, error.message());
    }
    check(calendar_connect(), fmt::format("opening the calendar of the device \"{}\"", device));
}

Connection::~Connection() {
    static_cast<void>(calendar_disconnect());
}

std::vector<Book> read_books() {
    calendar_query_h query = nullptr;
    check(calendar_query_create(_calendar_book._uri, &query), "listing the books");
    calendar_list_h made = nullptr;
    const int rc = calendar_db_get_records_with_query(query, 0, 0, &made);
    static_cast<void>(calendar_query_destroy(query));
    check(rc, "listing the books");
    const ListOwner list(made);
    std::vector<Book> books;
    for (int at = calendar_list_first(made); at == CALENDAR_ERROR_NONE;
         at = calendar_list_next(made)) {
        calendar_record_h record = nullptr;
        check(calendar_list_get_current_record_p(made, &record), "listing the books");
        books.push_back(book_of(record));
    }
    return books;
}

int default_book() {
    int local = 0;
    for (const Book& book : read_books()) {
        if (book.type == CALENDAR_BOOK_TYPE_EVENT && book.account_id > 0) {
            return book.id;
        }
        if (book.type == CALENDAR_BOOK_TYPE_EVENT && local == 0) {
            local = book.id;
        }
    }
    return local != 0 ? local : make_local_book();
}

Book find_book(int id) {
    for (Book& book : read_books()) {
        if (book.id == id) {
            return std::move(book);
        }
    }
    fail(Exit::kFailed, "there is no book {}; see 'qor-calendar books'", id);
}

std::vector<Event> read_all_events(int book_id) {
    std::vector<Event> events;
    check(calendar_text::read_events(book_id, &events), "reading the events");
    return events;
}

Event find_event(int id) {
    Event event;
    const RecordOwner record = fetch_event(id);
    check(calendar_text::read_event(record.get(), &event), fmt::format("reading event {}", id));
    return event;
}

std::vector<Event> exceptions_of(int id) {
    const std::string doing = fmt::format("reading the exceptions of event {}", id);
    const RecordOwner record = fetch_event(id);
    int count = 0;
    check(calendar_record_get_child_record_count(record.get(), _calendar_event.exception, &count),
          doing);
    std::vector<Event> exceptions(static_cast<std::size_t>(count));
    for (int i = 0; i < count; ++i) {
        calendar_record_h child = nullptr;
        check(calendar_record_get_child_record_at_p(record.get(), _calendar_event.exception, i,
                                                    &child),
              doing);
        check(calendar_text::read_event(child, &exceptions[static_cast<std::size_t>(i)]), doing);
    }
    return exceptions;
}

int insert_event(const Event& event) {
    const RecordOwner record = record_of(event);
    int id = 0;
    check(calendar_db_insert_record(record.get(), &id),
          fmt::format("storing \"{}\"", calendar_text::text_or_empty(event.title)));
    return id;
}

void replace_event(const Event& event) {
    const RecordOwner record = record_of(event);
    check(calendar_db_replace_record(record.get(), event.id),
          fmt::format("changing event {}", event.id));
}

void delete_event(int id) {
    const int rc = calendar_db_delete_record(_calendar_event._uri, id);
    if (rc == CALENDAR_ERROR_NO_DATA) {
        fail(Exit::kFailed, "there is no event {}; see 'qor-calendar list'", id);
    }
    check(rc, fmt::format("deleting event {}", id));
}

void write_exdate(int id, const calendar_text::Text& exdate) {
    const std::string doing = fmt::format("changing the cancelled occurrences of event {}", id);
    const RecordOwner record = fetch_event(id);
    check(calendar_record_set_str(record.get(), _calendar_event.exdate,
                                  exdate ? exdate->c_str() : nullptr),
          doing);
    check(calendar_db_update_record(record.get()), doing);
}

}  // namespace calendar_app
