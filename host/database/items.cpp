// SPDX-License-Identifier: Apache-2.0
//
// The items.
#include "host/database/items.h"

namespace qor {

namespace {

constexpr const char* kAdapterName = "CALENDAR";

#define QOR_ITEM_COLUMNS                                                          \
    "cloud_key, adapter_id, kind, parent_key, title, document, device_document, " \
    "cloud_revision, pending"

constexpr const char* kByKey =
    "SELECT " QOR_ITEM_COLUMNS " FROM datasync_table WHERE cloud_key = ?";
constexpr const char* kById =
    "SELECT " QOR_ITEM_COLUMNS " FROM datasync_table WHERE adapter_id = ?";
constexpr const char* kByParent = "SELECT " QOR_ITEM_COLUMNS
                                  " FROM datasync_table WHERE parent_key = ? AND parent_key <> '' "
                                  "ORDER BY rowid";
constexpr const char* kAbsent =
    "SELECT " QOR_ITEM_COLUMNS " FROM datasync_table WHERE adapter_id IS NULL ORDER BY rowid";
constexpr const char* kPending =
    "SELECT " QOR_ITEM_COLUMNS " FROM datasync_table WHERE pending = 1 ORDER BY rowid";
constexpr const char* kAll = "SELECT " QOR_ITEM_COLUMNS " FROM datasync_table ORDER BY rowid";
constexpr const char* kFirst =
    "SELECT " QOR_ITEM_COLUMNS
    " FROM datasync_table WHERE adapter_id > 0 AND kind = 0 "
    "AND adapter_id NOT IN (SELECT adapter_id FROM device_change) LIMIT 1";
constexpr const char* kStore =
    "INSERT INTO datasync_table(" QOR_ITEM_COLUMNS
    ", adapter_name) "
    "VALUES(?, ?, ?, ?, ?, ?, ?, ?, ?, ?) ON CONFLICT(cloud_key) DO UPDATE SET "
    "adapter_id = excluded.adapter_id, kind = excluded.kind, parent_key = excluded.parent_key, "
    "title = excluded.title, document = excluded.document, "
    "device_document = excluded.device_document, cloud_revision = excluded.cloud_revision, "
    "pending = excluded.pending";
constexpr const char* kCounts =
    "SELECT coalesce(sum(kind = 0), 0), coalesce(sum(kind <> 0), 0), coalesce(sum(pending), 0) "
    "FROM datasync_table";

Item read(const Rows& rows) {
    Item item;
    item.key = rows.text(0);
    item.id = static_cast<int>(rows.integer(1));
    item.kind = static_cast<ItemKind>(rows.integer(2));
    item.parent_key = rows.text(3);
    item.label = rows.text(4);
    item.document = rows.text(5);
    item.device_document = rows.text(6);
    item.revision = rows.integer(7);
    item.pending = rows.integer(8) != 0;
    return item;
}

std::optional<Item> read_one(Rows rows) {
    return rows.next() ? std::optional<Item>(read(rows)) : std::nullopt;
}

std::vector<Item> read_all(Rows rows) {
    std::vector<Item> items;
    while (rows.next()) {
        items.push_back(read(rows));
    }
    return items;
}

}  // namespace

std::optional<Item> Items::by_key(std::string_view key) {
    return read_one(connection_.query(kByKey, key));
}

std::optional<Item> Items::by_id(int id) {
    return read_one(connection_.query(kById, id));
}

std::vector<Item> Items::children(std::string_view parent_key) {
    return read_all(connection_.query(kByParent, parent_key));
}

std::vector<Item> Items::absent() {
    return read_all(connection_.query(kAbsent));
}

std::vector<Item> Items::pending() {
    return read_all(connection_.query(kPending));
}

void Items::each(const std::function<void(const Item&)>& visit) {
    for (const Item& item : read_all(connection_.query(kAll))) {
        visit(item);
    }
}

std::optional<Item> Items::first_on_device() {
    return read_one(connection_.query(kFirst));
}

void Items::store(const Item& item) {
    const std::optional<std::int64_t> id =
        item.id > 0 ? std::optional<std::int64_t>(item.id) : std::nullopt;
    connection_.run(kStore, item.key, id, static_cast<std::int64_t>(item.kind), item.parent_key,
                    item.label, item.document, item.device_document, item.revision,
                    static_cast<std::int64_t>(item.pending), kAdapterName);
}

void Items::forget(std::string_view key) {
    connection_.run("DELETE FROM datasync_table WHERE cloud_key = ?", key);
    connection_.run("DELETE FROM alias WHERE cloud_key = ?", key);
}

bool Items::is_alias(int id) {
    return connection_.number("SELECT count(*) FROM alias WHERE adapter_id = ?", id) != 0;
}

void Items::add_alias(int id, std::string_view key) {
    connection_.run("INSERT OR REPLACE INTO alias VALUES(?, ?)", id, key);
}

void Items::drop_alias(int id) {
    connection_.run("DELETE FROM alias WHERE adapter_id = ?", id);
}

std::vector<int> Items::aliases(std::string_view key) {
    Rows rows = connection_.query("SELECT adapter_id FROM alias WHERE cloud_key = ?", key);
    std::vector<int> ids;
    while (rows.next()) {
        ids.push_back(static_cast<int>(rows.integer(0)));
    }
    return ids;
}

Items::Counts Items::counts() {
    Rows rows = connection_.query(kCounts);
    rows.next();
    return {rows.integer(0), rows.integer(1), rows.integer(2)};
}

}  // namespace qor
