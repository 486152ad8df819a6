// SPDX-License-Identifier: Apache-2.0
//
// Finishes what an interrupted run left.
#include "host/sync/recover.h"

#include <fmt/format.h>

#include <algorithm>
#include <map>
#include <set>
#include <utility>
#include <vector>

#include "host/adapter/adapter_files.h"
#include "host/sync/collect.h"
#include "host/sync/versions.h"

namespace qor {

namespace {

// The highest number that an interrupted batch has given out; what is listed later has higher ones.
constexpr const char* kLastMade = "last made";

struct Unfinished {
    Intent intent;
    std::optional<SyncedDocument> document;
    bool adopted = false;

    bool makes_item() const {
        return document && (intent.action == Action::kInsert || intent.action == Action::kReplace);
    }
};

struct Found {
    int id = 0;
    SyncedDocument document;
    std::string text;
    const Unfinished* adopted = nullptr;  // whose it is
};

// Items that the batch may have made, as far as nobody knows them yet.
std::vector<Found> find_made(SyncContext& context, int base_id, std::size_t most) {
    std::set<int> ids;
    for (std::size_t i = 1; i <= most; ++i) {
        ids.insert(base_id + static_cast<int>(i));
    }
    for (const DeviceChange& change : context.journal.changes()) {
        if (!change.gone && change.id > base_id) {
            ids.insert(change.id);
        }
    }
    std::vector<Found> found;
    for (const int id : ids) {
        if (context.items.by_id(id) || context.items.is_alias(id)) {
            continue;
        }
        const ItemValue value = context.device.get(id);
        if (value.state == ItemValue::State::kUnapplied) {
            context.device.remove(id);  // it holds nothing but a copy of what is delivered again
        } else if (auto document = SyncedDocument::parse(value.document)) {
            found.push_back({id, std::move(*document), value.document});
        }
    }
    return found;
}

void adopt(SyncContext& context, Unfinished& unfinished, Found& found) {
    Item item = context.items.by_key(unfinished.intent.key).value_or(Item{});
    if (item.id > 0 && item.id != found.id) {
        context.device.remove(item.id);  // what was to be replaced
    }
    item.key = unfinished.intent.key;
    item.id = found.id;
    item.kind = unfinished.document->kind();
    item.parent_key = unfinished.document->parent_key();
    item.label = unfinished.document->label();
    item.document = unfinished.intent.document;
    // What was edited since then differs from what was written, not from what is there now.
    item.device_document = documents_agree(*unfinished.document, found.document)
                               ? found.text
                               : unfinished.intent.document;
    item.revision = unfinished.intent.revision;
    item.pending = false;
    context.items.store(item);
    unfinished.adopted = true;
    found.adopted = &unfinished;
}

// A cancellation is what it says; an event may have been edited since it was written.
bool may_have_been_edited(const SyncedDocument& written, const SyncedDocument& found) {
    return written.kind() != ItemKind::kCancelled && found.kind() != ItemKind::kCancelled;
}

// Whether the items were made in the order of the intents, as far as they can be told by what they
// say; an insert that failed leaves no number behind.
bool in_order(const std::map<int, Unfinished*>& by_order, const std::vector<Found>& made,
              int last_made) {
    return std::ranges::all_of(made, [&](const Found& found) {
        const auto candidate = by_order.find(found.id);
        return found.id > last_made || found.adopted == nullptr ||
               (candidate != by_order.end() && candidate->second == found.adopted);
    });
}

// First by what they say. What was made and then edited is found by the order in which numbers are
// given out: it has no match, and a number that the batch gave out.
void match(SyncContext& context, std::vector<Unfinished>& unfinished, std::vector<Found>& made,
           int base_id) {
    std::map<int, Unfinished*> by_order;
    int next_id = base_id;
    for (Unfinished& candidate : unfinished) {
        if (candidate.makes_item()) {
            by_order[++next_id] = &candidate;
        }
    }
    for (Found& found : made) {
        for (Unfinished& candidate : unfinished) {
            if (!candidate.adopted && candidate.makes_item() &&
                documents_agree(*candidate.document, found.document)) {
                adopt(context, candidate, found);
                break;
            }
        }
    }
    const int last_made = static_cast<int>(context.database.number(kLastMade));
    if (!in_order(by_order, made, last_made)) {
        return;
    }
    for (Found& found : made) {
        const auto candidate = by_order.find(found.id);
        if (found.adopted == nullptr && found.id <= last_made && candidate != by_order.end() &&
            !candidate->second->adopted &&
            may_have_been_edited(*candidate->second->document, found.document)) {
            adopt(context, *candidate->second, found);
        }
    }
}

}  // namespace

void check_device_identity(SyncContext& context) {
    const std::optional<std::int64_t> given = highest_adapter_id();
    if (!given || *given >= context.database.number(setting::kHighestId)) {
        return;
    }
    WriteBatch batch(context.database.connection());
    context.database.connection().script("DELETE FROM device_change; DELETE FROM alias");
    context.database.set(setting::kHighestId, *given);
    context.items.each([&](const Item& item) { mark_absent(context, item); });
    batch.commit();
    context.device.forget_everything();
    context.report.add(What::kNote, "the adapter's records", "",
                       "they were lost; the calendar is matched with the cloud again");
}

void uncover_unfinished(SyncContext& context) {
    if (context.journal.intents().empty()) {
        return;
    }
    if (context.database.number(kLastMade) == 0) {
        WriteBatch batch(context.database.connection());
        context.database.set(kLastMade, highest_adapter_id().value_or(0));
        batch.commit();
    }
    collect_device_changes(context, calendar_version());
    context.device.forget_everything();
}

void check_calendar(SyncContext& context) {
    const std::optional<Item> probe = context.items.first_on_device();
    if (!probe || context.device.get(probe->id).state != ItemValue::State::kGone) {
        return;
    }
    std::set<int> deleted;
    for (const DeviceChange& change : context.journal.changes()) {
        if (change.gone) {
            deleted.insert(change.id);
        }
    }
    std::vector<Item> lost;
    context.items.each([&](const Item& item) {
        if (item.id > 0 && !item.pending && !deleted.contains(item.id) &&
            context.device.get(item.id).state == ItemValue::State::kGone) {
            lost.push_back(item);
        }
    });
    WriteBatch batch(context.database.connection());
    for (const Item& item : lost) {
        mark_absent(context, item);
    }
    batch.commit();
    context.report.add(What::kNote, fmt::format("{} items", lost.size()), "",
                       "the device lost them without deleting them; they are delivered again");
}

void note_applied(SyncContext& context) {
    std::vector<Item> applied;
    for (Item& item : context.items.pending()) {
        ItemValue value = context.device.get(item.id);
        if (value.state == ItemValue::State::kRead) {
            item.pending = false;
            item.device_document = std::move(value.document);
            applied.push_back(std::move(item));
        }
    }
    if (applied.empty()) {
        return;
    }
    WriteBatch batch(context.database.connection());
    for (const Item& item : applied) {
        context.items.store(item);
    }
    batch.commit();
}

void recover(SyncContext& context) {
    std::vector<Unfinished> unfinished;
    for (Intent& intent : context.journal.intents()) {
        auto document = SyncedDocument::parse(intent.document);
        unfinished.push_back({std::move(intent), std::move(document)});
    }
    if (unfinished.empty()) {
        return;
    }
    const int base_id = unfinished.front().intent.base_id;
    std::vector<Found> made = find_made(context, base_id, unfinished.size());
    WriteBatch batch(context.database.connection());
    match(context, unfinished, made, base_id);
    for (const Found& found : made) {
        context.remember_id(found.id);
    }
    for (const Unfinished& each : unfinished) {
        const std::string label = each.document ? each.document->label() : "";
        if (!each.adopted) {
            context.journal.retry({each.intent.key, "", label, now_ms(), true});
        } else {
            context.journal.drop_retry(each.intent.key);
        }
    }
    context.journal.drop_intents();
    context.database.set(kLastMade, std::int64_t{0});
    batch.commit();
}

}  // namespace qor
