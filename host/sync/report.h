// SPDX-License-Identifier: Apache-2.0
//
// What a sync did, or would do: one entry per item, in words.
#pragma once

#include <cstddef>
#include <string>
#include <string_view>
#include <vector>

namespace qor {

enum class What {
    kUploadNew,
    kUploadChange,
    kUploadDeletion,
    kDeviceNew,
    kDeviceChange,
    kDeviceDeletion,
    kPending,   // handed to the adapter, which waits for the parent
    kConflict,  // decided; the reason says how
    kProblem,   // put aside; the reason says why
    kNote,      // worth knowing
};

std::string_view what_text(What what);
What what_from_text(std::string_view text);

struct ReportEntry {
    What what = What::kNote;
    std::string label;
    std::string key;
    std::string reason;
};

struct SyncReport {
    std::vector<ReportEntry> entries;
    bool dry_run = false;
    bool stopped = false;  // a guard stopped it; the reason is the last entry's

    // The same thing about the same item is told once.
    void add(What what, std::string label, std::string key, std::string reason = {});
    std::size_t count(What what) const;
    bool partly() const { return count(What::kProblem) > 0; }
};

}  // namespace qor
