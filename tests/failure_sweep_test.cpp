// SPDX-License-Identifier: Apache-2.0
//
// Two scenarios, a first start and one that uses every entry point, run once for each call that the
// adapter makes of a wrapped function (device services, SQLite, ICU, the JSON library, the
// allocator): in run n the n-th call fails. Whatever it is, the entry points answer with their
// codes, what was committed before is still there, and the adapter works again. Together they pass
// every place of the adapter that calls such a function.
#include <glib.h>

#include <cstdlib>
#include <functional>
#include <string>

#include "tests/support/adapter.h"
#include "tests/support/device_test.h"

namespace {

constexpr char kWeekly[] =
    R"({"EVENT":{"title":"Stand-up","eventLocation":"Room","description":"Daily","dtstart":"1767603600000","dtend":"1767607200000","eventTimezone":"Asia/Tokyo","rrule":"FREQ=WEEKLY;BYDAY=MO;UNTIL=20261231T000000Z;WKST=MO","organizer":"Ann","longitude":"-122419416","latitude":"37566535"},"REMINDERS":[{"method":"1","minutes":"15"}]})";
constexpr char kAllDay[] =
    R"({"EVENT":{"title":"Holiday","allDay":"1","duration":"P2D","dtstart":"1767571200000","accessLevel":"0","rrule":"FREQ=YEARLY;INTERVAL=2;COUNT=3;BYSECOND=0;BYMINUTE=0;BYHOUR=0;BYDAY=MO;BYMONTHDAY=5;BYYEARDAY=5;BYWEEKNO=2;BYMONTH=1;BYSETPOS=1"}})";
constexpr char kChanged[] =
    R"({"EVENT":{"title":"Moved","dtstart":"1767690000000","original_sync_id":"parent-key","originalInstanceTime":"1767690000000"}})";
constexpr char kChangedLater[] =
    R"({"EVENT":{"title":"Moved","dtstart":"1767949200000","original_sync_id":"parent-key","originalInstanceTime":"1767949200000"}})";
constexpr char kCancelled[] =
    R"({"EVENT":{"dtstart":"1767776400000","original_sync_id":"parent-key","originalInstanceTime":"1767776400000","eventStatus":"2"}})";
constexpr char kCancelledLater[] =
    R"({"EVENT":{"dtstart":"1767862800000","original_sync_id":"parent-key","originalInstanceTime":"1767862800000","eventStatus":"2"}})";

constexpr char kCalendarFile[] = QOR_DEVICE_ROOT "/opt/usr/dbspace/.calendar-service.db";
constexpr int kShards = 8;
constexpr int kAccount = 3;

class FailureSweepTest : public DeviceTest {
  protected:
    FailureSweepTest() : adapter_(kFaultyLibrary) {}
    ~FailureSweepTest() override {
        adapter_.faults()->clear();
        settle();
        adapter_.data_sync_deinitialize(0);
    }

    static GSource* retry_timer() {
        return g_main_context_find_source_by_user_data(nullptr, nullptr);
    }
    // Runs the retry, if one is waiting.
    static void settle() {
        if (GSource* timer = retry_timer()) {
            g_source_set_ready_time(timer, 0);
            EXPECT_TRUE(run_until([] { return retry_timer() == nullptr; }));
        }
    }

    static guint next_source_id() {
        const guint id = g_idle_add([](gpointer) -> gboolean { return G_SOURCE_REMOVE; }, nullptr);
        g_source_remove(id);
        return id + 1;
    }
    // Tells the subscribers what has changed so far, without the delay that makes one call of a
    // burst: the watches that have seen a change wait for a time, which is made due.
    void deliver_changes() {
        const auto run_what_is_ready = [] {
            while (g_main_context_iteration(nullptr, FALSE)) {
            }
        };
        run_what_is_ready();
        const guint end = next_source_id();
        for (guint id = first_source_; id < end; ++id) {
            GSource* const source = g_main_context_find_source_by_id(nullptr, id);
            if (source != nullptr && source != retry_timer() &&
                g_source_get_ready_time(source) > 0) {
                g_source_set_ready_time(source, 0);
            }
        }
        run_what_is_ready();
    }

    void switch_off() {
        settle();
        adapter_.data_sync_deinitialize(0);
        static_cast<void>(calendar_disconnect());  // a device that was not used has no connection
    }

