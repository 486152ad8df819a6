// SPDX-License-Identifier: Apache-2.0
//
// What a sync has to do: both sides' changes, brought together by cloud key and decided.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "host/sync/context.h"

namespace qor {

enum class Side { kSame, kChanged, kGone };

// One key and what happened to it on both sides since they last agreed.
struct KeyChange {
    std::string key;
    std::optional<Item> item;
    Side device = Side::kSame;
    int device_id = 0;  // under which the device has it now
    std::optional<SyncedDocument> device_document;
    std::string device_text;
    std::int64_t noticed_ms = 0;
    std::vector<int> noted;  // numbers in the journal that this settles
    Side cloud = Side::kSame;
    CloudDocument cloud_document;
    std::optional<SyncedDocument> cloud_event;
    bool retried = false;
    bool interrupted = false;

    std::string label() const;
};

struct Upload {
    KeyChange change;
    bool deleted = false;
    std::string text;
    std::optional<std::int64_t> expected;
};

struct Delivery {
    Action action = Action::kInsert;
    KeyChange change;
    SyncedDocument document;  // but for a removal
    std::string text;         // the document as in the cloud
    std::int64_t revision = 0;
    std::string
        expected_device;  // what the device holds if nobody touched it; empty: not looked at
    bool again = false;   // nothing in the cloud's feed would bring it about once more
    int rank = 0;         // order of delivery
};

struct Plan {
    std::vector<Upload> uploads;
    std::vector<Delivery> deliveries;
    std::vector<KeyChange> adopted;    // both sides say the same
    std::vector<KeyChange> forgotten;  // gone on both sides
    std::vector<Conflict> lost;        // documents to keep before they are overwritten
    std::int64_t cloud_revision = 0;   // the feed was read up to here
    bool empty() const {
        return uploads.empty() && deliveries.empty() && adopted.empty() && forgotten.empty();
    }
};

// Reads both sides. Items that cannot be read are put aside in the journal and told in the report.
Plan make_plan(SyncContext& context);

}  // namespace qor
