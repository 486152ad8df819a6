// SPDX-License-Identifier: Apache-2.0
//
// A host's threads at work at once: value operations from several of them while the main loop gets
// notifications, queries ids and runs the retry timer. The thread sanitizer watches.
#include <glib.h>

#include <atomic>
#include <cstdlib>
#include <thread>

#include "tests/support/adapter.h"
#include "tests/support/device_test.h"

namespace {

class ConcurrencyTest : public DeviceTest {
  protected:
    ConcurrencyTest() : adapter_(kAdapterLibrary) {}
    ~ConcurrencyTest() override { adapter_.data_sync_deinitialize(0); }

    void work(int worker) {
        const std::string document = R"({"EVENT":{"title":"Worker )" + std::to_string(worker) +
                                     R"(","dtstart":"1767603600000","rrule":"FREQ=DAILY"}})";
        while (!stop_) {
            char* id = nullptr;
            EXPECT_EQ(adapter_.data_sync_insert_value(nullptr, document.c_str(), &id), 0);
            ASSERT_NE(id, nullptr);
            char* text = nullptr;
            EXPECT_EQ(adapter_.data_sync_get_value(id, "x", &text), 0);
            EXPECT_NE(std::string(text).find("Worker " + std::to_string(worker)),
                      std::string::npos);
            free(text);
            EXPECT_EQ(adapter_.data_sync_update_value(nullptr, id, document.c_str()), 0);
            EXPECT_EQ(adapter_.data_sync_delete_value(id), 0);
            free(id);
            ++rounds_;
        }
    }

    // The host's callback, on the main loop: asks at once, as a host would.
    static void on_change(void* user_data) {
        auto* const self = static_cast<ConcurrencyTest*>(user_data);
        for (const auto query_ids : {self->adapter_.data_sync_get_dirty_ids_p,
                                     self->adapter_.data_sync_get_deleted_ids_p}) {
            char** ids = nullptr;
            int count = 0;
            EXPECT_LE(query_ids(&ids, &count), 1);
            for (int i = 0; i < count; ++i) {
                free(ids[i]);
            }
            free(ids);
        }
        EXPECT_EQ(self->adapter_.data_sync_clear_deleted_ids(), 0);
        ++self->told_;
    }

    LoadedAdapter adapter_;
    std::atomic<bool> stop_ = false;
    std::atomic<int> rounds_ = 0;
    int told_ = 0;
};

TEST_F(ConcurrencyTest, WorkersAndTheMainLoopShareOneAdapter) {
    ASSERT_EQ(adapter_.data_sync_initialize(3, 0), 0);
    ASSERT_EQ(adapter_.data_sync_set_data_changed_cb(on_change, this), 0);
    ASSERT_EQ(calendar_connect(), 0);
    const int book = newest_book();
    std::thread first([this] { work(1); });
    std::thread second([this] { work(2); });
    const gint64 end = g_get_monotonic_time() + gint64{3} * G_USEC_PER_SEC;
    for (int edits = 0; g_get_monotonic_time() < end || told_ == 0; ++edits) {
        if (edits % 50 == 0) {
            add_event(book, "Edited on the device");
        }
        g_main_context_iteration(nullptr, FALSE);
        std::this_thread::yield();
    }
    stop_ = true;
    first.join();
    second.join();
    EXPECT_GT(rounds_, 5);
    // What the workers inserted they deleted; what the user made is still there.
    EXPECT_EQ(query(kAdapterFile, "SELECT count(*) FROM qor_event_data_table WHERE invalid=1"),
              "0");
    EXPECT_EQ(adapter_.data_sync_unset_data_changed_cb(), 0);
}

}  // namespace
