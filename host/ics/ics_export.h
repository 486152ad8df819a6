// SPDX-License-Identifier: Apache-2.0
//
// Everything in the cloud as one .ics text (RFC 5545). An event's UID is its key, so importing the
// text again meets the same documents and changes nothing.
#pragma once

#include <functional>
#include <string_view>

#include "host/cloud/cloud_store.h"
#include "host/ics/report.h"

namespace qor {

struct ExportSummary {
    std::size_t events = 0;
    std::size_t changed_occurrences = 0;
    std::size_t cancelled_occurrences = 0;
    IcsReport report;
};

// Hands the text out piece by piece. `write` returns false to stop; the result is then an error.
Result<ExportSummary> export_ics(const CloudStore& store,
                                 const std::function<bool(std::string_view)>& write);

}  // namespace qor
