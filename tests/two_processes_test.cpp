// SPDX-License-Identifier: Apache-2.0
//
// The device's user edits the calendar with qor-calendar, in a process of its own, while a host in
// this one is subscribed through the adapter.
#include <cstdlib>

#include "data-sync/qor_adapter_data_sync_calendar_event.h"
#include "tests/support/device_test.h"

namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;

class TwoProcessesTest : public DeviceTest {
  protected:
    void SetUp() override {
        ASSERT_EQ(qor_adapter_data_sync_initialize(3, 0), 0);
        ASSERT_EQ(qor_adapter_data_sync_set_data_changed_cb(count_call, &calls_), 0);
        // Subscribed after the adapter, so told after it.
        ASSERT_EQ(calendar_db_add_changed_cb(_calendar_event._uri, note_version, &seen_version_),
                  0);
    }
    ~TwoProcessesTest() override { qor_adapter_data_sync_deinitialize(0); }

    // Runs one command of qor-calendar on this device and waits for its notification. Returns how
    // often the host was told.
    int edit(const std::string& command) {
        const int before = calls_;
        const std::string line = std::string(QOR_BIN_DIR) + "/qor-calendar --device '" +
                                 directory().string() + "' " + command + " >/dev/null";
        EXPECT_EQ(std::system(line.c_str()), 0) << line;
        EXPECT_TRUE(run_until([this] { return seen_version_ >= current_version(); }));
        return calls_ - before;
    }

    static std::vector<std::string> ids(int (*query_ids)(char***, int*)) {
        char** texts = nullptr;
        int count = 0;
        EXPECT_LE(query_ids(&texts, &count), 1);
        std::vector<std::string> list;
        for (int i = 0; i < count; ++i) {
            list.emplace_back(texts[i]);
            free(texts[i]);
        }
        free(texts);
        return list;
    }
    static std::vector<std::string> dirty() { return ids(qor_adapter_data_sync_get_dirty_ids_p); }
    static std::vector<std::string> deleted() {
        return ids(qor_adapter_data_sync_get_deleted_ids_p);
    }

    static void count_call(void* calls) { ++*static_cast<int*>(calls); }
    static void note_version(const char* /*view_uri*/, void* version) {
        *static_cast<int*>(version) = current_version();
    }

    int calls_ = 0;
    int seen_version_ = 0;
};

TEST_F(TwoProcessesTest, EachEditTellsTheHostOnceAndTheIdsAreRightAndRepeatable) {
    const std::string when = " --start 2026-01-05T09:00 --zone Etc/GMT";
    EXPECT_EQ(edit("add --title One" + when + " --rrule FREQ=DAILY"), 1);
    EXPECT_THAT(dirty(), ElementsAre("1"));
    EXPECT_EQ(edit("add --title Two" + when), 1);
    EXPECT_THAT(dirty(), ElementsAre("1", "2"));
    EXPECT_THAT(dirty(), ElementsAre("1", "2"));
    EXPECT_THAT(deleted(), IsEmpty());
    EXPECT_EQ(qor_adapter_data_sync_clear_deleted_ids(), 0);
    EXPECT_THAT(dirty(), IsEmpty());

    EXPECT_EQ(edit("move 1 20260106T090000Z --start 2026-01-06T11:00"), 1);
    EXPECT_EQ(edit("delete 2"), 1);
    // The moved occurrence is an event of its own; its old date is a cancelled occurrence.
    EXPECT_EQ(dirty().size(), 4U);
    EXPECT_THAT(deleted(), ElementsAre("2"));
    EXPECT_THAT(deleted(), ElementsAre("-1"));
    EXPECT_EQ(qor_adapter_data_sync_clear_deleted_ids(), 0);
    EXPECT_THAT(deleted(), IsEmpty());
}

}  // namespace
