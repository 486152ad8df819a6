// SPDX-License-Identifier: Apache-2.0
//
// The adapter's entry points beside their floor, over a calendar service that does nothing, at
// growing numbers of mapped events. Prints times, which are noisy, and counts, which are not; exits
// with 1 when a bound is missed. With --check it compares the counts alone, on few items.
#include <algorithm>
#include <cstdio>
#include <cstring>
#include <string>
#include <vector>

#include "bench/adapter_costs.h"
#include "bench/counters.h"
#include "bench/table.h"

namespace {

constexpr double kMostOfFloor = 1.15;  // CPU

struct Setting {
    std::vector<int> sizes;  // mapped events
    int items;
    int rounds;
    int more_rounds;  // where the bound on CPU seems to be missed
};
const Setting kFull = {{100, 1000, 10000}, 50, 40, 200};
const Setting kCheck = {{40}, 10, 1, 0};

struct Result {
    const Operation* operation;
    int mapped;
    Costs costs;
};

double ratio(const Result& result) {
    return result.costs.adapter.cpu_us / result.costs.floor.cpu_us;
}

void print_results(const std::vector<Result>& results) {
    std::vector<TableRow> rows = {{"operation", "mapped", "items/s", "CPU us/item", "floor",
                                   "ratio", "SQL/item", "floor", "syncs/item", "floor",
                                   "device calls/item", "floor"}};
    for (const Result& result : results) {
        const auto& [rounds, adapter, floor] = result.costs;
        rows.push_back({result.operation->name, std::to_string(result.mapped),
                        decimal(1e6 / adapter.wall_us, 0), decimal(adapter.cpu_us, 1),
                        decimal(floor.cpu_us, 1), decimal(ratio(result), 3),
                        decimal(adapter.statements, 2), decimal(floor.statements, 2),
                        decimal(adapter.syncs, 2), decimal(floor.syncs, 2),
                        decimal(adapter.calls, 2), decimal(floor.calls, 2)});
    }
    print_table("The adapter and its floor, over a calendar service that does nothing", rows);
}

void print_growth(const std::vector<Result>& results, const std::vector<int>& sizes) {
    TableRow heading = {"operation"};
    for (const int size : sizes) {
        heading.push_back(std::to_string(size));
    }
    heading.insert(heading.end(), {"growth", "of the floor"});
    std::vector<TableRow> rows = {heading};
    for (const Operation& operation : adapter_operations()) {
        TableRow row = {operation.name};
        Costs smallest;
        Costs largest;
        for (const Result& result : results) {
            if (result.operation == &operation) {
                smallest = row.size() == 1 ? result.costs : smallest;
                largest = result.costs;
                row.push_back(decimal(result.costs.adapter.cpu_us, 1));
            }
        }
        row.push_back(decimal(largest.adapter.cpu_us / smallest.adapter.cpu_us, 1) + "x");
        row.push_back(decimal(largest.floor.cpu_us / smallest.floor.cpu_us, 1) + "x");
        rows.push_back(row);
    }
    print_table("How CPU per item (us) grows with the number of mapped events", rows);
}

bool report(const Result& result, bool held, const char* missed) {
    if (!held) {
        std::fprintf(stderr, "adapter_bench: error: %s, %d mapped: %s\n", result.operation->name,
                     result.mapped, missed);
    }
    return held;
}

bool holds_counts(const Result& result) {
    const auto& [rounds, adapter, floor] = result.costs;
    const bool texts = report(result, adapter.texts == floor.texts, "other SQL than the floor");
    for (size_t i = 0; !texts && i < std::max(adapter.texts.size(), floor.texts.size()); ++i) {
        const auto line = [i](const Cost& cost) {
            return i < cost.texts.size() ? cost.texts[i].c_str() : "(none)";
        };
        if (std::strcmp(line(adapter), line(floor)) != 0) {
            std::fprintf(stderr, "  adapter: %s\n  floor:   %s\n", line(adapter), line(floor));
            break;
        }
    }
    const bool any = report(result, !floor.texts.empty(), "no statement was seen");
    const bool syncs = report(result, adapter.syncs <= floor.syncs, "more disk syncs");
    const bool calls = report(result, adapter.calls <= floor.calls, "more calls of the device");
    return texts && any && syncs && calls;
}

// Rounds of all operations in turns, so that no disturbance meets one of them alone. What seems to
// miss its bound gets more: the least times of either side only come nearer to the truth.
std::vector<Result> measure_all(const Setting& setting, const AdapterCosts& costs) {
    std::vector<Result> results;
    for (const int mapped : setting.sizes) {
        for (const Operation& operation : adapter_operations()) {
            results.push_back({&operation, mapped, {}});
        }
    }
    for (int round = 0; round < setting.rounds + setting.more_rounds; ++round) {
        for (Result& result : results) {
            if (round < setting.rounds || ratio(result) > kMostOfFloor) {
                costs.measure(*result.operation, result.mapped, &result.costs);
            }
        }
    }
    return results;
}

}  // namespace

int main(int argc, char** argv) {
    const bool check = argc == 2 && std::strcmp(argv[1], "--check") == 0;
    if (argc > 1 && !check) {
        std::fprintf(stderr, "usage: adapter_bench [--check]\n");
        return 2;
    }
    start_counting();
    const Setting& setting = check ? kCheck : kFull;
    const AdapterCosts costs(setting.items);
    bool held = floor_gives_the_same();
    if (!held) {
        std::fprintf(stderr, "adapter_bench: error: the floor gives another result\n");
    }
    const std::vector<Result> results = measure_all(setting, costs);
    print_results(results);
    if (!check) {
        print_growth(results, setting.sizes);
    }
    for (const Result& result : results) {
        const bool in_time = check || report(result, ratio(result) <= kMostOfFloor,
                                             "more CPU than 1.15 of the floor");
        held = holds_counts(result) && in_time && held;
    }
    return held ? 0 : 1;
}
