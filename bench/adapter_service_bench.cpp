// SPDX-License-Identifier: Apache-2.0
//
// The adapter over the development platform's calendar service, on a real disk: what a host can
// expect of single items, and how often the change handler runs while the host writes. Prints
// figures and exits with 1 when a burst is told in more than a handful of notifications.
#include <dlfcn.h>
#include <glib.h>

#include <cstdio>
#include <cstdlib>
#include <string>
#include <vector>

#include "bench/bench_device.h"
#include "bench/counters.h"
#include "bench/document_floor.h"
#include "bench/table.h"
#include "data-sync/qor_adapter_data_sync_calendar_event.h"

namespace {

constexpr int kAccount = 1;
constexpr int kBurst = 1000;
constexpr int kItems = 100;  // of each other operation
constexpr gint64 kQuietUs = 2000000;
constexpr double kMostRunsPerSecond = 1.5;  // of a burst

calendar_db_changed_cb adapter_handler = nullptr;
int handler_runs = 0;
int host_calls = 0;

void count_handler_run(const char* view_uri, void* user_data) {
    ++handler_runs;
    adapter_handler(view_uri, user_data);
}

}  // namespace

// The adapter's subscription comes through here, since the program's symbols go before those of the
// platform.
extern "C" int calendar_db_add_changed_cb(const char* view_uri, calendar_db_changed_cb callback,
                                          void* user_data) {
    auto* const subscribe = reinterpret_cast<decltype(&calendar_db_add_changed_cb)>(
        dlsym(RTLD_NEXT, "calendar_db_add_changed_cb"));
    adapter_handler = callback;
    return subscribe(view_uri, count_handler_run, user_data);
}

