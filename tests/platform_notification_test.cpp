// SPDX-License-Identifier: Apache-2.0
//
// Change notification: who is told, on which main context, how often, and what a callback may do.
#include <glib.h>

#include <filesystem>
#include <string>
#include <thread>

#include "tests/support/device_test.h"
#include "tests/support/writer_process.h"

namespace {

constexpr int kBad = CALENDAR_ERROR_INVALID_PARAMETER;

struct Subscriber {
    int calls = 0;
    int version = 0;  // the store's, as seen from the callback
    std::string view;
    std::thread::id thread;
};

void count_call(const char* view_uri, void* user_data) {
    auto* const subscriber = static_cast<Subscriber*>(user_data);
    ++subscriber->calls;
    subscriber->view = view_uri;
    subscriber->thread = std::this_thread::get_id();
    static_cast<void>(calendar_db_get_current_version(&subscriber->version));  // 0 tells
}

class PlatformNotification : public DeviceTest {
  protected:
    PlatformNotification() {
        EXPECT_EQ(calendar_connect(), 0);
        book_ = add_book(1);
    }

    static void subscribe(Subscriber* subscriber, const char* view = _calendar_event._uri) {
        ASSERT_EQ(calendar_db_add_changed_cb(view, count_call, subscriber), 0);
        ASSERT_TRUE(run_until([&] { return subscriber->calls == 1; })) << "a new one is told once";
    }

    // Whether the subscription sleeps: no timer runs and nothing has come.
    static bool quiet(Subscriber* subscriber) {
        while (g_main_context_iteration(nullptr, FALSE) != FALSE) {
        }
        GSource* const source = g_main_context_find_source_by_user_data(nullptr, subscriber);
        return source != nullptr && g_source_get_ready_time(source) == -1;
    }

