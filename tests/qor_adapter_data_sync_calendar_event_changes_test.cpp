// SPDX-License-Identifier: Apache-2.0
#include <cstdlib>
#include <cstring>

#include "data-sync/qor_adapter_data_sync_calendar_event.h"
#include "data-sync/qor_adapter_data_sync_calendar_event_state.h"
#include "tests/support/device_test.h"

namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;

constexpr char kDirty[] = "qor_adapter_data_sync_get_dirty_ids_p";
constexpr char kDeleted[] = "qor_adapter_data_sync_get_deleted_ids_p";
constexpr char kClear[] = "qor_adapter_data_sync_clear_deleted_ids";
constexpr char kSet[] = "qor_adapter_data_sync_set_data_changed_cb";
constexpr char kUnset[] = "qor_adapter_data_sync_unset_data_changed_cb";
constexpr char kHandler[] = "__is_calendar_changes";

// What an id query answered; the count starts as -1.
struct Ids {
    int result = 0;
    int count = -1;
    std::vector<std::string> ids;
    bool operator==(const Ids&) const = default;
};
std::ostream& operator<<(std::ostream& out, const Ids& ids) {
    return out << ids.result << " " << ids.count << " " << ::testing::PrintToString(ids.ids);
}

class ChangesTest : public DeviceTest {
  protected:
    ~ChangesTest() override {
        faults::clear();
        if (calendar_adapter != nullptr) {
            drop_change_list(calendar_adapter);
            qor_adapter_data_sync_deinitialize(0);
        }
    }

    void initialize() {
        ASSERT_EQ(qor_adapter_data_sync_initialize(3, 0), 0);
        book_ = calendar_adapter->calendar_id;
        log();
    }

    // Initialises, subscribes and lets the first notification, which every subscriber gets, pass.
    void subscribe() {
        initialize();
        ASSERT_EQ(qor_adapter_data_sync_set_data_changed_cb(count_call, &calls_), 0);
        log();
    }

    // Calls the handler as the calendar service would: how often it called the host.
    int notify() {
        const int before = calls_;
        __is_calendar_changes(_calendar_event._uri, calendar_adapter);
        return calls_ - before;
    }

    static Ids ids(int (*query)(char***, int*)) {
        Ids answer;
        char** texts = nullptr;
        answer.result = query(&texts, &answer.count);
        for (int i = 0; texts != nullptr && i < answer.count; ++i) {
            answer.ids.emplace_back(texts[i]);
            free(texts[i]);
        }
        free(texts);
        return answer;
    }
    static Ids dirty() { return ids(qor_adapter_data_sync_get_dirty_ids_p); }
    static Ids deleted() { return ids(qor_adapter_data_sync_get_deleted_ids_p); }

    // Notes an event's latest change as the adapter's own.
    static void own(int event_id) {
        ASSERT_EQ(_qor_calendar_db_insert_version(event_id, current_version(), QOR_EVENT_TABLE), 0);
    }
    static std::string stored_version() {
        return query(kAdapterFile, "SELECT version FROM version_table");
    }

    static void count_call(void* calls) { ++*static_cast<int*>(calls); }

    int book_ = 0;
    int calls_ = 0;
};

TEST_F(ChangesTest, NothingWorksBeforeInitialise) {
    const Ids refused = {6, -1, {}};
    EXPECT_EQ(dirty(), refused);
    EXPECT_EQ(deleted(), refused);
    EXPECT_EQ(qor_adapter_data_sync_clear_deleted_ids(), 6);
    EXPECT_EQ(qor_adapter_data_sync_set_data_changed_cb(nullptr, nullptr), 4);
    EXPECT_EQ(qor_adapter_data_sync_set_data_changed_cb(count_call, nullptr), 6);
    EXPECT_EQ(qor_adapter_data_sync_unset_data_changed_cb(), 6);
    EXPECT_THAT(log(),
                ElementsAre(warning(kDirty, "not initialize"), warning(kDeleted, "not initialize"),
                            warning(kClear, "not initialize"), info(kSet, ""), info(kSet, ""),
                            warning(kSet, "not initialize"), info(kUnset, ""),
                            warning(kUnset, "not initialize")));
}

