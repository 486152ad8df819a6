// SPDX-License-Identifier: Apache-2.0
//
// One initialised adapter, driven as its contract says: results are typed, what it allocates is
// freed, and it is unsubscribed before it is deinitialised, so that no notification meets freed
// state. A process has one session at a time, on the thread that runs the main loop.
#pragma once

#include <functional>
#include <string>
#include <vector>

#include "host/adapter/adapter_library.h"

namespace qor {

struct ItemValue {
    enum class State {
        kRead,
        kGone,       // no such item, or its event cannot be read
        kUnapplied,  // the item stands for nothing on the device yet
    };
    State state = State::kGone;
    std::string document;
};

class AdapterSession {
  public:
    // Initialises the adapter; throws Failure when it refuses.
    AdapterSession(const AdapterLibrary& library, int account_id, bool sign_in);
    AdapterSession(const AdapterSession&) = delete;
    AdapterSession& operator=(const AdapterSession&) = delete;
    ~AdapterSession();  // keeps the calendar

    // Deletes the adapter's calendar on the device and ends the session.
    void sign_out();

    // Calls `listener` from the main loop whenever something on the device has changed.
    void subscribe(std::function<void()> listener);

    // Runs the main loop until the adapter has been told of everything that was written before this
    // call. Returns whether a change by others is waiting to be listed.
    bool settle();

    // Decimal ids as the adapter lists them; what is no item number is 0 or negative.
    std::vector<int> dirty_ids();
    std::vector<int> deleted_ids();
    void clear_deleted_ids();

    // Makes the adapter list everything that is in the calendar, its own writes included: it
    // forgets which writes were its own, and its baseline becomes 0, as it does when a new session
    // advances it before anything was notified.
    void forget_everything();

    ItemValue get(int id) const;
    // The new item's number; 0 when the adapter could store none, -1 when it refused the document.
    int insert(const std::string& document) const;
    bool update(int id, const std::string& document) const;
    bool remove(int id) const;

  private:
    static void on_changed(void* session);
    void initialize(bool sign_in);
    std::vector<int> ids(decltype(AdapterFunctions::get_dirty_ids) list, const char* what);
    void unsubscribe();

    const AdapterLibrary& library_;
    const int account_id_;
    std::function<void()> listener_;
    bool subscribed_ = false;
    bool initialized_ = false;
    bool changed_ = false;
};

}  // namespace qor
