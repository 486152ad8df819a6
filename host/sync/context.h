// SPDX-License-Identifier: Apache-2.0
//
// What the steps of one sync share.
#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <set>
#include <string>

#include "host/adapter/adapter_session.h"
#include "host/cloud/cloud_store.h"
#include "host/database/conflicts.h"
#include "host/database/host_database.h"
#include "host/database/items.h"
#include "host/database/journal.h"
#include "host/sync/report.h"

namespace qor {

// Who wins when an item was changed on both sides since the last sync.
enum class Policy { kCloud, kDevice, kNewest, kKeepBoth, kAsk };

enum class Winner { kCloud, kDevice, kBoth, kUndecided };

struct SyncOptions {
    Policy policy = Policy::kCloud;
    bool dry_run = false;
    bool allow_mass_delete = false;
    // Asked under Policy::kAsk; without it such conflicts stay undecided.
    std::function<Winner(const Conflict&)> ask;
    // Told how far a long step has come; may be empty.
    std::function<void(const char* step, std::size_t done, std::size_t total)> progress;
};

struct SyncContext {
    AdapterSession& device;
    CloudStore& cloud;
    HostDatabase& database;
    const SyncOptions& options;
    SyncReport& report;
    Items items{database.connection()};
    Journal journal{database.connection()};
    Conflicts conflicts{database.connection()};
    std::set<std::string> failed{};  // keys put aside in this run

    void progress(const char* step, std::size_t done, std::size_t total) const {
        if (options.progress) {
            options.progress(step, done, total);
        }
    }
    void remember_id(int id) {
        if (id > database.number(setting::kHighestId)) {
            database.set(setting::kHighestId, id);
        }
    }
};

inline std::int64_t now_ms() {
    return std::chrono::duration_cast<std::chrono::milliseconds>(
               std::chrono::system_clock::now().time_since_epoch())
        .count();
}

}  // namespace qor