TEST_F(ChangesTest, WithoutAPendingListThereIsNothingAndClearingStillMovesTheBaseline) {
    initialize();
    EXPECT_EQ(dirty(), (Ids{0, 0, {}}));
    EXPECT_EQ(deleted(), (Ids{0, 0, {}}));
    calendar_adapter->current_version = 12;
    EXPECT_EQ(qor_adapter_data_sync_clear_deleted_ids(), 0);
    EXPECT_EQ(calendar_adapter->version, 12);
    EXPECT_EQ(stored_version(), "12");
    calendar_adapter->current_version = 0;  // as before any notification
    EXPECT_EQ(qor_adapter_data_sync_clear_deleted_ids(), 0);
    EXPECT_EQ(stored_version(), "0");
    char** texts = nullptr;
    int count = 0;
    for (const auto query_ids :
         {qor_adapter_data_sync_get_dirty_ids_p, qor_adapter_data_sync_get_deleted_ids_p}) {
        EXPECT_EQ(query_ids(nullptr, &count), 6);
        EXPECT_EQ(query_ids(&texts, nullptr), 6);
    }
    EXPECT_THAT(log(), IsEmpty());
}

TEST_F(ChangesTest, ANewEventGetsANumberOnceAndKeepsIt) {
    subscribe();
    add_event(book_, "new");
    EXPECT_EQ(notify(), 1);
    EXPECT_EQ(dirty(), (Ids{0, 1, {"1"}}));
    EXPECT_EQ(dirty(), (Ids{0, 1, {"1"}}));
    EXPECT_EQ(deleted(), (Ids{1, 0, {}}));
    EXPECT_EQ(query(kAdapterFile,
                    "SELECT calsvc_ori_id, exception_status, invalid, calendar_id, "
                    "exdate FROM qor_event_data_table"),
              "0|0|0|" + std::to_string(book_) + "|(null)");
    EXPECT_EQ(qor_adapter_data_sync_clear_deleted_ids(), 0);
    EXPECT_EQ(dirty(), (Ids{0, 0, {}}));
    EXPECT_EQ(stored_version(), std::to_string(current_version()));
    EXPECT_EQ(notify(), 0);
}

TEST_F(ChangesTest, AKnownRecurringEventIsFollowedByItsOccurrences) {
    subscribe();
    const int parent = add_event(book_, "parent");
    notify();
    EXPECT_EQ(dirty(), (Ids{0, 1, {"1"}}));
    const int first = add_event(book_, "moved", parent);
    const int second = add_event(book_, "moved again", parent);
    set_text(parent, _calendar_event.exdate, "20140315T093000Z,20140316T093000Z");
    // The occurrences are in the list as changes of their own; only the parent is of interest here.
    own(first);
    own(second);
    run_sql(kAdapterFile,
            "UPDATE qor_event_table SET version=version-1 WHERE id=" + std::to_string(second));
    run_sql(kAdapterFile,
            "UPDATE qor_event_table SET version=version-2 WHERE id=" + std::to_string(first));
    notify();
    EXPECT_EQ(dirty(), (Ids{0, 5, {"1", "2", "3", "4", "5"}}));
    const std::string p = std::to_string(parent);
    EXPECT_EQ(query(kAdapterFile,
                    "SELECT calsvc_id, calsvc_ori_id, exception_status, exdate FROM "
                    "qor_event_data_table WHERE adapter_id > 1"),
              std::to_string(first) + "|" + p + "|1|(null)\n" + std::to_string(second) + "|" + p +
                  "|1|(null)\n0|" + p + "|2|20140315T093000Z\n0|" + p + "|2|20140316T093000Z");
    // Pieces are not trimmed: the blank makes another occurrence of it.
    set_text(parent, _calendar_event.exdate, "20140315T093000Z, 20140316T093000Z");
    notify();
    EXPECT_EQ(dirty(), (Ids{0, 5, {"1", "2", "3", "4", "6"}}));
    set_text(parent, _calendar_event.exdate, "");
    notify();
    EXPECT_EQ(dirty(), (Ids{0, 3, {"1", "2", "3"}}));
}

