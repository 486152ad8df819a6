// SPDX-License-Identifier: Apache-2.0
#include "bench/adapter_costs.h"

#include <algorithm>
#include <filesystem>
#include <utility>

#include "bench/counters.h"
#include "bench/null_service.h"
#include "data-sync/qor_adapter_data_sync_calendar_event.h"

namespace {

constexpr int kForeignVersion = 1 << 30;

// A database with so many mapped events, each of which the adapter has written once.
void fill(sqlite3* db, int mapped) {
    const std::string numbers =
        "WITH RECURSIVE n(i) AS (SELECT 1 UNION ALL SELECT i + 1 FROM n WHERE i < " +
        std::to_string(mapped) + ") ";
    const std::string sql =
        "BEGIN; DELETE FROM qor_event_data_table; DELETE FROM qor_event_table;" + numbers +
        "INSERT INTO qor_event_data_table SELECT i, i, 0, NULL, 0, 0, NULL, 1, NULL FROM n;" +
        numbers +
        "INSERT INTO qor_event_table SELECT i, i FROM n;"
        "UPDATE sqlite_sequence SET seq = " +
        std::to_string(mapped) + "; COMMIT";
    require(sqlite3_exec(db, sql.c_str(), nullptr, nullptr, nullptr) == SQLITE_OK, "filling");
}

// Items all over the table.
std::vector<Item> spread_items(int mapped, int count) {
    std::vector<Item> items;
    items.reserve(static_cast<size_t>(count));
    for (int i = 0; i < count; ++i) {
        const int number = 1 + i * (mapped / count);
        items.push_back({number, std::to_string(number)});
    }
    return items;
}

void prepare_changes(const Operation& operation, const std::vector<Item>& items) {
    std::vector<NullChange> changes;
    changes.reserve(items.size());
    for (const Item& item : items) {
        changes.push_back({item.number, operation.change_status, kNullBook, kForeignVersion});
    }
    null_service_set_changes(std::move(changes));
    null_service_notify();  // leaves the adapter's list pending
    int version = 0;
    require(calendar_db_get_changes_by_version(_calendar_event._uri, kNullBook, 0, &floor_changes,
                                               &version) == 0,
            "fetching the changes");
}

Cost measure_calls(Step step, const std::vector<Item>& calls, int items, bool collect) {
    Cost cost;
    collect_statements(collect ? &cost.texts : nullptr);
    const long service_calls = null_service_calls();
    const Counts counts = counts_now();
    const Moment start = moment_now();
    for (const Item& item : calls) {
        step(item);
    }
    const Moment end = moment_now();
    const Counts counted = counts_now() - counts;
    collect_statements(nullptr);
    const double n = items;
    cost.cpu_us = (end.cpu_us - start.cpu_us) / n;
    cost.wall_us = (end.wall_us - start.wall_us) / n;
    cost.statements = static_cast<double>(counted.adapter_statements) / n;
    cost.syncs = static_cast<double>(counted.syncs) / n;
    cost.calls = static_cast<double>(null_service_calls() - service_calls) / n;
    return cost;
}

sqlite3* open_database(const std::string& file) {
    sqlite3* db = nullptr;
    require(sqlite3_open(file.c_str(), &db) == SQLITE_OK, "opening a database");
    return db;
}

}  // namespace

AdapterCosts::AdapterCosts(int items) : items_(items) {
    require(qor_adapter_data_sync_initialize(1, 0) == 0, "initialize");
    require(qor_adapter_data_sync_set_data_changed_cb([](void*) {}, nullptr) == 0, "subscribe");
    const std::string floor_file = device_.adapter_file() + ".floor";
    std::filesystem::copy_file(device_.adapter_file(), floor_file);
    adapter_floor = new AdapterFloor(floor_file);
    adapter_content_.reset(open_database(device_.adapter_file()));
    floor_content_.reset(open_database(floor_file));
}

AdapterCosts::~AdapterCosts() {
    delete adapter_floor;
    adapter_floor = nullptr;
    static_cast<void>(qor_adapter_data_sync_deinitialize(0));  // the program ends
}

void AdapterCosts::measure(const Operation& operation, int mapped, Costs* costs) const {
    const bool first = costs->rounds == 0;
    const bool adapter_goes_first = costs->rounds % 2 == 0;
    for (const bool adapter : {adapter_goes_first, !adapter_goes_first}) {
        const Cost cost = measure_side(operation, mapped, adapter, first);
        Cost& least = adapter ? costs->adapter : costs->floor;
        if (first) {
            least = cost;
        }
        least.cpu_us = std::min(least.cpu_us, cost.cpu_us);
        least.wall_us = std::min(least.wall_us, cost.wall_us);
    }
    ++costs->rounds;
}

Cost AdapterCosts::measure_side(const Operation& operation, int mapped, bool adapter,
                                bool collect) const {
    fill(adapter ? adapter_content_.get() : floor_content_.get(), mapped);
    null_service_reset(mapped);
    std::vector<Item> calls = spread_items(mapped, items_);
    if (operation.is_query) {
        prepare_changes(operation, calls);
        calls = {{items_, ""}};
    }
    return measure_calls(adapter ? operation.adapter : operation.floor, calls, items_, collect);
}
