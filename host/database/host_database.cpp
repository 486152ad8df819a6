// SPDX-License-Identifier: Apache-2.0
//
// The host sync database.
#include "host/database/host_database.h"

#include <filesystem>
#include <utility>

#include "host/failure.h"

namespace qor {

const char* const kHostDatabasePath = QOR_DEVICE_ROOT "/opt/usr/dbspace/.cloud_qor.db";

namespace {

constexpr int kSchema = 1;

// The adapter reads adapter_id, cloud_key and adapter_name; everything else is the host's own.
constexpr const char* kCreate = R"(
CREATE TABLE IF NOT EXISTS datasync_table(
    adapter_id INTEGER,
    cloud_key TEXT NOT NULL,
    adapter_name TEXT NOT NULL,
    kind INTEGER NOT NULL,
    parent_key TEXT NOT NULL,
    title TEXT NOT NULL,
    document TEXT NOT NULL,
    device_document TEXT NOT NULL,
    cloud_revision INTEGER NOT NULL,
    pending INTEGER NOT NULL);
CREATE UNIQUE INDEX IF NOT EXISTS item_by_id ON datasync_table(adapter_id);
CREATE UNIQUE INDEX IF NOT EXISTS item_by_key ON datasync_table(cloud_key);
CREATE INDEX IF NOT EXISTS item_by_parent ON datasync_table(parent_key) WHERE parent_key <> '';
CREATE TABLE IF NOT EXISTS alias(adapter_id INTEGER PRIMARY KEY, cloud_key TEXT NOT NULL);
CREATE INDEX IF NOT EXISTS alias_by_key ON alias(cloud_key);
CREATE TABLE IF NOT EXISTS device_change(
    seq INTEGER PRIMARY KEY,
    adapter_id INTEGER NOT NULL UNIQUE,
    gone INTEGER NOT NULL,
    noticed_ms INTEGER NOT NULL,
    reason TEXT NOT NULL,
    label TEXT NOT NULL);
CREATE TABLE IF NOT EXISTS intent(
    seq INTEGER PRIMARY KEY,
    action INTEGER NOT NULL,
    cloud_key TEXT NOT NULL,
    document TEXT NOT NULL,
    cloud_revision INTEGER NOT NULL,
    base_id INTEGER NOT NULL);
CREATE TABLE IF NOT EXISTS retry(
    cloud_key TEXT PRIMARY KEY,
    reason TEXT NOT NULL,
    label TEXT NOT NULL,
    since_ms INTEGER NOT NULL,
    interrupted INTEGER NOT NULL);
CREATE TABLE IF NOT EXISTS conflict(
    id INTEGER PRIMARY KEY AUTOINCREMENT,
    time_ms INTEGER NOT NULL,
    cloud_key TEXT NOT NULL,
    label TEXT NOT NULL,
    lost TEXT NOT NULL,
    document TEXT NOT NULL,
    kept TEXT NOT NULL,
    restored INTEGER NOT NULL);
CREATE TABLE IF NOT EXISTS run(
    id INTEGER PRIMARY KEY AUTOINCREMENT,
    start_ms INTEGER NOT NULL,
    duration_ms INTEGER NOT NULL,
    trigger TEXT NOT NULL,
    result TEXT NOT NULL);
CREATE TABLE IF NOT EXISTS run_entry(
    run INTEGER NOT NULL,
    what TEXT NOT NULL,
    label TEXT NOT NULL,
    cloud_key TEXT NOT NULL,
    reason TEXT NOT NULL);
CREATE INDEX IF NOT EXISTS run_entry_by_run ON run_entry(run);
CREATE TABLE IF NOT EXISTS setting(name TEXT PRIMARY KEY, value TEXT NOT NULL);
)";

}  // namespace

bool HostDatabase::exists() {
    return std::filesystem::exists(kHostDatabasePath);
}

HostDatabase HostDatabase::open(bool create) {
    HostDatabase database(Connection(
        kHostDatabasePath, create ? Connection::Mode::kCreate : Connection::Mode::kReadWrite));
    Connection& connection = database.connection_;
    connection.script("PRAGMA journal_mode = WAL; PRAGMA synchronous = FULL");
    const std::int64_t schema = connection.number("PRAGMA user_version");
    if (schema > kSchema) {
        throw Failure(std::string(kHostDatabasePath) + " was written by a newer qor-host");
    }
    if (schema < kSchema) {
        WriteBatch batch(connection);
        connection.script(kCreate);
        connection.script("PRAGMA user_version = 1");
        batch.commit();
    }
    return database;
}

std::string HostDatabase::setting(std::string_view name) {
    Rows rows = connection_.query("SELECT value FROM setting WHERE name = ?", name);
    return rows.next() ? rows.text(0) : std::string();
}

std::int64_t HostDatabase::number(std::string_view name) {
    Rows rows = connection_.query("SELECT value FROM setting WHERE name = ?", name);
    return rows.next() ? rows.integer(0) : 0;
}

void HostDatabase::set(std::string_view name, std::string_view value) {
    connection_.run("INSERT OR REPLACE INTO setting VALUES(?, ?)", name, value);
}

void HostDatabase::set(std::string_view name, std::int64_t value) {
    set(name, std::to_string(value));
}

void HostDatabase::forget_account() {
    WriteBatch batch(connection_);
    connection_.script(
        "DELETE FROM datasync_table; DELETE FROM alias; DELETE FROM device_change; "
        "DELETE FROM intent; DELETE FROM retry; DELETE FROM setting");
    batch.commit();
}

}  // namespace qor
