// SPDX-License-Identifier: Apache-2.0
//
// Books and events in the calendar store: what is kept, where events belong, what deleting takes
// along, and the change list that clients follow.
#include <gmock/gmock.h>

#include <cmath>
#include <filesystem>
#include <limits>
#include <string>
#include <thread>
#include <vector>

#include "tests/support/device_test.h"

namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;

constexpr char kStore[] = QOR_DEVICE_ROOT "/opt/usr/dbspace/.calendar-service.db";
constexpr int kMissing = CALENDAR_ERROR_NO_DATA;
constexpr int kBad = CALENDAR_ERROR_INVALID_PARAMETER;

class PlatformStore : public DeviceTest {
  protected:
    PlatformStore() {
        EXPECT_EQ(calendar_connect(), 0);
        book_ = add_book(1);
    }

    // Changes of a book after a version: "i3@5" is event 3, inserted by version 5; also u, d.
    static std::vector<std::string> changes(int book, int version) {
        calendar_list_h made = nullptr;
        int current = 0;
        EXPECT_EQ(calendar_db_get_changes_by_version(_calendar_event._uri, book, version, &made,
                                                     &current),
                  0);
        EXPECT_EQ(current, current_version());
        const List list(made);
        std::vector<std::string> result;
        for (int rc = calendar_list_first(made); rc == 0; rc = calendar_list_next(made)) {
            calendar_record_h change = nullptr;
            int values[3] = {};
            EXPECT_EQ(calendar_list_get_current_record_p(made, &change), 0);
            EXPECT_EQ(calendar_record_get_int(change, _calendar_updated_info.id, &values[0]), 0);
            EXPECT_EQ(
                calendar_record_get_int(change, _calendar_updated_info.modified_status, &values[1]),
                0);
            EXPECT_EQ(calendar_record_get_int(change, _calendar_updated_info.version, &values[2]),
                      0);
            result.push_back("iud"[values[1]] + std::to_string(values[0]) + "@" +
                             std::to_string(values[2]));
        }
        return result;
    }

    static std::vector<int> children(const Record& event) {
        int count = 0;
        EXPECT_EQ(
            calendar_record_get_child_record_count(event.get(), _calendar_event.exception, &count),
            0);
        std::vector<int> ids(static_cast<size_t>(count));
        for (int i = 0; i < count; ++i) {
            calendar_record_h child = nullptr;
            EXPECT_EQ(calendar_record_get_child_record_at_p(event.get(), _calendar_event.exception,
                                                            i, &child),
                      0);
            EXPECT_EQ(
                calendar_record_get_int(child, _calendar_event.id, &ids[static_cast<size_t>(i)]),
                0);
        }
        return ids;
    }

    static Record event(int book, int parent = 0) {
        Record record = new_record(_calendar_event._uri);
        EXPECT_EQ(calendar_record_set_int(record.get(), _calendar_event.calendar_book_id, book), 0);
        EXPECT_EQ(calendar_record_set_int(record.get(), _calendar_event.original_event_id, parent),
                  0);
        return record;
    }

    static void add_alarm(const Record& event, int tick, int unit) {
        Record alarm = new_record(_calendar_alarm._uri);
        EXPECT_EQ(calendar_record_set_int(alarm.get(), _calendar_alarm.tick, tick), 0);
        EXPECT_EQ(calendar_record_set_int(alarm.get(), _calendar_alarm.tick_unit, unit), 0);
        EXPECT_EQ(calendar_record_add_child_record(event.get(), _calendar_event.calendar_alarm,
                                                   alarm.get()),
                  0);
        static_cast<void>(alarm.release());  // the event's
    }

    // "10x60,1x3600" for two alarms.
    static std::string alarms(const Record& event) {
        std::string result;
        int count = 0;
        const unsigned int id = _calendar_event.calendar_alarm;
        EXPECT_EQ(calendar_record_get_child_record_count(event.get(), id, &count), 0);
        for (int i = 0; i < count; ++i) {
            calendar_record_h alarm = nullptr;
            int tick = 0;
            int unit = 0;
            EXPECT_EQ(calendar_record_get_child_record_at_p(event.get(), id, i, &alarm), 0);
            EXPECT_EQ(calendar_record_get_int(alarm, _calendar_alarm.tick, &tick), 0);
            EXPECT_EQ(calendar_record_get_int(alarm, _calendar_alarm.tick_unit, &unit), 0);
            result += (i == 0 ? "" : ",") + std::to_string(tick) + "x" + std::to_string(unit);
        }
        return result;
    }

