// SPDX-License-Identifier: Apache-2.0
//
// A look into the adapter's own database.
#include "host/adapter/adapter_files.h"

#include <filesystem>

#include "host/database/connection.h"

namespace qor {

namespace {

constexpr const char* kAdapterDatabase =
    QOR_DEVICE_ROOT "/opt/usr/data/cloud-qor/.qor-adapter-calendar.db";

// An empty file is one that the adapter has not got to yet.
std::optional<Connection> open_adapter_database() {
    std::error_code error;
    if (std::filesystem::file_size(kAdapterDatabase, error) == 0 || error) {
        return std::nullopt;
    }
    // Not opened read only: after a kill whoever reads first takes the unfinished write back.
    return Connection(kAdapterDatabase, Connection::Mode::kReadWrite);
}

std::optional<std::int64_t> read_number(const char* sql) {
    std::optional<Connection> database = open_adapter_database();
    return database ? std::optional<std::int64_t>(database->number(sql)) : std::nullopt;
}

}  // namespace

std::optional<std::int64_t> highest_adapter_id() {
    return read_number("SELECT seq FROM sqlite_sequence WHERE name = 'qor_event_data_table'");
}

std::optional<std::int64_t> adapter_baseline() {
    return read_number("SELECT version FROM version_table");
}

bool has_row(int id) {
    std::optional<Connection> database = open_adapter_database();
    return !database ||
           database->number("SELECT count(*) FROM qor_event_data_table WHERE adapter_id = ?", id) !=
               0;
}

std::vector<PendingRow> pending_rows() {
    std::vector<PendingRow> pending;
    std::optional<Connection> database = open_adapter_database();
    if (!database) {
        return pending;
    }
    Rows rows = database->query(
        "SELECT adapter_id, ori_cloud_key FROM qor_event_data_table WHERE invalid = 1");
    while (rows.next()) {
        pending.push_back({static_cast<int>(rows.integer(0)), rows.text(1)});
    }
    return pending;
}

}  // namespace qor
