// SPDX-License-Identifier: Apache-2.0
//
// What commands say: results on stdout, as lines for people or as JSON; messages and progress on
// stderr.
#pragma once

#include <cstdint>
#include <nlohmann/json_fwd.hpp>
#include <string>

#include "host/sync/report.h"

namespace qor {

// "2026-01-05 14:00:00" in local time; "never" for 0.
std::string time_text(std::int64_t time_ms);

void print_json(const nlohmann::ordered_json& value);
void print_report(const SyncReport& report, std::int64_t duration_ms);
nlohmann::ordered_json report_json(const SyncReport& report, std::int64_t duration_ms);
nlohmann::ordered_json entry_json(const ReportEntry& entry);

// One line on a terminal that is rewritten as work goes on; nothing elsewhere.
void show_progress(const char* step, std::size_t done, std::size_t total);

}  // namespace qor
