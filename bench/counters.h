// SPDX-License-Identifier: Apache-2.0
//
// Counts that do not depend on the machine: disk syncs and SQL statements of this process.
#pragma once

#include <string>
#include <vector>

struct Counts {
    long syncs = 0;               // fsync and fdatasync calls, of directories too
    long adapter_statements = 0;  // run on the adapter's and the host's database
    long other_statements = 0;    // run on any other, the calendar service's
};

// Counts the statements of every connection opened from now on.
void start_counting();

Counts counts_now();
Counts operator-(const Counts& later, const Counts& earlier);

// Collects the texts of the adapter's statements, every number as "#"; null ends it.
void collect_statements(std::vector<std::string>* texts);