TEST_F(ChangesTest, AChangedOccurrenceThatIsListedItselfHasNoOccurrencesOfItsOwn) {
    subscribe();
    const int parent = add_event(book_, "parent");
    const int occurrence = add_event(book_, "moved", parent);
    notify();
    dirty();  // maps both
    set_text(occurrence, _calendar_event.exdate, "20140315");
    own(parent);
    notify();
    EXPECT_EQ(dirty().ids, (std::vector<std::string>{"2"}));
}

TEST_F(ChangesTest, OwnChangesAreInNeitherListAndSilent) {
    subscribe();
    const int event = add_event(book_, "downloaded");
    own(event);
    calendar_adapter->version = 0;
    EXPECT_EQ(notify(), 0);
    EXPECT_EQ(calendar_adapter->change_list, nullptr);
    EXPECT_EQ(calendar_adapter->version, current_version());
    EXPECT_EQ(stored_version(), std::to_string(current_version()));
    // A list that holds own changes only, because the version rows came later, yields no ids.
    add_event(book_, "downloaded too");
    EXPECT_EQ(notify(), 1);
    own(event + 1);
    EXPECT_EQ(dirty(), (Ids{1, 0, {}}));
    EXPECT_EQ(deleted(), (Ids{1, 0, {}}));
    EXPECT_THAT(log(), IsEmpty());
}

TEST_F(ChangesTest, AForeignChangeAmongOwnOnesCallsTheHostOnceAndKeepsTheList) {
    subscribe();
    const int baseline = calendar_adapter->version;
    own(add_event(book_, "own"));
    add_event(book_, "foreign");
    add_event(book_, "foreign too");
    EXPECT_EQ(notify(), 1);
    EXPECT_EQ(calendar_adapter->version, baseline);
    own(add_event(book_, "own again"));
    EXPECT_EQ(notify(), 1);  // the list is fetched anew from the same baseline
    EXPECT_EQ(dirty(), (Ids{0, 2, {"1", "2"}}));
}

TEST_F(ChangesTest, ADeletedEventIsToldWithItsOccurrencesAndForgotten) {
    subscribe();
    const int parent = add_event(book_, "parent");
    notify();
    dirty();
    set_text(parent, _calendar_event.exdate, "20140315T093000Z");
    add_event(book_, "moved", parent);
    notify();
    EXPECT_EQ(dirty().ids[0], "1");
    qor_adapter_data_sync_clear_deleted_ids();
    const int unmapped = add_event(book_, "never told");
    calendar_db_delete_record(_calendar_event._uri, unmapped);
    calendar_db_delete_record(_calendar_event._uri, parent);
    EXPECT_EQ(notify(), 1);
    EXPECT_EQ(dirty(), (Ids{1, 0, {}}));
    const Ids first = deleted();
    EXPECT_EQ(first.result, 0);
    // The never mapped event, the occurrence, the parent and what is derived from it.
    EXPECT_EQ(first.ids, (std::vector<std::string>{"-1", "2", "1", "3"}));
    EXPECT_EQ(query(kAdapterFile, "SELECT count(*) FROM qor_event_data_table"), "0");
    EXPECT_EQ(deleted().ids, (std::vector<std::string>{"-1", "-1", "-1"}));
    EXPECT_EQ(qor_adapter_data_sync_clear_deleted_ids(), 0);
    EXPECT_EQ(deleted(), (Ids{0, 0, {}}));
}

TEST_F(ChangesTest, ClearingPrunesTheVersionsUpToTheBaseline) {
    subscribe();
    add_event(book_, "foreign");
    notify();
    const int version = calendar_adapter->current_version;
    for (const int offset : {-1, 0, 1}) {
        _qor_calendar_db_insert_version(9, version + offset, QOR_EVENT_TABLE);
    }
    EXPECT_EQ(qor_adapter_data_sync_clear_deleted_ids(), 0);
    EXPECT_EQ(query(kAdapterFile, "SELECT version FROM qor_event_table"),
              std::to_string(version + 1));
}

