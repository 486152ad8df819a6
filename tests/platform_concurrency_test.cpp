// SPDX-License-Identifier: Apache-2.0
//
// Several processes and several threads on one calendar store.
#include <array>
#include <atomic>
#include <memory>
#include <thread>
#include <vector>

#include "tests/support/device_test.h"
#include "tests/support/writer_process.h"

namespace {

constexpr char kStore[] = QOR_DEVICE_ROOT "/opt/usr/dbspace/.calendar-service.db";

class PlatformConcurrency : public DeviceTest {};

TEST_F(PlatformConcurrency, ProcessesMayCreateTheStoreAtTheSameMoment) {
    std::array<std::unique_ptr<WriterProcess>, 6> writers;
    for (auto& writer : writers) {
        writer = std::make_unique<WriterProcess>(0, 0);
    }
    EXPECT_EQ(calendar_connect(), 0);
    for (const auto& writer : writers) {
        writer->wait();
    }
    EXPECT_GT(add_book(1), 0);
}

// Every write of every thread and process is there, each with a version of its own.
TEST_F(PlatformConcurrency, EveryoneWritesAtOnce) {
    constexpr int kEach = 100;
    ASSERT_EQ(calendar_connect(), 0);
    const int book = add_book(1);
    const int start = current_version();
    WriterProcess first(book, kEach);
    WriterProcess second(book, kEach);
    std::atomic<bool> done = false;
    std::thread reader([&] {
        while (!done) {
            calendar_list_h list = nullptr;
            int version = 0;
            int count = 0;
            EXPECT_EQ(
                calendar_db_get_changes_by_version(_calendar_event._uri, book, 0, &list, &version),
                0);
            const List owner(list);
            EXPECT_EQ(calendar_list_get_count(list, &count), 0);
            EXPECT_EQ(count, version - start) << "one moment's list and version";
        }
    });
    std::array<std::thread, 2> threads;
    for (std::thread& thread : threads) {
        thread = std::thread([&] {
            for (int n = 0; n < kEach; ++n) {
                int version = 0;
                const int id = add_event(book, "thread");
                EXPECT_EQ(calendar_db_get_last_change_version(&version), 0);
                EXPECT_EQ(
                    query(kStore, "SELECT version FROM events WHERE id=" + std::to_string(id)),
                    std::to_string(version));
            }
        });
    }
    for (std::thread& thread : threads) {
        thread.join();
    }
    done = true;
    reader.join();
    first.wait();
    second.wait();
    EXPECT_EQ(current_version(), start + 4 * kEach);
    EXPECT_EQ(query(kStore, "SELECT count(*), count(DISTINCT version) FROM events"), "400|400");
}

TEST_F(PlatformConcurrency, SubscriptionsAndConnectionsMayComeAndGoInThreads) {
    ASSERT_EQ(calendar_connect(), 0);
    const int book = add_book(1);
    const auto ignore = [](const char*, void*) {};
    std::vector<std::thread> threads;
    threads.emplace_back([&] {
        for (int i = 0; i < 50; ++i) {
            // Each may find the service connected or not.
            const int rc = calendar_db_add_changed_cb(_calendar_event._uri, ignore, &threads);
            EXPECT_TRUE(rc == 0 || rc == CALENDAR_ERROR_NOT_CONNECTED) << rc;
            static_cast<void>(
                calendar_db_remove_changed_cb(_calendar_event._uri, ignore, &threads));
        }
    });
    threads.emplace_back([&] {
        for (int i = 0; i < 50; ++i) {
            EXPECT_EQ(calendar_disconnect(), 0);
            EXPECT_EQ(calendar_connect(), 0);
        }
    });
    threads.emplace_back([&] {
        for (int i = 0; i < 50; ++i) {
            const Record event = new_record(_calendar_event._uri);
            EXPECT_EQ(calendar_record_set_int(event.get(), _calendar_event.calendar_book_id, book),
                      0);
            const int rc = calendar_db_insert_record(event.get(), nullptr);
            EXPECT_TRUE(rc == 0 || rc == CALENDAR_ERROR_NOT_CONNECTED) << rc;
        }
    });
    for (std::thread& thread : threads) {
        thread.join();
    }
    EXPECT_GT(add_event(book, "still working"), 0);
}

}  // namespace
