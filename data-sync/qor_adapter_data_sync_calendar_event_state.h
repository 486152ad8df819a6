// SPDX-License-Identifier: Apache-2.0
//
// What the entry points share: the module state behind one process-wide pointer, the memory release
// step and the callbacks that the device's services call. Neither initialise nor deinitialise takes
// a lock; the host excludes them from every other call.
#pragma once

#include <cstdint>

#include "common/device.h"
#include "common/owned.h"
#include "data-sync/calendar/qor_adapter_data_sync_calendar_db.h"
#include "data-sync/qor_adapter_data_sync_calendar_event.h"

struct calendar_adapter_state {
    int32_t account_id;           // as given to the latest initialise
    int32_t calendar_id;          // the adapter's calendar book; 0 not yet known
    int32_t version;              // baseline: the change version up to which changes were consumed
    int32_t current_version;      // the calendar service's version at the latest change query
    calendar_list_h change_list;  // owned: pending _calendar_updated_info records, or null
    void* data_changed_user_data;
    data_changed_callback data_changed_cb;
};

// Null while the adapter is not initialised.
extern calendar_adapter_state* calendar_adapter;

// Holds the adapter mutex for a scope.
class AdapterLock {
  public:
    AdapterLock() noexcept { _qor_calendar_lock(); }
    ~AdapterLock() { _qor_calendar_unlock(); }
    AdapterLock(const AdapterLock&) = delete;
    AdapterLock& operator=(const AdapterLock&) = delete;
};

// Destroys the pending change list, if there is one.
inline void drop_change_list(calendar_adapter_state* state) noexcept {
    if (state->change_list != nullptr) {
        static_cast<void>(calendar_list_destroy(state->change_list, true));
        state->change_list = nullptr;
    }
}

// An event with its children; null when it cannot be read.
inline Record read_event(int32_t event_id) noexcept {
    calendar_record_h event = nullptr;
    static_cast<void>(calendar_db_get_record(_calendar_event._uri, event_id, &event));
    return Record(event);
}

extern "C" {

// Gives SQLite's caches and the unused heap back to the system.
void __qor_calendar_event_release_memory(void);

// The user name of the last account on the device, as a new text (free()), or null when no account
// has one. 0, or -1 when the account service failed.
int __qor_calendar_event_get_account_user_name(char** user_name);

// For each account; user_data is the address of the text to fill. False ends the enumeration.
bool __qor_calendar_event_get_account_cb(account_h account, void* user_data);

// The calendar service's change callback; user_data is the module state.
void __is_calendar_changes(const char* view_uri, void* user_data);
}
