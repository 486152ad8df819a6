// SPDX-License-Identifier: Apache-2.0
//
// Events, their alarms and their changes in SQL.
#include "platform/calendar-service/event_store.h"

#include <utility>
#include <vector>

#include "platform/calendar-service/row.h"

namespace device {

namespace {

// The stored properties, in the order of the view.
#define EVENT_COLUMNS                                                                          \
    "calendar_book_id, summary, description, location, sensitivity, latitude, longitude, "     \
    "organizer_name, organizer_email, start_time, start_tzid, end_time, end_tzid, freq, "      \
    "range_type, until_time, count, interval, bysecond, byminute, byhour, byday, bymonthday, " \
    "byyearday, byweekno, bymonth, bysetpos, wkst, exdate, recurrence_id, original_event_id, " \
    "has_alarm"
#define EVENT_MARKS "?,?,?,?,?,?,?,?,?,?,?,?,?,?,?,?,?,?,?,?,?,?,?,?,?,?,?,?,?,?,?,?"

constexpr char kInsert[] =
    "INSERT INTO events(" EVENT_COLUMNS ", version, modified_status) VALUES(" EVENT_MARKS ",?,0)";
constexpr char kUpdate[] = "UPDATE events SET (" EVENT_COLUMNS
                           ", version, modified_status) = (" EVENT_MARKS ",?,1) WHERE id = ?";
constexpr char kSelect[] = "SELECT id, " EVENT_COLUMNS " FROM events WHERE id = ?1";
constexpr char kSelectExceptions[] =
    "SELECT id, " EVENT_COLUMNS " FROM events WHERE original_event_id = ?1 ORDER BY id";
constexpr char kSelectMatching[] = "SELECT id, " EVENT_COLUMNS " FROM events";

constexpr char kSelectPlace[] =
    "SELECT calendar_book_id, original_event_id FROM events WHERE id = ?1";
constexpr char kSelectBook[] = "SELECT 1 FROM books WHERE id = ?1";
constexpr char kSelectAnyException[] = "SELECT 1 FROM events WHERE original_event_id = ?1 LIMIT 1";
constexpr char kTouch[] = "UPDATE events SET version = ?2, modified_status = 1 WHERE id = ?1";

constexpr char kSelectAlarms[] =
    "SELECT tick, tick_unit FROM alarms WHERE event_id = ?1 ORDER BY position";
constexpr char kInsertAlarm[] =
    "INSERT INTO alarms(event_id, position, tick, tick_unit) VALUES(?1,?2,?3,?4)";
constexpr char kDeleteAlarms[] = "DELETE FROM alarms WHERE event_id = ?1";

// An event that moves to another book counts as deleted in the one that it left, and its exceptions
// in that book go with it.
constexpr char kSelectExceptionsInBook[] =
    "SELECT id FROM events WHERE original_event_id = ?1 AND calendar_book_id = ?2";
constexpr char kMove[] =
    "UPDATE events SET calendar_book_id = ?2, version = ?3, modified_status = 1 WHERE id = ?1";
constexpr char kBury[] =
    "INSERT INTO deleted_events(event_id, calendar_book_id, version) VALUES(?1,?2,?3)";
constexpr char kUnbury[] =
    "DELETE FROM deleted_events WHERE event_id = ?1 AND calendar_book_id = ?2";

// Deletion of an event with its exceptions, and of a book's events with theirs.
#define OF_EVENT "(id = ?1 OR original_event_id = ?1)"
#define OF_BOOK                                                                    \
    "(calendar_book_id = ?1 OR original_event_id IN (SELECT id FROM events WHERE " \
    "calendar_book_id = ?1))"
#define TOUCH_PARENTS(of)                                                                        \
    "UPDATE events SET version = ?2, modified_status = 1 WHERE id IN (SELECT original_event_id " \
    "FROM events WHERE " of ") AND NOT " of
#define BURY(of)                                                                  \
    "INSERT INTO deleted_events(event_id, calendar_book_id, version) SELECT id, " \
    "calendar_book_id, ?2 FROM events WHERE " of
#define DELETE_ALARMS(of) \
    "DELETE FROM alarms WHERE event_id IN (SELECT id FROM events WHERE " of ")"
#define DELETE(of) "DELETE FROM events WHERE " of

struct Deletion {
    const char* touch_parents;
    const char* bury;
    const char* delete_alarms;
    const char* delete_events;
};
constexpr Deletion kOfEvent = {TOUCH_PARENTS(OF_EVENT), BURY(OF_EVENT), DELETE_ALARMS(OF_EVENT),
                               DELETE(OF_EVENT)};
constexpr Deletion kOfBook = {TOUCH_PARENTS(OF_BOOK), BURY(OF_BOOK), DELETE_ALARMS(OF_BOOK),
                              DELETE(OF_BOOK)};

// Within one write, parents come before their exceptions, which have higher ids, but deleted
// exceptions before their deleted parent: a reader that forgets the exceptions together with their
// parent has then dealt with each of them.
constexpr char kSelectChanges[] =
    "SELECT id, modified_status, calendar_book_id, version, id AS place FROM events "
    "WHERE calendar_book_id = ?1 AND version > ?2 "
    "UNION ALL SELECT event_id, 2, calendar_book_id, version, -event_id FROM deleted_events "
    "WHERE calendar_book_id = ?1 AND version > ?2 ORDER BY 4, 5";

// Where an event stands.
struct Place {
    int book_id;
    int parent_id;  // 0: none
};

bool exists(Store& store, const char* sql, int id) {
    return Run(store, sql).bind(id).next();
}

bool find_place(Store& store, int id, Place* out_place) {
    Run run(store, kSelectPlace);
    if (!run.bind(id).next()) {
        return false;
    }
    *out_place = {run.integer(), run.integer()};
    return true;
}

Place place_of(const calendar_record& event) {
    return {event.at(_calendar_event.calendar_book_id).integer,
            event.at(_calendar_event.original_event_id).integer};
}

// Fails for a place that an event cannot have; the id is 0 for a new event.
void check_place(Store& store, int id, const Place& place) {
    if (!exists(store, kSelectBook, place.book_id)) {
        throw Failure{CALENDAR_ERROR_NO_DATA};
    }
    if (place.parent_id == 0) {
        return;
    }
    Place parent{};
    if (!find_place(store, place.parent_id, &parent)) {
        throw Failure{CALENDAR_ERROR_NO_DATA};
    }
    const bool is_parent = id != 0 && exists(store, kSelectAnyException, id);
    if (place.parent_id == id || parent.parent_id != 0 || is_parent) {
        throw Failure{CALENDAR_ERROR_INVALID_PARAMETER};  // exceptions have no exceptions
    }
}

const Children& alarms_of(const calendar_record& event) {
    static const Children kNone;
    const Children* const alarms = event.at(_calendar_event.calendar_alarm).children;
    return alarms == nullptr ? kNone : *alarms;
}

// Binds the columns: the record's values, but for the place and has_alarm.
void bind_event(Run* run, const calendar_record& event, const Place& place) {
    const unsigned int first = _calendar_event.calendar_book_id;
    const unsigned int last = _calendar_event.has_alarm;
    for (size_t i = index_of(first); i <= index_of(last); ++i) {
        const Value& value = event.values[i];
        if (i == index_of(_calendar_event.calendar_book_id)) {
            run->bind(place.book_id);
        } else if (i == index_of(_calendar_event.original_event_id)) {
            run->bind(place.parent_id);
        } else if (i == index_of(_calendar_event.has_alarm)) {
            run->bind(alarms_of(event).empty() ? 0 : 1);
        } else {
            bind_value(run, event.view.properties[i].type, value);
        }
    }
}

void write_alarms(Store& store, int event_id, const calendar_record& event) {
    int position = 0;
    for (const calendar_record_h alarm : alarms_of(event)) {
        Run(store, kInsertAlarm)
            .bind(event_id)
            .bind(position++)
            .bind(alarm->at(_calendar_alarm.tick).integer)
            .bind(alarm->at(_calendar_alarm.tick_unit).integer)
            .finish();
    }
}

void touch(Store& store, int event_id, int version) {
    if (event_id != 0) {
        Run(store, kTouch).bind(event_id).bind(version).finish();
    }
}

void note_move(Store& store, int id, int from_book, int to_book, int version) {
    Run(store, kUnbury).bind(id).bind(to_book).finish();
    Run(store, kBury).bind(id).bind(from_book).bind(version).finish();
}

void move_exceptions(Store& store, int parent_id, int from_book, int to_book, int version) {
    std::vector<int> exceptions;
    {
        Run run(store, kSelectExceptionsInBook);
        run.bind(parent_id).bind(from_book);
        while (run.next()) {
            exceptions.push_back(run.integer());
        }
    }
    for (const int id : exceptions) {
        Run(store, kMove).bind(id).bind(to_book).bind(version).finish();
        note_move(store, id, from_book, to_book, version);
    }
}

// Writes the record over the event, which stood at one place and will stand at another.
void overwrite(Store& store, const calendar_record& event, int id, const Place& from,
               const Place& to, int version) {
    check_place(store, id, to);
    {
        Run run(store, kUpdate);
        bind_event(&run, event, to);
        run.bind(version).bind(id).finish();
    }
    Run(store, kDeleteAlarms).bind(id).finish();
    write_alarms(store, id, event);
    touch(store, to.parent_id, version);
    if (from.parent_id != to.parent_id) {
        touch(store, from.parent_id, version);
    }
    if (from.book_id != to.book_id) {
        note_move(store, id, from.book_id, to.book_id, version);
        move_exceptions(store, id, from.book_id, to.book_id, version);
    }
}

void remove(Store& store, const Deletion& deletion, int id, int version) {
    Run(store, deletion.touch_parents).bind(id).bind(version).finish();
    Run(store, deletion.bury).bind(id).bind(version).finish();
    Run(store, deletion.delete_alarms).bind(id).finish();
    Run(store, deletion.delete_events).bind(id).finish();
}

// A record of the row, which has the id and the event columns, with the alarms.
RecordOwner read_row(Store& store, Run* row) {
    RecordOwner event = make_record(kEventView);
    for (size_t i = 0; i <= index_of(_calendar_event.has_alarm); ++i) {
        read_value(row, kEventView.properties[i].type, &event->values[i]);
    }
    if (event->at(_calendar_event.has_alarm).integer == 0) {
        return event;
    }
    Run alarms(store, kSelectAlarms);
    alarms.bind(event->at(_calendar_event.id).integer);
    while (alarms.next()) {
        RecordOwner alarm = make_record(kAlarmView);
        alarm->at(_calendar_alarm.tick).integer = alarms.integer();
        alarm->at(_calendar_alarm.tick_unit).integer = alarms.integer();
        add_child(event.get(), _calendar_event.calendar_alarm, alarm.get());
        static_cast<void>(alarm.release());  // the event's from now on
    }
    return event;
}

}  // namespace

int insert_event(Store& store, const calendar_record& event, int version) {
    const Place place = place_of(event);
    check_place(store, 0, place);
    {
        Run run(store, kInsert);
        bind_event(&run, event, place);
        run.bind(version).finish();
    }
    const int id = inserted_id(store);
    write_alarms(store, id, event);
    touch(store, place.parent_id, version);
    return id;
}

void update_event(Store& store, const calendar_record& event, int version) {
    const int id = event.at(_calendar_event.id).integer;
    Place from{};
    if (!find_place(store, id, &from)) {
        throw Failure{CALENDAR_ERROR_NO_DATA};
    }
    overwrite(store, event, id, from, place_of(event), version);
}

void replace_event(Store& store, const calendar_record& event, int id, int version) {
    Place from{};
    if (!find_place(store, id, &from)) {
        throw Failure{CALENDAR_ERROR_NO_DATA};
    }
    Place to = place_of(event);
    to.book_id = to.book_id == 0 ? from.book_id : to.book_id;
    to.parent_id = to.parent_id == 0 ? from.parent_id : to.parent_id;
    overwrite(store, event, id, from, to, version);
}

void delete_event(Store& store, int id, int version) {
    Place place{};
    if (!find_place(store, id, &place)) {
        throw Failure{CALENDAR_ERROR_NO_DATA};
    }
    remove(store, kOfEvent, id, version);
}

bool delete_events_of_book(Store& store, int book_id, int version) {
    remove(store, kOfBook, book_id, version);
    return sqlite3_changes(store.handle()) > 0;  // of the last statement, which deletes the events
}

RecordOwner read_event(Store& store, int id) {
    RecordOwner event;
    {
        Run run(store, kSelect);
        if (!run.bind(id).next()) {
            throw Failure{CALENDAR_ERROR_NO_DATA};
        }
        event = read_row(store, &run);
    }
    Run exceptions(store, kSelectExceptions);
    exceptions.bind(id);
    while (exceptions.next()) {
        RecordOwner exception = read_row(store, &exceptions);
        add_child(event.get(), _calendar_event.exception, exception.get());
        static_cast<void>(exception.release());  // the event's from now on
    }
    return event;
}

std::unique_ptr<calendar_list> read_events(Store& store, const Selection& selection) {
    auto list = std::make_unique<calendar_list>();
    const StatementOwner statement = store.prepare(kSelectMatching + selection.clauses());
    Run run(store, statement.get());
    selection.bind(&run);
    while (run.next()) {
        list->append(read_row(store, &run));
    }
    return list;
}

std::unique_ptr<calendar_list> read_changes(Store& store, int book_id, int version) {
    auto list = std::make_unique<calendar_list>();
    Run run(store, kSelectChanges);
    run.bind(book_id).bind(version);
    while (run.next()) {
        RecordOwner change = make_record(kUpdatedInfoView);
        for (const unsigned int id :
             {_calendar_updated_info.id, _calendar_updated_info.modified_status,
              _calendar_updated_info.calendar_book_id, _calendar_updated_info.version}) {
            change->at(id).integer = run.integer();
        }
        list->append(std::move(change));
    }
    return list;
}

}  // namespace device
