// SPDX-License-Identifier: Apache-2.0
//
// The adapter's operations as the benchmarks call them, each beside its floor.
#pragma once

#include <string>
#include <vector>

#include "bench/adapter_floor.h"

// An item of the host, named both ways. An id query is called with the number of its changes.
struct Item {
    int number;
    std::string id;
};
using Step = void (*)(const Item& item);

struct Operation {
    const char* name;
    Step adapter;
    Step floor;
    bool is_query;      // one call for all changes of a list
    int change_status;  // of those changes
};

const std::vector<Operation>& adapter_operations();

// The floor that the operations call, and the changes that its id queries take.
extern AdapterFloor* adapter_floor;
extern calendar_list_h floor_changes;

// Whether an item comes out of the floor as it comes out of the adapter. Inserts one into each.
bool floor_gives_the_same();