    static int last_change_version() {
        int version = -1;
        EXPECT_EQ(calendar_db_get_last_change_version(&version), 0);
        return version;
    }

    int book_ = 0;
};

// Each property gets a value of its own, so that no two can be mixed up.
TEST_F(PlatformStore, KeepsEveryPropertyExactly) {
    const unsigned int ints[] = {_calendar_event.sensitivity, _calendar_event.freq,
                                 _calendar_event.range_type,  _calendar_event.count,
                                 _calendar_event.interval,    _calendar_event.wkst};
    const unsigned int texts[] = {_calendar_event.summary,         _calendar_event.description,
                                  _calendar_event.location,        _calendar_event.organizer_name,
                                  _calendar_event.organizer_email, _calendar_event.start_tzid,
                                  _calendar_event.end_tzid,        _calendar_event.bysecond,
                                  _calendar_event.byminute,        _calendar_event.byhour,
                                  _calendar_event.byday,           _calendar_event.bymonthday,
                                  _calendar_event.byyearday,       _calendar_event.byweekno,
                                  _calendar_event.bymonth,         _calendar_event.bysetpos,
                                  _calendar_event.exdate,          _calendar_event.recurrence_id};
    const Record written = event(book_);
    calendar_record_h w = written.get();
    for (int i = 0; i < static_cast<int>(std::size(ints)); ++i) {
        EXPECT_EQ(calendar_record_set_int(w, ints[i], i % 2 == 0 ? -i : 1 << (20 + i)), 0);
    }
    for (const unsigned int id : texts) {
        const std::string value = "\xff" + std::to_string(id);  // no UTF-8
        EXPECT_EQ(calendar_record_set_str(w, id, value.c_str()), 0);
    }
    EXPECT_EQ(calendar_record_set_str(w, _calendar_event.byhour, ""), 0);
    EXPECT_EQ(calendar_record_set_double(w, _calendar_event.latitude, -0.1), 0);
    EXPECT_EQ(calendar_record_set_double(w, _calendar_event.longitude, std::nan("")), 0);
    calendar_time_s instant{};
    instant.time.utime = std::numeric_limits<int64_t>::min();
    calendar_time_s date{};
    date.type = CALENDAR_TIME_LOCALTIME;
    date.time.date = {2014, 13, -31, 4, 5, 6, true};
    calendar_time_s odd_date = date;
    odd_date.time.date = {std::numeric_limits<int>::min(), 1, 2,    3,
                          std::numeric_limits<int>::max(), 5, false};
    EXPECT_EQ(calendar_record_set_caltime(w, _calendar_event.start_time, instant), 0);
    EXPECT_EQ(calendar_record_set_caltime(w, _calendar_event.end_time, date), 0);
    EXPECT_EQ(calendar_record_set_caltime(w, _calendar_event.until_time, odd_date), 0);

    const Record stored = read(insert(written));
    for (int i = 0; i < static_cast<int>(std::size(ints)); ++i) {
        EXPECT_EQ(number(stored, ints[i]), i % 2 == 0 ? -i : 1 << (20 + i)) << i;
    }
    for (const unsigned int id : texts) {
        EXPECT_EQ(text(stored, id),
                  id == _calendar_event.byhour ? "" : "\xff" + std::to_string(id));
    }
    double degrees = 0;
    EXPECT_EQ(calendar_record_get_double(stored.get(), _calendar_event.latitude, &degrees), 0);
    EXPECT_EQ(degrees, -0.1);
    EXPECT_EQ(calendar_record_get_double(stored.get(), _calendar_event.longitude, &degrees), 0);
    EXPECT_TRUE(std::isnan(degrees));
    calendar_time_s time{};
    EXPECT_EQ(calendar_record_get_caltime(stored.get(), _calendar_event.start_time, &time), 0);
    EXPECT_EQ(time.type, CALENDAR_TIME_UTIME);
    EXPECT_EQ(time.time.utime, instant.time.utime);
    for (const auto& [id, expected] : {std::pair{_calendar_event.end_time, date},
                                       std::pair{_calendar_event.until_time, odd_date}}) {
        EXPECT_EQ(calendar_record_get_caltime(stored.get(), id, &time), 0);
        EXPECT_EQ(time.type, CALENDAR_TIME_LOCALTIME);
        EXPECT_EQ(time.time.date.year, expected.time.date.year);
        EXPECT_EQ(time.time.date.month, expected.time.date.month);
        EXPECT_EQ(time.time.date.mday, expected.time.date.mday);
        EXPECT_EQ(time.time.date.hour, expected.time.date.hour);
        EXPECT_EQ(time.time.date.minute, expected.time.date.minute);
        EXPECT_EQ(time.time.date.second, expected.time.date.second);
        EXPECT_EQ(time.time.date.is_leap_month, expected.time.date.is_leap_month);
    }
    const Record untouched = read(add_event(book_, "untouched"));
    EXPECT_EQ(text(untouched, _calendar_event.location), "(null)");
    EXPECT_EQ(number(untouched, _calendar_event.range_type), CALENDAR_RANGE_NONE);
}

