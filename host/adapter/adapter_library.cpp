// SPDX-License-Identifier: Apache-2.0
//
// Loading an adapter library.
#include "host/adapter/adapter_library.h"

#include <dlfcn.h>
#include <fmt/format.h>

#include <cstdlib>
#include <memory>
#include <vector>

#include "host/failure.h"

namespace qor {

namespace {

struct Free {
    void operator()(char* text) const noexcept { std::free(text); }
};

// Looks entry points up one by one and remembers which were missing.
class Lookup {
  public:
    explicit Lookup(void* library) : library_(library) {}

    template <typename Function>
    void operator()(const char* name, Function*& function) {
        function = reinterpret_cast<Function*>(dlsym(library_, name));
        if (function == nullptr) {
            missing_.emplace_back(name);
        }
    }
    const std::vector<std::string>& missing() const { return missing_; }

  private:
    void* library_;
    std::vector<std::string> missing_;
};

std::vector<std::string> look_up(void* library, AdapterFunctions& call) {
    Lookup find(library);
    find("qor_adapter_get_cid", call.get_cid);
    find("qor_adapter_get_type", call.get_type);
    find("qor_adapter_get_name", call.get_name);
    find("qor_adapter_data_sync_initialize", call.initialize);
    find("qor_adapter_data_sync_deinitialize", call.deinitialize);
    find("qor_adapter_data_sync_get_dependency", call.get_dependency);
    find("qor_adapter_data_sync_is_ors_supported", call.is_ors_supported);
    find("qor_adapter_data_sync_get_files_for_upsync", call.get_files_for_upsync);
    find("qor_adapter_data_sync_get_files_for_downsync", call.get_files_for_downsync);
    find("qor_adapter_data_sync_get_deleted_folder", call.get_deleted_folder);
    find("qor_adapter_data_sync_set_metadata", call.set_metadata);
    find("qor_adapter_data_sync_completed", call.completed);
    find("qor_adapter_data_sync_done", call.done);
    find("qor_adapter_data_sync_clear_dirty_ids", call.clear_dirty_ids);
    find("qor_adapter_data_sync_get_dirty_ids_p", call.get_dirty_ids);
    find("qor_adapter_data_sync_get_deleted_ids_p", call.get_deleted_ids);
    find("qor_adapter_data_sync_clear_deleted_ids", call.clear_deleted_ids);
    find("qor_adapter_data_sync_get_value", call.get_value);
    find("qor_adapter_data_sync_insert_value", call.insert_value);
    find("qor_adapter_data_sync_update_value", call.update_value);
    find("qor_adapter_data_sync_delete_value", call.delete_value);
    find("qor_adapter_data_sync_set_data_changed_cb", call.set_data_changed_cb);
    find("qor_adapter_data_sync_unset_data_changed_cb", call.unset_data_changed_cb);
    return find.missing();
}

std::string identity(int (*getter)(char**)) {
    char* text = nullptr;
    getter(&text);  // always 0; a null text tells that memory ran out
    const std::unique_ptr<char, Free> owned(text);
    return text == nullptr ? std::string() : std::string(text);
}

}  // namespace

AdapterLibrary load_adapter(const std::string& path) {
    void* library = dlopen(path.c_str(), RTLD_NOW | RTLD_LOCAL);
    if (library == nullptr) {
        throw Failure(fmt::format("cannot load the adapter: {}", dlerror()));
    }
    AdapterLibrary adapter;
    adapter.path = path;
    const std::vector<std::string> missing = look_up(library, adapter.call);
    if (!missing.empty()) {
        throw Failure(fmt::format("{} is no adapter: {} of its 23 entry points are missing: {}",
                                  path, missing.size(), fmt::join(missing, ", ")));
    }
    adapter.client_id = identity(adapter.call.get_cid);
    adapter.type = identity(adapter.call.get_type);
    adapter.name = identity(adapter.call.get_name);
    if (adapter.client_id.empty() || adapter.type != "DATASYNC" || adapter.name != "CALENDAR") {
        throw Failure(
            fmt::format("{} is an adapter of type '{}' named '{}'; this host syncs with "
                        "type 'DATASYNC' named 'CALENDAR'",
                        path, adapter.type, adapter.name));
    }
    return adapter;
}

}  // namespace qor
