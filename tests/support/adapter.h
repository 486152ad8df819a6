// SPDX-License-Identifier: Apache-2.0
//
// The built adapter library as a host sees it: loaded with dlopen, its entry points by name. The
// variant with the fault layer also carries qor_fault_control.
#pragma once

#include <dlfcn.h>

#include <stdexcept>
#include <string>
#include <vector>

#include "data-sync/qor_adapter_data_sync_calendar_event.h"
#include "tests/support/faults.h"

inline constexpr const char* kAdapterLibrary = QOR_LIB_DIR "/libqor-adapter-calendar.so";
inline constexpr const char* kFaultyLibrary = QOR_LIB_DIR "/libqor-adapter-calendar-faults.so";

class LoadedAdapter {
  public:
    explicit LoadedAdapter(const char* path) : handle_(dlopen(path, RTLD_NOW | RTLD_LOCAL)) {
        if (handle_ == nullptr) {
            throw std::runtime_error(dlerror());
        }
#define QOR_LOAD(name) name = reinterpret_cast<decltype(name)>(dlsym(handle_, "qor_adapter_" #name))
        QOR_LOAD(data_sync_initialize);
        QOR_LOAD(data_sync_deinitialize);
        QOR_LOAD(data_sync_get_dirty_ids_p);
        QOR_LOAD(data_sync_get_deleted_ids_p);
        QOR_LOAD(data_sync_clear_deleted_ids);
        QOR_LOAD(data_sync_get_value);
        QOR_LOAD(data_sync_insert_value);
        QOR_LOAD(data_sync_update_value);
        QOR_LOAD(data_sync_delete_value);
        QOR_LOAD(data_sync_set_data_changed_cb);
        QOR_LOAD(data_sync_unset_data_changed_cb);
        QOR_LOAD(get_cid);
#undef QOR_LOAD
        auto* const control = dlsym(handle_, "qor_fault_control");
        faults_ = control != nullptr ? reinterpret_cast<decltype(&qor_fault_control)>(control)()
                                     : nullptr;
    }
    // The library stays loaded: sources on the main loop may still name its functions.
    ~LoadedAdapter() = default;
    LoadedAdapter(const LoadedAdapter&) = delete;
    LoadedAdapter& operator=(const LoadedAdapter&) = delete;

    const FaultControl* faults() const {
        return faults_;
    }
    void* symbol(const char* name) const {
        return dlsym(handle_, name);
    }

    decltype(&qor_adapter_data_sync_initialize) data_sync_initialize;
    decltype(&qor_adapter_data_sync_deinitialize) data_sync_deinitialize;
    decltype(&qor_adapter_data_sync_get_dirty_ids_p) data_sync_get_dirty_ids_p;
    decltype(&qor_adapter_data_sync_get_deleted_ids_p) data_sync_get_deleted_ids_p;
    decltype(&qor_adapter_data_sync_clear_deleted_ids) data_sync_clear_deleted_ids;
    decltype(&qor_adapter_data_sync_get_value) data_sync_get_value;
    decltype(&qor_adapter_data_sync_insert_value) data_sync_insert_value;
    decltype(&qor_adapter_data_sync_update_value) data_sync_update_value;
    decltype(&qor_adapter_data_sync_delete_value) data_sync_delete_value;
    decltype(&qor_adapter_data_sync_set_data_changed_cb) data_sync_set_data_changed_cb;
    decltype(&qor_adapter_data_sync_unset_data_changed_cb) data_sync_unset_data_changed_cb;
    decltype(&qor_adapter_get_cid) get_cid;

  private:
    void* handle_;
    const FaultControl* faults_ = nullptr;
};