TEST_F(ChangesTest, EveryReadThatFailsAbortsTheQueryAndKeepsTheList) {
    subscribe();
    add_event(book_, "one");
    add_event(book_, "two");
    notify();
    const struct {
        const char* function;
        int nth;
        const char* message;
    } cases[] = {
        {"calendar_list_get_count", 1, "calendar_list_get_count fail"},
        {"calendar_list_get_current_record_p", 1, "calendar_list_get_count fail"},
        {"calendar_list_get_current_record_p", 2, "calendar_list_get_count fail"},
        {"calendar_record_get_int", 1, "calendar_record_get_int fail"},
        {"calendar_record_get_int", 2, "calendar_record_get_int fail"},
        {"calendar_record_get_int", 3, "calendar_record_get_int fail"},
        {"calendar_record_get_int", 4, "calendar_record_get_int fail"},
        {"calendar_record_get_int", 6, "calendar_record_get_int fail"},  // 5 is the event's parent
        {"calloc", 1, "calloc fail"},
        {"strdup", 2, "calloc fail"},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(std::string(c.function) + " " + std::to_string(c.nth));
        faults::fail(c.function, c.nth);
        EXPECT_EQ(dirty(), (Ids{6, -1, {}}));
        EXPECT_TRUE(faults::fired());
        EXPECT_THAT(log(), ElementsAre(critical(kDirty, c.message)));
    }
    faults::clear();
    EXPECT_EQ(dirty(), (Ids{0, 2, {"1", "2"}}));
    calendar_db_delete_record(_calendar_event._uri, 1);
    calendar_db_delete_record(_calendar_event._uri, 2);
    notify();
    for (const auto& c : cases) {
        if (strcmp(c.message, "calloc fail") == 0 || c.nth > 1) {
            continue;
        }
        faults::fail(c.function, c.nth);
        EXPECT_EQ(deleted(), (Ids{6, -1, {}}));
        EXPECT_THAT(log(), ElementsAre(critical(kDeleted, c.message)));
    }
    faults::clear();
    EXPECT_EQ(deleted().ids, (std::vector<std::string>{"1", "2"}));
}

TEST_F(ChangesTest, AFailureInsideAnOccurrenceSkipsOnlyThatOne) {
    subscribe();
    const int parent = add_event(book_, "parent");
    notify();
    dirty();
    own(add_event(book_, "moved", parent));
    own(add_event(book_, "moved again", parent));
    set_text(parent, _calendar_event.exdate, "a,b");
    const auto query_with = [&](const char* function, int nth) {
        run_sql(kAdapterFile, "DELETE FROM qor_event_data_table WHERE adapter_id > 1");
        notify();
        faults::fail(function, nth);
        const size_t told = dirty().ids.size();
        EXPECT_TRUE(faults::fired()) << function << nth;
        faults::clear();
        return told;
    };
    run_sql(kAdapterFile,
            "UPDATE qor_event_table SET version=" + std::to_string(current_version() - 1) +
                " WHERE id=" + std::to_string(parent + 2));
    run_sql(kAdapterFile,
            "UPDATE qor_event_table SET version=" + std::to_string(current_version() - 2) +
                " WHERE id=" + std::to_string(parent + 1));
    log();
    EXPECT_EQ(query_with("calendar_record_get_child_record_at_p", 1), 4U);
    EXPECT_THAT(log(), ElementsAre(critical(
                           kDirty, "get_child_record fail. " + std::to_string(parent) + ",0")));
    EXPECT_EQ(query_with("calendar_record_get_child_record_count", 1), 3U);
    EXPECT_EQ(query_with("calendar_record_get_str_p", 1), 3U);
    EXPECT_EQ(query_with("calendar_db_get_record", 1), 1U);
    EXPECT_EQ(query_with("sqlite3_bind_text", 1), 4U);  // the first row that is made
    EXPECT_EQ(query_with("sqlite3_bind_text", 7), 4U);  // the first excluded date's
}

