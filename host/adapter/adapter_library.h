// SPDX-License-Identifier: Apache-2.0
//
// An adapter library, loaded by path. Before anything of it is used its 23 entry points are looked
// up and its identity is asked for. A library stays loaded until the process ends, since its timers
// may outlive every use of it.
#pragma once

#include <string>

#include "data-sync/qor_adapter_data_sync_calendar_event.h"

namespace qor {

// The entry points, under their names without the common prefix.
struct AdapterFunctions {
    decltype(&qor_adapter_get_cid) get_cid;
    decltype(&qor_adapter_get_type) get_type;
    decltype(&qor_adapter_get_name) get_name;
    decltype(&qor_adapter_data_sync_initialize) initialize;
    decltype(&qor_adapter_data_sync_deinitialize) deinitialize;
    decltype(&qor_adapter_data_sync_get_dependency) get_dependency;
    decltype(&qor_adapter_data_sync_is_ors_supported) is_ors_supported;
    decltype(&qor_adapter_data_sync_get_files_for_upsync) get_files_for_upsync;
    decltype(&qor_adapter_data_sync_get_files_for_downsync) get_files_for_downsync;
    decltype(&qor_adapter_data_sync_get_deleted_folder) get_deleted_folder;
    decltype(&qor_adapter_data_sync_set_metadata) set_metadata;
    decltype(&qor_adapter_data_sync_completed) completed;
    decltype(&qor_adapter_data_sync_done) done;
    decltype(&qor_adapter_data_sync_clear_dirty_ids) clear_dirty_ids;
    decltype(&qor_adapter_data_sync_get_dirty_ids_p) get_dirty_ids;
    decltype(&qor_adapter_data_sync_get_deleted_ids_p) get_deleted_ids;
    decltype(&qor_adapter_data_sync_clear_deleted_ids) clear_deleted_ids;
    decltype(&qor_adapter_data_sync_get_value) get_value;
    decltype(&qor_adapter_data_sync_insert_value) insert_value;
    decltype(&qor_adapter_data_sync_update_value) update_value;
    decltype(&qor_adapter_data_sync_delete_value) delete_value;
    decltype(&qor_adapter_data_sync_set_data_changed_cb) set_data_changed_cb;
    decltype(&qor_adapter_data_sync_unset_data_changed_cb) unset_data_changed_cb;
};

struct AdapterLibrary {
    std::string path;
    std::string client_id;
    std::string type;
    std::string name;  // the adapter's name in the host database's rows
    AdapterFunctions call{};
};

// Throws Failure, naming what is missing.
AdapterLibrary load_adapter(const std::string& path);

}  // namespace qor