TEST_F(PlatformStore, KeepsAlarmsInOrderAndHasAlarmWithThem) {
    const Record written = event(book_);
    add_alarm(written, 10, 60);
    add_alarm(written, 1, 3600);
    EXPECT_EQ(calendar_record_set_int(written.get(), _calendar_event.has_alarm, 0), 0);
    const int id = insert(written);
    const Record stored = read(id);
    EXPECT_EQ(alarms(stored), "10x60,1x3600");
    EXPECT_EQ(number(stored, _calendar_event.has_alarm), 1) << "says what is, not what was set";
    add_alarm(stored, -5, 1);
    EXPECT_EQ(calendar_db_update_record(stored.get()), 0);
    EXPECT_EQ(alarms(read(id)), "10x60,1x3600,-5x1");
    const Record bare = event(0);
    EXPECT_EQ(calendar_record_set_int(bare.get(), _calendar_event.has_alarm, 1), 0);
    EXPECT_EQ(calendar_db_replace_record(bare.get(), id), 0);
    EXPECT_EQ(alarms(read(id)), "");
    EXPECT_EQ(number(read(id), _calendar_event.has_alarm), 0);
    EXPECT_EQ(query(kStore, "SELECT count(*) FROM alarms"), "0");
}

TEST_F(PlatformStore, ReadsAParentWithItsExceptions) {
    const int parent = add_event(book_, "weekly");
    const Record moved = event(book_, parent);
    add_alarm(moved, 7, 60);
    const int first = insert(moved);
    const int second = add_event(book_, "moved too", parent);
    const Record stored = read(parent);
    EXPECT_THAT(children(stored), ElementsAre(first, second));
    calendar_record_h child = nullptr;
    ASSERT_EQ(
        calendar_record_get_child_record_at_p(stored.get(), _calendar_event.exception, 0, &child),
        0);
    int has_alarm = 0;
    EXPECT_EQ(calendar_record_get_int(child, _calendar_event.has_alarm, &has_alarm), 0);
    EXPECT_EQ(has_alarm, 1);
    // Writing the parent back leaves the exceptions alone.
    EXPECT_EQ(calendar_db_update_record(stored.get()), 0);
    EXPECT_THAT(children(read(parent)), ElementsAre(first, second));
    EXPECT_EQ(alarms(read(first)), "7x60");
}