    int book_ = 0;
};

TEST_F(PlatformNotification, TellsOncePerBurstAndThenSleeps) {
    Subscriber subscriber;
    subscribe(&subscriber);
    EXPECT_EQ(subscriber.view, _calendar_event._uri);
    EXPECT_TRUE(quiet(&subscriber));
    for (int i = 0; i < 50; ++i) {
        add_event(book_, "burst");
    }
    EXPECT_FALSE(quiet(&subscriber)) << "own writes count";
    EXPECT_EQ(subscriber.calls, 1) << "not before the burst is over";
    EXPECT_TRUE(run_until([&] { return subscriber.calls == 2; }));
    EXPECT_EQ(subscriber.version, current_version());
    EXPECT_TRUE(quiet(&subscriber));
    EXPECT_EQ(subscriber.calls, 2);
}

TEST_F(PlatformNotification, TellsOfAnotherProcessesWrites) {
    Subscriber subscriber;
    subscribe(&subscriber);
    const int version = current_version();
    WriterProcess writer(book_, 1);
    EXPECT_TRUE(run_until([&] { return subscriber.calls == 2; }));
    writer.wait();
    EXPECT_EQ(subscriber.version, version + 1);
    EXPECT_TRUE(quiet(&subscriber));
    EXPECT_EQ(subscriber.calls, 2);

    WriterProcess burst(book_, 1000);
    burst.wait();
    EXPECT_TRUE(run_until([&] { return subscriber.version == version + 1001; }));
    EXPECT_LE(subscriber.calls, 4) << "a handful";
}

TEST_F(PlatformNotification, TellsOnlyTheViewThatChanged) {
    Subscriber events;
    Subscriber books;
    subscribe(&events);
    subscribe(&books, _calendar_book._uri);
    const int other = add_book(2);
    EXPECT_TRUE(run_until([&] { return books.calls == 2; }));
    EXPECT_TRUE(quiet(&events));
    EXPECT_EQ(events.calls, 1);
    add_event(other, "event");
    EXPECT_TRUE(run_until([&] { return events.calls == 2; }));
    EXPECT_TRUE(quiet(&books));
    EXPECT_EQ(calendar_db_delete_record(_calendar_event._uri, 99), CALENDAR_ERROR_NO_DATA);
    EXPECT_TRUE(quiet(&events)) << "a refused write is no change";
    EXPECT_EQ(calendar_db_delete_record(_calendar_book._uri, other), 0);
    EXPECT_TRUE(run_until([&] { return books.calls == 3 && events.calls == 3; }))
        << "a book's events go with it";
}

TEST_F(PlatformNotification, EndsWithItsRemovalOrTheConnection) {
    Subscriber removed;
    Subscriber dropped;
    subscribe(&removed);
    subscribe(&dropped);
    const char* const view = _calendar_event._uri;
    EXPECT_EQ(calendar_db_add_changed_cb(view, count_call, &removed), kBad) << "twice";
    EXPECT_EQ(calendar_db_add_changed_cb(view, nullptr, &removed), kBad);
    EXPECT_EQ(calendar_db_add_changed_cb("no.such.view", count_call, &removed), kBad);
    EXPECT_EQ(calendar_db_add_changed_cb(_calendar_alarm._uri, count_call, &removed),
              CALENDAR_ERROR_NOT_SUPPORTED);
    EXPECT_EQ(calendar_db_remove_changed_cb(view, count_call, nullptr), CALENDAR_ERROR_NO_DATA);
    add_event(book_, "both are due");
    EXPECT_EQ(calendar_db_remove_changed_cb(view, count_call, &removed), 0);
    EXPECT_EQ(calendar_db_remove_changed_cb(view, count_call, &removed), CALENDAR_ERROR_NO_DATA);
    EXPECT_TRUE(run_until([&] { return dropped.calls == 2; }));
    add_event(book_, "due again");
    EXPECT_FALSE(quiet(&dropped));
    EXPECT_EQ(calendar_disconnect(), 0);
    EXPECT_EQ(g_main_context_find_source_by_user_data(nullptr, &dropped), nullptr);
    EXPECT_EQ(calendar_connect(), 0);
    subscribe(&removed, _calendar_book._uri);  // iterates the main context until it is told
    EXPECT_EQ(dropped.calls, 2);
}

void remove_itself(const char* view_uri, void* user_data) {
    ++*static_cast<int*>(user_data);
    EXPECT_EQ(calendar_db_remove_changed_cb(view_uri, remove_itself, user_data), 0);
}

void disconnect(const char* /*view_uri*/, void* user_data) {
    ++*static_cast<int*>(user_data);
    EXPECT_EQ(calendar_disconnect(), 0);
}

TEST_F(PlatformNotification, ACallbackMayEndItsOwnSubscription) {
    for (const calendar_db_changed_cb callback : {remove_itself, disconnect}) {
        int calls = 0;
        EXPECT_EQ(calendar_connect(), 0);
        EXPECT_EQ(calendar_db_add_changed_cb(_calendar_event._uri, callback, &calls), 0);
        EXPECT_TRUE(run_until([&] { return calls == 1; }));
        EXPECT_EQ(g_main_context_find_source_by_user_data(nullptr, &calls), nullptr);
    }
}

TEST_F(PlatformNotification, RunsOnTheContextOfTheSubscribingThread) {
    Subscriber subscriber;
    GMainContext* const context = g_main_context_new();
    std::thread([&] {
        g_main_context_push_thread_default(context);
        EXPECT_EQ(calendar_db_add_changed_cb(_calendar_event._uri, count_call, &subscriber), 0);
        while (subscriber.calls < 1) {
            g_main_context_iteration(context, TRUE);
        }
        add_event(book_, "from the subscribing thread");
        while (subscriber.calls < 2) {
            g_main_context_iteration(context, TRUE);
        }
        EXPECT_EQ(subscriber.thread, std::this_thread::get_id());
        EXPECT_EQ(g_main_context_find_source_by_user_data(nullptr, &subscriber), nullptr);
        g_main_context_pop_thread_default(context);
    }).join();
    EXPECT_EQ(calendar_db_remove_changed_cb(_calendar_event._uri, count_call, &subscriber), 0)
        << "from another thread";
    g_main_context_unref(context);
}

TEST_F(PlatformNotification, SurvivesTheRemovalOfItsFile) {
    Subscriber subscriber;
    subscribe(&subscriber);
    EXPECT_TRUE(std::filesystem::remove(QOR_DEVICE_ROOT
                                        "/opt/usr/dbspace/.calendar-service.events-changed"));
    EXPECT_TRUE(run_until([&] { return subscriber.calls == 2; })) << "it may have missed something";
    WriterProcess writer(book_, 1);
    EXPECT_TRUE(run_until([&] { return subscriber.calls == 3; }));
    writer.wait();
}

}  // namespace