TEST_F(ChangesTest, ANewEventWhoseRowCannotBeStoredIsToldAsZero) {
    subscribe();
    add_event(book_, "new");
    notify();
    faults::fail("sqlite3_bind_text");
    EXPECT_EQ(dirty(), (Ids{0, 1, {"0"}}));
    faults::clear();
    EXPECT_EQ(dirty(), (Ids{0, 1, {"1"}}));
}

TEST_F(ChangesTest, SubscribingReportsTheServicesErrorAndStoresNothing) {
    initialize();
    faults::fail("calendar_db_add_changed_cb");
    EXPECT_EQ(qor_adapter_data_sync_set_data_changed_cb(count_call, &calls_),
              CALENDAR_ERROR_DB_FAILED);
    EXPECT_THAT(log(), ElementsAre(info(kSet, ""), critical(kSet, "add_changed_cb fail")));
    EXPECT_EQ(calendar_adapter->data_changed_cb, nullptr);
    add_event(book_, "foreign");
    __is_calendar_changes(_calendar_event._uri, calendar_adapter);  // no callback: does nothing
    EXPECT_EQ(calendar_adapter->change_list, nullptr);
    ASSERT_EQ(qor_adapter_data_sync_set_data_changed_cb(count_call, &calls_), 0);
    EXPECT_EQ(qor_adapter_data_sync_unset_data_changed_cb(), 0);
    EXPECT_EQ(calendar_adapter->data_changed_cb, nullptr);
    EXPECT_EQ(calendar_adapter->data_changed_user_data, &calls_);
    faults::fail("calendar_db_remove_changed_cb");
    EXPECT_EQ(qor_adapter_data_sync_unset_data_changed_cb(), 0);
}

TEST_F(ChangesTest, ANotificationThatCannotReadItsChangesSkipsThem) {
    subscribe();
    const int baseline = calendar_adapter->version;
    add_event(book_, "foreign");
    const int current = current_version();
    faults::fail("calendar_db_get_changes_by_version");  // no list, and no newer version known
    EXPECT_EQ(notify(), 0);
    EXPECT_EQ(calendar_adapter->version, baseline);
    calendar_adapter->current_version = baseline + 1;  // as an earlier query left it
    faults::fail("calendar_db_get_changes_by_version");
    EXPECT_EQ(notify(), 0);
    EXPECT_EQ(calendar_adapter->version, baseline + 1);
    EXPECT_EQ(stored_version(), std::to_string(baseline + 1));
    calendar_adapter->version = baseline;
    EXPECT_THAT(log(), IsEmpty());

    faults::fail("calendar_list_get_count");  // changes that cannot be counted are kept
    EXPECT_EQ(notify(), 0);
    EXPECT_NE(calendar_adapter->change_list, nullptr);
    EXPECT_EQ(calendar_adapter->version, baseline);
    EXPECT_THAT(log(), ElementsAre(critical(kHandler, "calendar_list_get_count fail")));
    for (const char* function : {"calendar_list_get_current_record_p", "calendar_record_get_int"}) {
        calendar_adapter->version = baseline;
        faults::fail(function);
        EXPECT_EQ(notify(), 0);
        EXPECT_EQ(calendar_adapter->version, current) << function;  // unreadable: consumed
        log();
    }
    calendar_adapter->version = current + 5;
    EXPECT_EQ(notify(), 0);
    EXPECT_EQ(calendar_adapter->version, current);  // an empty list sets it back, too
}

TEST_F(ChangesTest, AHandlerWithoutItsStateDoesNothing) {
    subscribe();
    add_event(book_, "foreign");
    void* const old_state = calendar_adapter;
    __is_calendar_changes(_calendar_event._uri, nullptr);
    ASSERT_EQ(qor_adapter_data_sync_deinitialize(0), 0);
    __is_calendar_changes(_calendar_event._uri, old_state);
    EXPECT_EQ(calls_, 0);
}

}  // namespace