TEST_F(PlatformStore, RefusesPlacesThatAnEventCannotHave) {
    const int other_book = add_book(2);
    const int parent = add_event(book_, "parent");
    const int exception = add_event(book_, "exception", parent);
    const int plain = add_event(book_, "plain");
    const int version = current_version();
    const struct {
        const char* name;
        int id;  // 0: inserted
        int book;
        int parent;
        int expected;
    } cases[] = {
        {"no book", 0, 0, 0, kMissing},
        {"missing book", 0, 99, 0, kMissing},
        {"missing parent", 0, book_, 99, kMissing},
        {"negative parent", 0, book_, -1, kMissing},
        {"exception of an exception", 0, book_, exception, kBad},
        {"update to no book", plain, 0, 0, kMissing},
        {"update to a missing book", plain, 99, 0, kMissing},
        {"update to a missing parent", plain, book_, 99, kMissing},
        {"its own parent", plain, book_, plain, kBad},
        {"a parent becoming an exception", parent, book_, plain, kBad},
        {"update of a missing event", 99, book_, 0, kMissing},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.name);
        const Record record = event(c.book, c.parent);
        int id = -7;
        EXPECT_EQ(calendar_record_set_int(record.get(), _calendar_event.id, c.id), 0);
        EXPECT_EQ(c.id == 0 ? calendar_db_insert_record(record.get(), &id)
                            : calendar_db_update_record(record.get()),
                  c.expected);
        EXPECT_EQ(id, -7);
    }
    EXPECT_EQ(calendar_db_replace_record(event(other_book).get(), 99), kMissing);
    EXPECT_EQ(calendar_db_delete_record(_calendar_event._uri, 99), kMissing);
    EXPECT_EQ(calendar_db_delete_record(_calendar_book._uri, 99), kMissing);
    calendar_record_h none = nullptr;
    EXPECT_EQ(calendar_db_get_record(_calendar_event._uri, 99, &none), kMissing);
    EXPECT_EQ(none, nullptr);
    EXPECT_EQ(current_version(), version) << "a refused write is no change";
    for (const char* uri :
         {_calendar_todo._uri, _calendar_alarm._uri, _calendar_updated_info._uri}) {
        int id = 0;
        EXPECT_EQ(calendar_db_insert_record(new_record(uri).get(), &id),
                  CALENDAR_ERROR_NOT_SUPPORTED);
        EXPECT_EQ(calendar_db_delete_record(uri, 1), CALENDAR_ERROR_NOT_SUPPORTED);
    }
}

TEST_F(PlatformStore, ReplaceKeepsThePlaceThatTheRecordDoesNotSet) {
    const int other_book = add_book(2);
    const int parent = add_event(book_, "parent");
    const int exception = add_event(book_, "exception", parent);
    EXPECT_EQ(calendar_db_replace_record(event(0).get(), exception), 0);
    Record stored = read(exception);
    EXPECT_EQ(text(stored, _calendar_event.summary), "(null)") << "all else is the new record's";
    EXPECT_EQ(number(stored, _calendar_event.id), exception);
    EXPECT_EQ(number(stored, _calendar_event.calendar_book_id), book_);
    EXPECT_EQ(number(stored, _calendar_event.original_event_id), parent);
    EXPECT_EQ(calendar_db_replace_record(event(other_book).get(), parent), 0);
    EXPECT_EQ(number(read(parent), _calendar_event.calendar_book_id), other_book);
    // An update, unlike a replace, writes what the record holds.
    stored = read(exception);
    EXPECT_EQ(calendar_record_set_int(stored.get(), _calendar_event.original_event_id, 0), 0);
    EXPECT_EQ(calendar_db_update_record(stored.get()), 0);
    EXPECT_THAT(children(read(parent)), IsEmpty());
}

TEST_F(PlatformStore, ListsTheLatestChangeOfEachEventByVersion) {
    const int start = current_version();
    const auto at = [&](int n) { return "@" + std::to_string(start + n); };
    const int a = add_event(book_, "a");  // 1
    const int b = add_event(book_, "b");  // 2
    const std::string A = std::to_string(a);
    const std::string B = std::to_string(b);
    EXPECT_THAT(changes(book_, start), ElementsAre("i" + A + at(1), "i" + B + at(2)));
    set_text(a, _calendar_event.summary, "a2");  // 3
    EXPECT_THAT(changes(book_, start), ElementsAre("i" + B + at(2), "u" + A + at(3)));
    const int x = add_event(book_, "x", b);  // 4: changes the parent too
    const std::string X = std::to_string(x);
    EXPECT_THAT(changes(book_, start + 3), ElementsAre("u" + B + at(4), "i" + X + at(4)));
    set_text(x, _calendar_event.summary, "x2");  // 5
    EXPECT_THAT(changes(book_, start + 4), ElementsAre("u" + B + at(5), "u" + X + at(5)));
    EXPECT_EQ(calendar_db_delete_record(_calendar_event._uri, x), 0);  // 6
    EXPECT_THAT(changes(book_, start + 5), ElementsAre("d" + X + at(6), "u" + B + at(6)));
    const int y = add_event(book_, "y", b);  // 7
    const std::string Y = std::to_string(y);
    EXPECT_EQ(calendar_db_delete_record(_calendar_event._uri, b), 0);  // 8: takes y along
    EXPECT_THAT(changes(book_, start),
                ElementsAre("u" + A + at(3), "d" + X + at(6), "d" + Y + at(8), "d" + B + at(8)));
    EXPECT_THAT(changes(book_, current_version()), IsEmpty());
    EXPECT_THAT(changes(book_ + 1, 0), IsEmpty());
    EXPECT_GT(add_event(book_, "c"), y) << "ids are never used again";
    calendar_list_h list = nullptr;
    int version = 0;
    EXPECT_EQ(calendar_db_get_changes_by_version(_calendar_book._uri, book_, 0, &list, &version),
              CALENDAR_ERROR_NOT_SUPPORTED);
}

