// SPDX-License-Identifier: Apache-2.0
//
// A scenario that uses every entry point, run once for each call that the adapter makes of a
// wrapped function (device services, SQLite, ICU, the JSON library, the allocator): in run n the
// n-th call fails. Whatever it is, the entry points answer with their codes, what was committed
// before is still there, and the adapter works again.
#include <glib.h>

#include <cstdlib>
#include <string>

#include "tests/support/adapter.h"
#include "tests/support/device_test.h"

namespace {

constexpr char kWeekly[] =
    R"({"EVENT":{"title":"Stand-up","eventLocation":"Room","description":"Daily","dtstart":"1767603600000","dtend":"1767607200000","eventTimezone":"Asia/Tokyo","rrule":"FREQ=WEEKLY;BYDAY=MO;UNTIL=20261231T000000Z;WKST=MO","organizer":"Ann","longitude":"-122419416","latitude":"37566535"},"REMINDERS":[{"method":"1","minutes":"15"}]})";
constexpr char kAllDay[] =
    R"({"EVENT":{"title":"Holiday","allDay":"1","dtstart":"1767571200000","duration":"P2D"}})";
constexpr char kChanged[] =
    R"({"EVENT":{"title":"Moved","dtstart":"1767690000000","original_sync_id":"parent-key","originalInstanceTime":"1767690000000"}})";
constexpr char kCancelled[] =
    R"({"EVENT":{"dtstart":"1767776400000","original_sync_id":"parent-key","originalInstanceTime":"1767776400000","eventStatus":"2"}})";
constexpr char kCancelledLater[] =
    R"({"EVENT":{"dtstart":"1767862800000","original_sync_id":"parent-key","originalInstanceTime":"1767862800000","eventStatus":"2"}})";

constexpr int kShards = 8;  // most of a run is waiting for a notification

class FailureSweepTest : public DeviceTest, public ::testing::WithParamInterface<int> {
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

    // A new device on which one event has been synced before.
    void fresh_device() {
        settle();
        adapter_.data_sync_deinitialize(0);
        static_cast<void>(calendar_disconnect());
        std::filesystem::remove_all("opt");
        std::filesystem::create_directories(kAdapterFolder);
        std::filesystem::create_directories(QOR_DEVICE_ROOT "/opt/usr/dbspace");
        ASSERT_EQ(adapter_.data_sync_initialize(3, 1), 0);
        kept_ = insert(R"({"EVENT":{"title":"Kept"}})");
        settle();
        adapter_.data_sync_deinitialize(0);
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

    // Every entry point, and what the device's user does in between.
    void scenario() {
        for (const char* getter :
             {"qor_adapter_get_cid", "qor_adapter_get_type", "qor_adapter_get_name"}) {
            char* text = nullptr;
            reinterpret_cast<int (*)(char**)>(adapter_.symbol(getter))(&text);
            free(text);
        }
        expect_code(adapter_.data_sync_initialize(3, 0));
        const int subscribed = adapter_.data_sync_set_data_changed_cb(count_call, &calls_);
        EXPECT_TRUE(subscribed <= 0 || subscribed == 6) << subscribed;
        insert(kCancelledLater);  // before its parent
        const std::string parent = insert(kWeekly);
        add_cloud_key(std::atoi(parent.c_str()), "parent-key");
        const std::string changed = insert(kChanged);
        const std::string cancelled = insert(kCancelled);
        const std::string holiday = insert(kAllDay);
        settle();
        expect_code(adapter_.data_sync_update_value(nullptr, holiday.c_str(), kAllDay));
        for (const std::string& id : {parent, changed, cancelled, holiday}) {
            get(id);
        }
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
        EXPECT_TRUE(run_until([this] { return version_seen_ >= current_version(); }));
        static_cast<void>(ids(adapter_.data_sync_get_dirty_ids_p));  // the second tells occurrences
    }

    void expect_code(int result) { EXPECT_TRUE(result == 0 || result == 6) << result; }

    void expect_intact_and_usable() {
        for (const char* file :
             {kAdapterFile, QOR_DEVICE_ROOT "/opt/usr/dbspace/.calendar-service.db"}) {
            EXPECT_EQ(query(file, "PRAGMA integrity_check"), "ok");
        }
        ASSERT_EQ(adapter_.data_sync_initialize(3, 0), 0);
        EXPECT_NE(get(kept_).find("\"Kept\""), std::string::npos);
        EXPECT_NE(get(insert(kWeekly)).find("\"Stand-up\""), std::string::npos);
    }

    static void count_call(void* calls) { ++*static_cast<int*>(calls); }
    static void note_version(const char* /*view_uri*/, void* version) {
        *static_cast<int*>(version) = current_version();
    }

    LoadedAdapter adapter_;
    std::string kept_;
    int calls_ = 0;
    int version_seen_ = 0;
};

TEST_P(FailureSweepTest, NoSingleFailureBreaksTheAdapterOrLosesWhatWasCommitted) {
    const FaultControl* faults = adapter_.faults();
    fresh_device();
    faults->fail("", 0);
    scenario();
    const int positions = faults->calls();
    faults->clear();
    ASSERT_GT(positions, 300);
    expect_intact_and_usable();
    // A failure may shorten or lengthen what follows; beyond the last position nothing fails.
    for (int n = 1 + GetParam(); n <= positions; n += kShards) {
        fresh_device();
        faults->fail("", n);
        scenario();
        const char* const fired = faults->fired();
        const std::string where = fired != nullptr ? fired : "nothing";
        faults->clear();
        SCOPED_TRACE("call " + std::to_string(n) + ", " + where + " failed");
        EXPECT_NE(fired, nullptr);
        expect_intact_and_usable();
        if (HasFailure()) {
            return;
        }
    }
}

INSTANTIATE_TEST_SUITE_P(Shards, FailureSweepTest, ::testing::Range(0, kShards));

}  // namespace
