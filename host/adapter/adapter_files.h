// SPDX-License-Identifier: Apache-2.0
//
// A look into the adapter's own database, read only: what its entry points do not tell. An adapter
// that keeps no such file is synced all the same.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

namespace qor {

struct PendingRow {
    int id = 0;
    std::string parent_key;  // the cloud key that it waits for; empty for a failed write
};

// The highest item number ever given out.
std::optional<std::int64_t> highest_adapter_id();

// Whether the adapter has a row for an item; true where that cannot be told.
bool has_row(int id);

// The change version up to which the adapter has handed out changes.
std::optional<std::int64_t> adapter_baseline();

// Items that the adapter has not applied to the calendar.
std::vector<PendingRow> pending_rows();

}  // namespace qor