TEST_F(PlatformStore, AnEventThatMovesCountsAsDeletedWhereItWas) {
    const int other = add_book(2);
    const int parent = add_event(book_, "parent");
    const int exception = add_event(book_, "exception", parent);
    const std::string P = std::to_string(parent);
    const std::string X = std::to_string(exception);
    const auto move = [&](int to) {
        const Record record = read(parent);
        EXPECT_EQ(calendar_record_set_int(record.get(), _calendar_event.calendar_book_id, to), 0);
        EXPECT_EQ(calendar_db_update_record(record.get()), 0);
        return "@" + std::to_string(current_version());
    };
    const std::string moved = move(other);
    EXPECT_THAT(changes(book_, 0), ElementsAre("d" + X + moved, "d" + P + moved));
    EXPECT_THAT(changes(other, 0), ElementsAre("u" + P + moved, "u" + X + moved));
    const std::string back = move(book_);
    EXPECT_THAT(changes(book_, 0), ElementsAre("u" + P + back, "u" + X + back));
    EXPECT_THAT(changes(other, 0), ElementsAre("d" + X + back, "d" + P + back));
}

TEST_F(PlatformStore, DeletingABookTakesItsEventsAndTheirExceptionsAlong) {
    const int other = add_book(2);
    const int parent = add_event(book_, "parent");
    const int elsewhere = add_event(other, "exception elsewhere", parent);
    const int stays = add_event(other, "stays");
    const int leaves = add_event(book_, "exception of one that stays", stays);
    const int version = current_version();
    EXPECT_EQ(calendar_db_delete_record(_calendar_book._uri, book_), 0);
    const std::string now = "@" + std::to_string(version + 1);
    EXPECT_EQ(current_version(), version + 1) << "one write";
    EXPECT_THAT(changes(book_, version), ElementsAre("d" + std::to_string(leaves) + now,
                                                     "d" + std::to_string(parent) + now));
    EXPECT_THAT(changes(other, version), ElementsAre("d" + std::to_string(elsewhere) + now,
                                                     "u" + std::to_string(stays) + now));
    EXPECT_FALSE(read(parent));
    EXPECT_TRUE(read(stays));
    EXPECT_GT(add_book(3), other);
}

TEST_F(PlatformStore, TheLastChangeVersionIsTheCallingThreadsOwn) {
    const int mine = last_change_version();
    EXPECT_EQ(mine, current_version());
    std::thread([&] {
        EXPECT_EQ(last_change_version(), 0) << "it has not written";
        add_event(book_, "another thread's");
        EXPECT_EQ(last_change_version(), mine + 1);
    }).join();
    EXPECT_EQ(last_change_version(), mine);
    EXPECT_EQ(calendar_db_delete_record(_calendar_event._uri, 99), kMissing);
    EXPECT_EQ(last_change_version(), mine) << "a refused write is none";
}

