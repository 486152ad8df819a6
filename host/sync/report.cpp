// SPDX-License-Identifier: Apache-2.0
//
// What a sync did.
#include "host/sync/report.h"

#include <algorithm>
#include <utility>

namespace qor {

namespace {

struct Name {
    What what;
    std::string_view text;
};
constexpr Name kNames[] = {
    {What::kUploadNew, "to cloud: new"},
    {What::kUploadChange, "to cloud: changed"},
    {What::kUploadDeletion, "to cloud: deleted"},
    {What::kDeviceNew, "to device: new"},
    {What::kDeviceChange, "to device: changed"},
    {What::kDeviceDeletion, "to device: deleted"},
    {What::kPending, "waits for its series"},
    {What::kConflict, "conflict"},
    {What::kProblem, "put aside"},
    {What::kNote, "note"},
};

}  // namespace

std::string_view what_text(What what) {
    return std::find_if(std::begin(kNames), std::end(kNames),
                        [&](const Name& name) { return name.what == what; })
        ->text;
}

What what_from_text(std::string_view text) {
    const auto* found = std::find_if(std::begin(kNames), std::end(kNames),
                                     [&](const Name& name) { return name.text == text; });
    return found == std::end(kNames) ? What::kNote : found->what;
}

void SyncReport::add(What what, std::string label, std::string key, std::string reason) {
    const bool may_repeat = what == What::kProblem || what == What::kConflict;
    const auto same = [&](const ReportEntry& entry) {
        return entry.what == what && entry.key == key && entry.label == label;
    };
    if (may_repeat && std::any_of(entries.begin(), entries.end(), same)) {
        return;
    }
    entries.push_back({what, std::move(label), std::move(key), std::move(reason)});
}

std::size_t SyncReport::count(What what) const {
    return static_cast<std::size_t>(std::count_if(
        entries.begin(), entries.end(), [&](const ReportEntry& e) { return e.what == what; }));
}

}  // namespace qor
