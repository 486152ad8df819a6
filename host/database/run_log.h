// SPDX-License-Identifier: Apache-2.0
//
// The journal of runs: when, why, with what result, and what was done to which item.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "host/database/connection.h"
#include "host/sync/report.h"

namespace qor {

struct Run {
    std::int64_t id = 0;
    std::int64_t start_ms = 0;
    std::int64_t duration_ms = 0;
    std::string trigger;  // the command
    std::string result;   // "done", "partly", or the message that ended it
    std::vector<ReportEntry> entries;
};

class RunLog {
  public:
    explicit RunLog(Connection& connection) : connection_(connection) {}

    // Adds a run and lets go of the oldest ones.
    void add(const Run& run, bool hide_titles);
    std::vector<Run> latest(std::size_t count);  // oldest first

  private:
    Connection& connection_;
};

}  // namespace qor