    // A new device with an account and nothing else.
    void empty_device() {
        switch_off();
        std::filesystem::remove_all("opt");
        std::filesystem::create_directories(kAdapterFolder);
        std::filesystem::create_directories(QOR_DEVICE_ROOT "/opt/usr/dbspace");
        ASSERT_EQ(account_connect(), 0);
        int account = 0;
        EXPECT_EQ(account_insert("ann@example.org", &account), 0);
        ASSERT_EQ(account_disconnect(), 0);
    }

    // A new device on which one event has been synced before: a copy of one that was made once.
    void fresh_device() {
        if (!std::filesystem::exists("used")) {
            empty_device();
            ASSERT_EQ(adapter_.data_sync_initialize(kAccount, 1), 0);
            kept_ = insert(R"({"EVENT":{"title":"Kept"}})");
            switch_off();
            std::filesystem::rename("opt", "used");
        }
        switch_off();
        std::filesystem::remove_all("opt");
        std::filesystem::copy("used", "opt", std::filesystem::copy_options::recursive);
        first_source_ = next_source_id();
        ASSERT_EQ(calendar_connect(), 0);
        version_seen_ = 0;
        ASSERT_EQ(calendar_db_add_changed_cb(_calendar_event._uri, note_version, &version_seen_),
                  0);
        faults::take_log(adapter_.faults());
    }

    std::string insert(const char* document) {
        char* id = nullptr;
        expect_code(adapter_.data_sync_insert_value(nullptr, document, &id));
        std::string text = id != nullptr ? id : "0";
        free(id);
        return text;
    }

    std::string get(const std::string& id) {
        char* document = nullptr;
        const int result = adapter_.data_sync_get_value(id.c_str(), "sweep", &document);
        EXPECT_GE(result, 0);
        EXPECT_EQ(result == 0, document != nullptr);
        std::string text = document != nullptr ? document : "";
        free(document);
        return text;
    }

    std::vector<std::string> ids(int (*query_ids)(char***, int*)) {
        char** texts = nullptr;
        int count = 0;
        const int result = query_ids(&texts, &count);
        EXPECT_TRUE(result == 0 || result == 1 || result == 6) << result;
        EXPECT_EQ(texts != nullptr, result == 0 && count > 0);
        std::vector<std::string> list;
        for (int i = 0; i < count; ++i) {
            list.emplace_back(texts[i]);
            free(texts[i]);
        }
        free(texts);
        return list;
    }

    // Signs in on a device that has never been used, and out.
    void first_start() {
        expect_code(adapter_.data_sync_initialize(kAccount, 1));
        insert(kWeekly);
        const int ended = adapter_.data_sync_deinitialize(1);
        EXPECT_TRUE(ended == 0 || ended == 5) << ended;
    }

    // Every entry point, and what the device's user does in between.
    void scenario() {
        for (const char* getter :
             {"qor_adapter_get_cid", "qor_adapter_get_type", "qor_adapter_get_name"}) {
            char* text = nullptr;
            reinterpret_cast<int (*)(char**)>(adapter_.symbol(getter))(&text);
            free(text);
        }
        expect_code(adapter_.data_sync_initialize(kAccount, 0));
        const int subscribed = adapter_.data_sync_set_data_changed_cb(count_call, &calls_);
        EXPECT_TRUE(subscribed <= 0 || subscribed == 6) << subscribed;
        for (const char* document : {kChangedLater, kCancelledLater, kCancelledLater}) {
            insert(document);  // before its parent
        }
        const std::string parent = insert(kWeekly);
        add_cloud_key(std::atoi(parent.c_str()), "parent-key");
        const std::string changed = insert(kChanged);
        const std::string cancelled = insert(kCancelled);
        const std::string holiday = insert(kAllDay);
        settle();
        for (const std::string& id : {parent, changed, cancelled, holiday}) {
            get(id);
        }
        expect_code(adapter_.data_sync_update_value(nullptr, changed.c_str(), kChanged));
        edit_as_user();
        for (const std::string& id : ids(adapter_.data_sync_get_dirty_ids_p)) {
            get(id);
        }
        ids(adapter_.data_sync_get_deleted_ids_p);
        expect_code(adapter_.data_sync_clear_deleted_ids());
        expect_code(adapter_.data_sync_delete_value(parent.c_str()));
        expect_code(adapter_.data_sync_unset_data_changed_cb());
        const int ended = adapter_.data_sync_deinitialize(0);
        EXPECT_TRUE(ended == 0 || ended == 5) << ended;
    }