namespace {

// ---- The main loop ------------------------------------------------------------------------------

void run_what_is_due() {
    while (g_main_context_iteration(nullptr, FALSE) != FALSE) {
    }
}

// Runs the main loop until nothing has been told for a while.
void run_until_quiet() {
    int runs = handler_runs;
    gint64 end = g_get_monotonic_time() + kQuietUs;
    while (g_get_monotonic_time() < end) {
        run_what_is_due();
        if (runs != handler_runs) {
            runs = handler_runs;
            end = g_get_monotonic_time() + kQuietUs;
        }
        g_usleep(1000);
    }
}

// ---- Operations ---------------------------------------------------------------------------------

std::vector<std::string> item_ids;

void insert_item() {
    char* id = nullptr;
    require(qor_adapter_data_sync_insert_value(nullptr, kFloorDocument, &id) == 0, "insert");
    item_ids.emplace_back(MallocText(id).get());
}

void get_item(size_t i) {
    char* document = nullptr;
    require(qor_adapter_data_sync_get_value(item_ids[i].c_str(), nullptr, &document) == 0, "get");
    std::free(document);
}

void update_item(size_t i) {
    require(qor_adapter_data_sync_update_value(nullptr, item_ids[i].c_str(), kFloorDocument) == 0,
            "update");
}

void delete_item(size_t i) {
    require(qor_adapter_data_sync_delete_value(item_ids[i].c_str()) == 0, "delete");
}

template <int (*Query)(char***, int*) noexcept>
void query_ids() {
    char** ids = nullptr;
    int count = 0;
    require(Query(&ids, &count) == 0 && count == kItems, "an id query");
    for (int i = 0; i < count; ++i) {
        std::free(ids[i]);
    }
    std::free(ids);
}

// The device's user, working on the first events of the book.
template <typename Change>
void change_on_device(Change change) {
    for (int event_id = 1; event_id <= kItems; ++event_id) {
        change(event_id);
    }
    const int told = host_calls;
    run_until_quiet();
    require(host_calls > told, "telling the host of the changes");
}

void edit_event(int event_id) {
    calendar_record_h event = nullptr;
    require(calendar_db_get_record(_calendar_event._uri, event_id, &event) == 0, "reading");
    require(calendar_record_set_str(event, _calendar_event.summary, "Moved") == 0, "editing");
    require(calendar_db_update_record(event) == 0, "updating");
    calendar_record_destroy(event, true);
}

void remove_event(int event_id) {
    require(calendar_db_delete_record(_calendar_event._uri, event_id) == 0, "deleting");
}

// ---- Measuring ----------------------------------------------------------------------------------

struct Measured {
    std::string name;
    int items;
    Moment start;
    Moment end;
    Counts counts;
};

template <typename Work>
Measured measure(const char* name, int items, Work work) {
    Measured measured{name, items, moment_now(), {}, counts_now()};
    work();
    measured.end = moment_now();
    measured.counts = counts_now() - measured.counts;
    return measured;
}

template <typename Step>
Measured measure_each(const char* name, Step step) {
    return measure(name, kItems, [step] {
        for (size_t i = 0; i < kItems; ++i) {
            step(kItems + i);
        }
    });
}

void print_measured(const std::vector<Measured>& all) {
    std::vector<TableRow> rows = {{"operation", "items/s", "CPU us/item", "adapter SQL/item",
                                   "service SQL/item", "syncs/item"}};
    for (const Measured& measured : all) {
        const double n = measured.items;
        rows.push_back({measured.name,
                        decimal(n * 1e6 / (measured.end.wall_us - measured.start.wall_us), 0),
                        decimal((measured.end.cpu_us - measured.start.cpu_us) / n, 1),
                        decimal(static_cast<double>(measured.counts.adapter_statements) / n, 2),
                        decimal(static_cast<double>(measured.counts.other_statements) / n, 2),
                        decimal(static_cast<double>(measured.counts.syncs) / n, 2)});
    }
    print_table("The adapter over the development platform, 1,000 mapped events", rows);
}

// ---- Bursts -------------------------------------------------------------------------------------

struct Burst {
    std::string name;
    Measured inserts;
    int runs_meanwhile;
    int runs_after;
    int host_calls;
};

// The host inserts; its main loop runs after each insert, or not before the last.
Burst burst_of_own_writes(const char* name, bool runs_main_loop) {
    const int runs = handler_runs;
    const int told = host_calls;
    const Measured inserts = measure("insert", kBurst, [runs_main_loop] {
        for (int i = 0; i < kBurst; ++i) {
            insert_item();
            if (runs_main_loop) {
                run_what_is_due();
            }
        }
    });
    const int meanwhile = handler_runs - runs;
    run_until_quiet();
    return {name, inserts, meanwhile, handler_runs - runs - meanwhile, host_calls - told};
}

bool print_bursts(const std::vector<Burst>& bursts) {
    std::vector<TableRow> rows = {
        {"main loop runs", "seconds", "handler runs meanwhile", "afterwards", "host told"}};
    bool held = true;
    for (const Burst& burst : bursts) {
        const double seconds = (burst.inserts.end.wall_us - burst.inserts.start.wall_us) / 1e6;
        rows.push_back({burst.name, decimal(seconds, 1), std::to_string(burst.runs_meanwhile),
                        std::to_string(burst.runs_after), std::to_string(burst.host_calls)});
        held = held && burst.host_calls == 0 && burst.runs_after <= 2 &&
               burst.runs_meanwhile <= 1 + kMostRunsPerSecond * seconds;
    }
    print_table("Bursts of 1,000 own inserts: how often the change handler runs", rows);
    if (!held) {
        std::fprintf(stderr, "adapter_service_bench: error: own writes are told too often\n");
    }
    return held;
}

}  // namespace

int main() {
    start_counting();
    const BenchDevice device;
    require(qor_adapter_data_sync_initialize(kAccount, 0) == 0, "initialize");
    require(qor_adapter_data_sync_set_data_changed_cb([](void*) { ++host_calls; }, nullptr) == 0,
            "subscribe");
    run_until_quiet();

    std::vector<Burst> bursts = {burst_of_own_writes("after the last insert", false)};
    std::vector<Measured> all = {bursts[0].inserts};
    all.push_back(measure_each("get", get_item));
    all.push_back(measure_each("update", update_item));
    run_until_quiet();
    change_on_device(edit_event);
    all.push_back(measure("dirty ids", kItems, query_ids<qor_adapter_data_sync_get_dirty_ids_p>));
    require(qor_adapter_data_sync_clear_deleted_ids() == 0, "clear");
    change_on_device(remove_event);
    all.push_back(
        measure("deleted ids", kItems, query_ids<qor_adapter_data_sync_get_deleted_ids_p>));
    require(qor_adapter_data_sync_clear_deleted_ids() == 0, "clear");
    all.push_back(measure_each("delete", delete_item));
    run_until_quiet();
    bursts.push_back(burst_of_own_writes("after each insert", true));

    print_measured(all);
    const bool held = print_bursts(bursts);
    require(qor_adapter_data_sync_deinitialize(0) == 0, "deinitialize");
    return held ? 0 : 1;
}
