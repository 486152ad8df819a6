// SPDX-License-Identifier: Apache-2.0
//
// .ics files into the cloud. A file imported twice changes nothing, and what people changed or
// deleted since on their devices stays as they left it: each document remembers a digest of what
// its file said, so that a file which says the same again is not news.
#pragma once

#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "host/cloud/cloud_store.h"
#include "host/ics/ics_file.h"
#include "host/ics/report.h"

namespace qor {

struct ImportOptions {
    std::string floating_zone =
        {};                  // of times without a zone; empty: X-WR-TIMEZONE, else local_zone()
    bool overwrite = false;  // the file wins over what is in the cloud
    bool dry_run = false;    // decide only
    // Told now and then how many of how many documents are done.
    std::function<void(std::size_t done, std::size_t total)> progress = {};
};

struct ImportSummary {
    std::size_t events = 0;  // ordinary events in the file
    std::size_t changed_occurrences = 0;
    std::size_t cancelled_occurrences = 0;
    // Documents:
    std::size_t added = 0;
    std::size_t changed = 0;
    std::size_t unchanged = 0;
    std::size_t kept = 0;  // the cloud's stayed, though the file has another; in report.problems
                           // unless the file has not changed since it was last imported
    IcsReport report;
};

// A document that a file asks for.
struct WantedDocument {
    std::string key;
    std::string text;
    std::string title;
    std::string where;
};

// What the file wants in the cloud, each event before its occurrences. `store` tells of events
// that the file only has occurrences of; none: there is no cloud yet.
Result<std::vector<WantedDocument>> documents_of(const IcsFile& file, const std::string& name,
                                                 const ImportOptions& options,
                                                 const CloudStore* store, ImportSummary& summary);

// Reads the file and brings the cloud up to it, some hundred documents per commit. `store` may be
// null in a dry run only.
Result<ImportSummary> import_ics(const std::string& path, CloudStore* store,
                                 const ImportOptions& options);

}  // namespace qor
