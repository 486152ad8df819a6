// SPDX-License-Identifier: Apache-2.0
//
// Books in SQL.
#include "platform/calendar-service/book_store.h"

#include "platform/calendar-service/event_store.h"
#include "platform/calendar-service/row.h"

namespace device {

namespace {

// The stored properties, in the order of the view.
#define BOOK_COLUMNS "name, description, account_id, store_type"

constexpr char kInsert[] = "INSERT INTO books(" BOOK_COLUMNS ") VALUES(?,?,?,?)";
constexpr char kUpdate[] = "UPDATE books SET (" BOOK_COLUMNS ") = (?,?,?,?) WHERE id = ?";
constexpr char kSelect[] = "SELECT id, " BOOK_COLUMNS " FROM books WHERE id = ?1";
constexpr char kSelectMatching[] = "SELECT id, " BOOK_COLUMNS " FROM books";
constexpr char kDelete[] = "DELETE FROM books WHERE id = ?1";

void bind_book(Run* run, const calendar_record& book) {
    for (size_t i = index_of(_calendar_book.id) + 1; i < kBookView.properties.size(); ++i) {
        bind_value(run, kBookView.properties[i].type, book.values[i]);
    }
}

RecordOwner read_row(Run* row) {
    RecordOwner book = make_record(kBookView);
    for (size_t i = 0; i < kBookView.properties.size(); ++i) {
        read_value(row, kBookView.properties[i].type, &book->values[i]);
    }
    return book;
}

void require_change(const Store& store) {
    if (sqlite3_changes(store.handle()) == 0) {
        throw Failure{CALENDAR_ERROR_NO_DATA};
    }
}

}  // namespace

int insert_book(Store& store, const calendar_record& book) {
    Run run(store, kInsert);
    bind_book(&run, book);
    run.finish();
    return inserted_id(store);
}

void update_book(Store& store, const calendar_record& book, int id) {
    Run run(store, kUpdate);
    bind_book(&run, book);
    run.bind(id).finish();
    require_change(store);
}

bool delete_book(Store& store, int id, int version) {
    Run(store, kDelete).bind(id).finish();
    require_change(store);
    return delete_events_of_book(store, id, version);
}

RecordOwner read_book(Store& store, int id) {
    Run run(store, kSelect);
    if (!run.bind(id).next()) {
        throw Failure{CALENDAR_ERROR_NO_DATA};
    }
    return read_row(&run);
}

std::unique_ptr<calendar_list> read_books(Store& store, const Selection& selection) {
    auto list = std::make_unique<calendar_list>();
    const StatementOwner statement = store.prepare(kSelectMatching + selection.clauses());
    Run run(store, statement.get());
    selection.bind(&run);
    while (run.next()) {
        list->append(read_row(&run));
    }
    return list;
}

}  // namespace device
