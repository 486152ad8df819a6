// SPDX-License-Identifier: Apache-2.0
//
// Moves what the device reports into the host's journal.
#include "host/sync/collect.h"

#include <algorithm>
#include <set>
#include <vector>

#include "host/adapter/adapter_files.h"
#include "host/failure.h"

namespace qor {

namespace {

constexpr const char* kListingDeleted = "listing deleted";

// A changed series that is listed for the first time hides its occurrences until the next time.
std::vector<int> list_dirty(AdapterSession& device) {
    std::vector<int> ids = device.dirty_ids();
    for (;;) {
        std::vector<int> again = device.dirty_ids();
        if (again == ids) {
            return ids;
        }
        ids = std::move(again);
    }
}

// The items that should be on the device and are not.
std::vector<Item> missing_items(SyncContext& context) {
    std::vector<Item> missing;
    context.items.each([&](const Item& item) {
        if (item.id > 0 && !item.pending &&
            context.device.get(item.id).state == ItemValue::State::kGone) {
            missing.push_back(item);
        }
    });
    return missing;
}

class Collected {
  public:
    explicit Collected(SyncContext& context)
        : context_(context),
          killed_while_listing_(context.database.number(kListingDeleted) != 0),
          after_cascade_(context.database.number(setting::kCascadeCheck) != 0) {}

    bool expects_more() const { return killed_while_listing_ || after_cascade_; }

    void list() {
        dirty_ = list_dirty(context_.device);
        if (!killed_while_listing_) {
            context_.database.set(kListingDeleted, 1);
        }
        for (const int id : context_.device.deleted_ids()) {
            if (id > 0) {
                deleted_.push_back(id);
            } else {
                unnamed_ = true;  // an item that was never told to anybody, or is told once more
            }
        }
        if (!deleted_.empty()) {
            // A changed occurrence that is deleted hides its own cancellation until it is
            // forgotten: both have the series and the date, by which the adapter knows an
            // occurrence.
            const std::vector<int> uncovered = list_dirty(context_.device);
            dirty_.insert(dirty_.end(), uncovered.begin(), uncovered.end());
        }
        if (unnamed_ && expects_more()) {
            missing_ = missing_items(context_);
        }
    }

    void note() {
        WriteBatch batch(context_.database.connection());
        const std::int64_t now = now_ms();
        for (const int id : dirty_) {
            if (id > 0) {
                context_.journal.note_change(id, false, now);
                context_.remember_id(id);
            }
        }
        for (const int id : deleted_) {
            note_deleted(id, now);
        }
        for (const Item& item : missing_) {
            note_deleted(item.id, now);
        }
        context_.database.set(kListingDeleted, std::int64_t{0});
        context_.database.set(setting::kCascadeCheck, std::int64_t{0});
        batch.commit();
    }

  private:
    void note_deleted(int id, std::int64_t now) {
        const std::optional<Item> item = context_.items.by_id(id);
        if (after_cascade_ && item && item->kind == ItemKind::kOrdinary) {
            mark_absent(context_, *item);
            context_.journal.drop_change(id);
        } else {
            context_.journal.note_change(id, true, now);
        }
    }

    SyncContext& context_;
    const bool killed_while_listing_;
    const bool after_cascade_;
    bool unnamed_ = false;
    std::vector<int> dirty_;
    std::vector<int> deleted_;
    std::vector<Item> missing_;
};

// A notification may be on its way still while others have been told: whether the adapter has seen
// everything shows in its baseline.
bool settle(SyncContext& context, int calendar_version) {
    constexpr int kMostTries = 50;
    if (adapter_baseline() == calendar_version) {
        return false;
    }
    for (int i = 0; i < kMostTries; ++i) {
        if (context.device.settle()) {
            return true;
        }
        if (adapter_baseline().value_or(calendar_version) >= calendar_version) {
            return false;
        }
    }
    throw Failure("the adapter does not take notice of the calendar's changes");
}

}  // namespace

void mark_absent(SyncContext& context, Item item) {
    item.id = 0;
    item.pending = false;
    context.items.store(item);
    context.journal.retry({item.key, "", item.label, now_ms(), true});
}

void collect_device_changes(SyncContext& context, int calendar_version) {
    const bool changed = settle(context, calendar_version);
    Collected collected(context);
    if (changed) {
        collected.list();
    }
    if (changed || collected.expects_more()) {
        collected.note();
    }
    if (changed) {
        context.device.clear_deleted_ids();
    }
}

}  // namespace qor
