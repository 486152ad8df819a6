// SPDX-License-Identifier: Apache-2.0
//
// Measures the adapter's operations and their floor, over the null service, on two databases of the
// same content, in turns, so that both meet the same machine.
#pragma once

#include <string>
#include <vector>

#include "bench/adapter_operations.h"
#include "bench/bench_device.h"

// Per item.
struct Cost {
    double cpu_us = 0;
    double wall_us = 0;
    double statements = 0;
    double syncs = 0;
    double calls = 0;                // of the device's services
    std::vector<std::string> texts;  // of the statements, numbers as "#"
};

// The least times of all rounds so far.
struct Costs {
    int rounds = 0;
    Cost adapter;
    Cost floor;
};

class AdapterCosts {
  public:
    // Items of one round.
    explicit AdapterCosts(int items);
    ~AdapterCosts();
    AdapterCosts(const AdapterCosts&) = delete;
    AdapterCosts& operator=(const AdapterCosts&) = delete;

    // One round at a number of mapped events, each of which the adapter has written once.
    void measure(const Operation& operation, int mapped, Costs* costs) const;

  private:
    Cost measure_side(const Operation& operation, int mapped, bool adapter, bool collect) const;

    int items_;
    BenchDevice device_;
    Owned<sqlite3, sqlite3_close> adapter_content_;
    Owned<sqlite3, sqlite3_close> floor_content_;
};