TEST_F(PlatformStore, QueriesFilterAndPage) {
    const int second = add_book(1);
    const int foreign = add_book(2);
    for (const char* summary : {"a", "b", "c"}) {
        add_event(second, summary);
    }
    const int parent = add_event(foreign, "d");
    add_event(foreign, "e", parent);
    const auto ids = [](const char* uri, std::vector<std::pair<unsigned int, int>> conditions,
                        int offset = 0, int limit = 0) {
        calendar_query_h query = nullptr;
        calendar_filter_h filter = nullptr;
        calendar_list_h list = nullptr;
        EXPECT_EQ(calendar_query_create(uri, &query), 0);
        EXPECT_EQ(calendar_filter_create(uri, &filter), 0);
        const Query query_owner(query);
        const Filter filter_owner(filter);
        for (size_t i = 0; i < conditions.size(); ++i) {
            EXPECT_EQ(
                i == 0 ? 0 : calendar_filter_add_operator(filter, CALENDAR_FILTER_OPERATOR_AND), 0);
            EXPECT_EQ(calendar_filter_add_int(filter, conditions[i].first, CALENDAR_MATCH_EQUAL,
                                              conditions[i].second),
                      0);
        }
        EXPECT_EQ(calendar_query_set_filter(query, filter), 0);
        EXPECT_EQ(calendar_db_get_records_with_query(query, offset, limit, &list), 0);
        const List owner(list);
        std::vector<int> found;
        for (int rc = calendar_list_first(list); rc == 0; rc = calendar_list_next(list)) {
            calendar_record_h record = nullptr;
            int id = 0;
            EXPECT_EQ(calendar_list_get_current_record_p(list, &record), 0);
            EXPECT_EQ(calendar_record_get_int(
                          record,
                          uri == _calendar_book._uri ? _calendar_book.id : _calendar_event.id, &id),
                      0);
            found.push_back(id);
        }
        calendar_record_h past = nullptr;
        EXPECT_EQ(calendar_list_get_current_record_p(list, &past), kMissing);
        return found;
    };
    EXPECT_THAT(ids(_calendar_book._uri, {}), ElementsAre(book_, second, foreign));
    EXPECT_THAT(ids(_calendar_book._uri, {{_calendar_book.account_id, 1},
                                          {_calendar_book.store_type, CALENDAR_BOOK_TYPE_EVENT}}),
                ElementsAre(book_, second));
    EXPECT_THAT(ids(_calendar_book._uri, {{_calendar_book.account_id, 3}}), IsEmpty());
    EXPECT_THAT(ids(_calendar_event._uri, {}, 1, 2), ElementsAre(2, 3));
    EXPECT_THAT(ids(_calendar_event._uri, {}, 4), ElementsAre(5));
    EXPECT_THAT(ids(_calendar_event._uri, {{_calendar_event.calendar_book_id, foreign}}),
                ElementsAre(4, 5));
    EXPECT_THAT(ids(_calendar_event._uri, {{_calendar_event.original_event_id, parent}}),
                ElementsAre(5));
}

TEST_F(PlatformStore, EveryCallNeedsAConnection) {
    const int event_id = add_event(book_, "kept");
    EXPECT_EQ(calendar_connect(), 0) << "again";
    EXPECT_EQ(calendar_disconnect(), 0);
    EXPECT_EQ(calendar_disconnect(), CALENDAR_ERROR_NOT_CONNECTED);
    int number = 0;
    calendar_record_h record = nullptr;
    calendar_list_h list = nullptr;
    const auto callback = [](const char*, void*) {};
    for (const int result :
         {calendar_db_get_record(_calendar_event._uri, event_id, &record),
          calendar_db_insert_record(event(book_).get(), &number),
          calendar_db_delete_record(_calendar_event._uri, event_id),
          calendar_db_get_current_version(&number), calendar_db_get_last_change_version(&number),
          calendar_db_get_changes_by_version(_calendar_event._uri, 1, 0, &list, &number),
          calendar_db_add_changed_cb(_calendar_event._uri, callback, nullptr)}) {
        EXPECT_EQ(result, CALENDAR_ERROR_NOT_CONNECTED);
    }
    EXPECT_EQ(calendar_connect(), 0);
    EXPECT_EQ(last_change_version(), 0) << "nothing was written on this connection";
    // The device is the directory of the connect, also after the process has gone elsewhere.
    std::filesystem::create_directory("elsewhere");
    std::filesystem::current_path("elsewhere");
    EXPECT_EQ(text(read(event_id), _calendar_event.summary), "kept");
    EXPECT_GT(add_event(book_, "new"), event_id);
}

TEST_F(PlatformStore, TheOldestDeletedEventsAreDroppedAtAConnect) {
    EXPECT_EQ(calendar_disconnect(), 0);
    run_sql(
        kStore,
        "WITH RECURSIVE n(i) AS (SELECT 1 UNION ALL SELECT i + 1 FROM n WHERE i < 100003) "
        "INSERT INTO deleted_events(event_id, calendar_book_id, version) SELECT i, 1, i FROM n");
    EXPECT_EQ(calendar_connect(), 0);
    EXPECT_EQ(query(kStore, "SELECT count(*), min(event_id) FROM deleted_events"), "100000|4");
}

}  // namespace
