// SPDX-License-Identifier: Apache-2.0
//
// Decides one key.
#include "host/sync/decide.h"

#include <utility>

#include "host/cloud/cloud_keys.h"
#include "host/failure.h"

namespace qor {

namespace {

// Removals of occurrences, then of events; then events before the occurrences that name them.
int rank_of(Action action, ItemKind kind) {
    if (action == Action::kRemove) {
        return kind == ItemKind::kOrdinary ? 1 : 0;
    }
    return 2 + static_cast<int>(kind);
}

std::string expected_device(const KeyChange& change) {
    if (change.device == Side::kChanged) {
        return change.device_text;
    }
    return change.item ? change.item->device_document : std::string();
}

void deliver(Plan& plan, KeyChange change) {
    SyncedDocument document = *change.cloud_event;
    std::string text = change.cloud_document.text;
    const std::int64_t revision = change.cloud_document.revision;
    plan.deliveries.push_back(
        delivery_of(std::move(change), std::move(document), std::move(text), revision));
}

void remove(Plan& plan, KeyChange change) {
    Delivery delivery;
    delivery.action = Action::kRemove;
    delivery.revision = change.cloud_document.revision;
    delivery.expected_device = expected_device(change);
    delivery.rank = rank_of(Action::kRemove, change.item->kind);
    delivery.change = std::move(change);
    plan.deliveries.push_back(std::move(delivery));
}

// What the cloud is to hold once the device's change is there.
std::string uploaded_text(const KeyChange& change) {
    if (change.item && change.device_document->kind() != ItemKind::kCancelled) {
        const auto cloud = SyncedDocument::parse(change.item->document);
        const auto before = SyncedDocument::parse(change.item->device_document);
        if (cloud && before) {
            return merge_changes(*cloud, *before, *change.device_document).text();
        }
    }
    return change.device_text;
}

void upload(Plan& plan, KeyChange change, std::optional<std::int64_t> expected) {
    std::string text = uploaded_text(change);
    plan.uploads.push_back({std::move(change), false, std::move(text), expected});
}

void upload_deletion(Plan& plan, KeyChange change, std::optional<std::int64_t> expected) {
    plan.uploads.push_back({std::move(change), true, {}, expected});
}

Winner winner_of(const SyncContext& context, const KeyChange& change, const Conflict& conflict) {
    switch (context.options.policy) {
        case Policy::kCloud:
            return Winner::kCloud;
        case Policy::kDevice:
            return Winner::kDevice;
        case Policy::kNewest:
            return change.noticed_ms > change.cloud_document.modified_ms ? Winner::kDevice
                                                                         : Winner::kCloud;
        case Policy::kKeepBoth:
            return Winner::kBoth;
        case Policy::kAsk:
            break;
    }
    return context.options.ask && !context.options.dry_run ? context.options.ask(conflict)
                                                           : Winner::kUndecided;
}

Conflict conflict_of(const KeyChange& change, bool device_lost) {
    const std::string device = change.device == Side::kGone ? "" : change.device_text;
    const std::string& cloud = change.cloud_document.text;
    Conflict conflict;
    conflict.time_ms = now_ms();
    conflict.key = change.key;
    conflict.label = change.label();
    conflict.lost = device_lost ? "device" : "cloud";
    conflict.document = device_lost ? device : cloud;
    conflict.kept = device_lost ? cloud : device;
    return conflict;
}

void keep_loser(Plan& plan, Conflict conflict) {
    if (!conflict.document.empty()) {  // a deletion that lost leaves nothing to keep
        plan.lost.push_back(std::move(conflict));
    }
}

void let_cloud_win(Plan& plan, KeyChange change) {
    keep_loser(plan, conflict_of(change, true));
    if (change.cloud == Side::kGone) {
        remove(plan, std::move(change));
    } else {
        deliver(plan, std::move(change));
    }
}

void let_device_win(Plan& plan, KeyChange change) {
    keep_loser(plan, conflict_of(change, false));
    const std::int64_t present = change.cloud_document.revision;
    if (change.device == Side::kGone) {
        upload_deletion(plan, std::move(change), present);
    } else {
        const std::int64_t expected = change.cloud == Side::kGone ? 0 : present;
        upload(plan, std::move(change), expected);
    }
}

// An edit is kept beside a deletion; two edits become two events.
void keep_both(Plan& plan, KeyChange change) {
    if (change.cloud == Side::kGone) {
        let_device_win(plan, std::move(change));
        return;
    }
    if (change.device == Side::kChanged) {
        KeyChange copy;
        copy.key = new_cloud_key();
        copy.device_document = change.device_document;
        copy.device_document->set("title", change.device_document->title() + " (this device)");
        copy.device_text = copy.device_document->text();
        plan.uploads.push_back({copy, false, copy.device_text, 0});
    }
    deliver(plan, std::move(change));
}

const char* outcome_text(Winner winner) {
    switch (winner) {
        case Winner::kCloud:
            return "changed on both sides; the cloud's version was kept";
        case Winner::kDevice:
            return "changed on both sides; this device's version was kept";
        case Winner::kBoth:
            return "changed on both sides; both versions were kept";
        case Winner::kUndecided:
            break;
    }
    return "changed on both sides; nothing was done. Decide with sync --policy cloud, device or "
           "keep-both";
}

void settle_conflict(SyncContext& context, KeyChange change, Plan& plan) {
    const Winner winner = winner_of(context, change, conflict_of(change, true));
    const What what = winner == Winner::kUndecided ? What::kProblem : What::kConflict;
    context.report.add(what, change.label(), change.key, outcome_text(winner));
    switch (winner) {
        case Winner::kCloud:
            let_cloud_win(plan, std::move(change));
            return;
        case Winner::kDevice:
            let_device_win(plan, std::move(change));
            return;
        case Winner::kBoth:
            keep_both(plan, std::move(change));
            return;
        case Winner::kUndecided:
            context.journal.retry({change.key, "conflict", change.label(), now_ms(), false});
            return;
    }
}

bool says_the_same(const KeyChange& change) {
    return change.cloud_event && documents_agree(*change.device_document, *change.cloud_event);
}

// The device's number for it is new, but not what it says (it was found on the device again).
bool only_the_number_changed(const KeyChange& change) {
    if (!change.item || change.item->id == change.device_id) {
        return false;
    }
    const auto agreed = SyncedDocument::parse(change.item->document);
    return agreed && documents_agree(*change.device_document, *agreed);
}

void decide_device_changed(SyncContext& context, KeyChange change, Plan& plan) {
    if (change.cloud == Side::kSame) {
        if (only_the_number_changed(change)) {
            plan.adopted.push_back(std::move(change));
            return;
        }
        const bool is_new = !change.item || change.item->document.empty();
        const std::int64_t expected = is_new ? 0 : change.item->revision;
        upload(plan, std::move(change), expected);
    } else if (!says_the_same(change)) {
        settle_conflict(context, std::move(change), plan);
    } else if (change.interrupted && change.item->id > 0 && change.cloud_event->recurring()) {
        deliver(plan, std::move(change));  // its cancelled occurrences may be half delivered
    } else {
        plan.adopted.push_back(std::move(change));
    }
}

void decide_device_gone(SyncContext& context, KeyChange change, Plan& plan) {
    const bool never_agreed = change.item->revision == 0;
    if (change.cloud == Side::kGone || (never_agreed && change.cloud == Side::kSame)) {
        plan.forgotten.push_back(std::move(change));
    } else if (never_agreed) {  // its upload was interrupted, and then it was deleted
        const std::int64_t expected = change.cloud_document.revision;
        upload_deletion(plan, std::move(change), expected);
    } else if (change.cloud == Side::kSame) {
        const std::int64_t expected = change.item->revision;
        upload_deletion(plan, std::move(change), expected);
    } else {
        settle_conflict(context, std::move(change), plan);
    }
}

// An occurrence whose series was deleted from the cloud, and is not here.
bool is_orphan(SyncContext& context, const KeyChange& change) {
    const std::string parent = change.cloud_event ? change.cloud_event->parent_key() : "";
    if (parent.empty() || context.items.by_key(parent)) {
        return false;
    }
    const auto document = need(context.cloud.get(parent));
    return document && document->deleted;
}

void decide_device_same(SyncContext& context, KeyChange change, Plan& plan) {
    if (change.cloud_document.deleted || is_orphan(context, change)) {
        if (change.item && change.item->id > 0) {
            remove(plan, std::move(change));
        } else {
            plan.forgotten.push_back(std::move(change));
        }
        return;
    }
    const bool cancelled_already = change.item && change.item->id > 0 && !change.item->pending &&
                                   change.item->kind == ItemKind::kCancelled &&
                                   change.cloud_event->kind() == ItemKind::kCancelled;
    if (cancelled_already && !change.interrupted) {
        plan.adopted.push_back(std::move(change));  // there is nothing else to a cancellation
    } else {
        deliver(plan, std::move(change));
    }
}

}  // namespace

Delivery delivery_of(KeyChange change, SyncedDocument document, std::string text,
                     std::int64_t revision) {
    Delivery delivery;
    const bool there = change.item && change.item->id > 0 && change.device != Side::kGone;
    if (!there) {
        delivery.action = Action::kInsert;
    } else if (change.item->pending || change.item->kind == ItemKind::kCancelled ||
               document.kind() == ItemKind::kCancelled) {
        delivery.action = Action::kReplace;
    } else {
        delivery.action = Action::kUpdate;
    }
    delivery.rank = rank_of(delivery.action, document.kind());
    delivery.expected_device = there ? expected_device(change) : std::string();
    delivery.change = std::move(change);
    delivery.document = std::move(document);
    delivery.text = std::move(text);
    delivery.revision = revision;
    return delivery;
}

void decide(SyncContext& context, KeyChange change, Plan& plan) {
    switch (change.device) {
        case Side::kChanged:
            decide_device_changed(context, std::move(change), plan);
            return;
        case Side::kGone:
            decide_device_gone(context, std::move(change), plan);
            return;
        case Side::kSame:
            decide_device_same(context, std::move(change), plan);
            return;
    }
}

}  // namespace qor