    // Edits, deletes and adds; then lets the notification reach the adapter.
    void edit_as_user() {
        const int book = newest_book();
        const int added = add_event(book, "Added");
        const int exception = add_event(book, "Exception", added);
        set_text(added, _calendar_event.exdate, "20260105T090000Z,20260106T090000Z");
        set_text(exception, _calendar_event.location, "Elsewhere");
        const int gone = add_event(book, "Gone");
        ASSERT_EQ(calendar_db_delete_record(_calendar_event._uri, gone), 0);
        deliver_changes();
        EXPECT_EQ(version_seen_, current_version());
        static_cast<void>(ids(adapter_.data_sync_get_dirty_ids_p));  // the second tells occurrences
    }

    void expect_code(int result) { EXPECT_TRUE(result == 0 || result == 6) << result; }

    // A scenario on a new device, for each call from the first on, every step-th, that it makes:
    // that call fails. What must hold is checked after each run.
    void sweep(const std::function<void()>& new_device, const std::function<void()>& run,
               const std::function<void()>& check, int first, int step) {
        const FaultControl* faults = adapter_.faults();
        new_device();
        faults->fail("", 0);
        run();
        const int positions = faults->calls();
        faults->clear();
        ASSERT_GT(positions, 50);
        check();
        // A failure may shorten or lengthen what follows; beyond the last position nothing fails.
        for (int n = first; n <= positions && !HasFailure(); n += step) {
            new_device();
            faults->fail("", n);
            run();
            const char* const fired = faults->fired();
            const std::string where = fired != nullptr ? fired : "nothing";
            faults->clear();
            SCOPED_TRACE("call " + std::to_string(n) + ", " + where + " failed");
            EXPECT_NE(fired, nullptr);
            check();
        }
    }

    void start_again() {
        ASSERT_EQ(adapter_.data_sync_initialize(kAccount, 0), 0);
        for (const char* file : {kAdapterFile, kCalendarFile}) {
            EXPECT_EQ(query(file, "PRAGMA integrity_check"), "ok");
        }
    }

    void expect_intact_and_usable() {
        start_again();
        EXPECT_NE(get(kept_).find("\"Kept\""), std::string::npos);
        EXPECT_NE(get(insert(kWeekly)).find("\"Stand-up\""), std::string::npos);
    }

    // There is one book, also if signing out could not delete the one before. Deliberate: a table
    // that could not be made is not made up for while the file is there.
    void expect_a_second_start_works() {
        start_again();
        EXPECT_EQ(query(kCalendarFile, "SELECT count(*) FROM books WHERE account_id = 3"), "1");
        const bool has_rows = query(kAdapterFile,
                                    "SELECT count(*) FROM sqlite_master WHERE name = "
                                    "'qor_event_data_table'") == "1";
        EXPECT_EQ(get(insert(kWeekly)).find("\"Stand-up\"") != std::string::npos, has_rows);
    }

    static void count_call(void* calls) { ++*static_cast<int*>(calls); }
    static void note_version(const char* /*view_uri*/, void* version) {
        *static_cast<int*>(version) = current_version();
    }

    LoadedAdapter adapter_;
    std::string kept_;
    int calls_ = 0;
    int version_seen_ = 0;
    guint first_source_ = 0;  // the first id of a source that can belong to the device in use
};

TEST_F(FailureSweepTest, NoSingleFailureOfAFirstStartKeepsTheAdapterFromStarting) {
    sweep([this] { empty_device(); }, [this] { first_start(); },
          [this] { expect_a_second_start_works(); }, 1, 1);
}

class ShardTest : public FailureSweepTest, public ::testing::WithParamInterface<int> {};

TEST_P(ShardTest, NoSingleFailureBreaksTheAdapterOrLosesWhatWasCommitted) {
    sweep([this] { fresh_device(); }, [this] { scenario(); },
          [this] { expect_intact_and_usable(); }, 1 + GetParam(), kShards);
}

INSTANTIATE_TEST_SUITE_P(Shards, ShardTest, ::testing::Range(0, kShards));

}  // namespace
