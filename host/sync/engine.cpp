// SPDX-License-Identifier: Apache-2.0
//
// One sync.
#include "host/sync/engine.h"

#include <fmt/format.h>

#include "host/failure.h"
#include "host/sync/collect.h"
#include "host/sync/deliver.h"
#include "host/sync/plan.h"
#include "host/sync/push.h"
#include "host/sync/recover.h"
#include "host/sync/versions.h"

namespace qor {

namespace {

constexpr int kMostRounds = 10;
constexpr std::int64_t kFewItems = 10;

void check_cloud_identity(SyncContext& context) {
    const std::int64_t known = context.database.number(setting::kCloudRevision);
    const std::int64_t present = need(context.cloud.revision());
    if (present < known) {
        throw Failure(fmt::format(
            "{}: the cloud is at revision {}, this device had seen revision {}: it was replaced or "
            "restored. To bring both together without deleting anything: qor-host sync "
            "--start-over",
            context.cloud.path(), present, known));
    }
}

// A side that suddenly looks empty is more often broken than emptied.
bool too_many_deletions(SyncContext& context, const Plan& plan) {
    std::int64_t from_cloud = 0;
    std::int64_t from_device = 0;
    for (const Upload& upload : plan.uploads) {
        from_cloud += upload.deleted && upload.change.item->kind == ItemKind::kOrdinary ? 1 : 0;
    }
    for (const Delivery& delivery : plan.deliveries) {
        from_device +=
            delivery.action == Action::kRemove && delivery.change.item->kind == ItemKind::kOrdinary
                ? 1
                : 0;
    }
    const std::int64_t events = context.items.counts().events;
    const auto too_many = [&](std::int64_t deletions) {
        return events >= kFewItems && deletions * 2 > events;
    };
    if (!too_many(from_cloud) && !too_many(from_device)) {
        return false;
    }
    const bool device = too_many(from_device);
    context.report.stopped = true;
    context.report.add(
        What::kProblem, fmt::format("{} of {} events", device ? from_device : from_cloud, events),
        "",
        fmt::format("would be deleted from the {}, since they are gone from the {}. Nothing was "
                    "changed. If that is right: qor-host sync --allow-mass-delete",
                    device ? "device" : "cloud", device ? "cloud" : "device"));
    return true;
}

void tell(SyncContext& context, const Plan& plan) {
    for (const Upload& upload : plan.uploads) {
        const bool is_new = !upload.change.item || upload.change.item->revision == 0;
        context.report.add(upload.deleted ? What::kUploadDeletion
                           : is_new       ? What::kUploadNew
                                          : What::kUploadChange,
                           upload.change.label(), upload.change.key);
    }
    for (const Delivery& delivery : plan.deliveries) {
        if (!delivery.again) {
            const bool is_new = !delivery.change.item || delivery.change.item->id == 0;
            context.report.add(delivery.action == Action::kRemove ? What::kDeviceDeletion
                               : is_new                           ? What::kDeviceNew
                                                                  : What::kDeviceChange,
                               delivery.change.label(), delivery.change.key);
        }
    }
}

void adopt(SyncContext& context, const KeyChange& change) {
    Item item = *change.item;
    if (change.device == Side::kChanged) {
        item.id = change.device_id;
        item.device_document = change.device_text;
        item.kind = change.device_document->kind() == ItemKind::kCancelled ? ItemKind::kCancelled
                                                                           : item.kind;
    }
    if (change.cloud_event) {
        item.document = change.cloud_document.text;
        item.revision = change.cloud_document.revision;
        item.kind = change.cloud_event->kind();
        item.parent_key = change.cloud_event->parent_key();
        item.label = change.cloud_event->label();
    }
    context.items.store(item);
}

// What needs no writing on either side, and what must be kept before it is overwritten.
void settle_records(SyncContext& context, const Plan& plan) {
    WriteBatch batch(context.database.connection());
    for (const Conflict& conflict : plan.lost) {
        context.conflicts.keep(conflict);
    }
    for (const auto* settled : {&plan.adopted, &plan.forgotten}) {
        for (const KeyChange& change : *settled) {
            for (const int id : change.noted) {
                context.journal.drop_change(id);
            }
            context.journal.drop_retry(change.key);
        }
    }
    for (const KeyChange& change : plan.adopted) {
        adopt(context, change);
    }
    for (const KeyChange& change : plan.forgotten) {
        context.items.forget(change.key);
    }
    batch.commit();
}

void commit_progress(SyncContext& context, const Plan& plan, int device_version) {
    if (context.database.number(setting::kCloudRevision) == plan.cloud_revision &&
        context.database.number(setting::kDeviceVersion) == device_version) {
        return;
    }
    WriteBatch batch(context.database.connection());
    context.database.set(setting::kCloudRevision, plan.cloud_revision);
    context.database.set(setting::kDeviceVersion, device_version);
    batch.commit();
}

// Returns whether anything was done.
bool run_round(SyncContext& context) {
    const int device_version = calendar_version();
    collect_device_changes(context, device_version);
    check_calendar(context);
    recover(context);
    note_applied(context);
    const Plan plan = make_plan(context);
    if (!context.options.allow_mass_delete && too_many_deletions(context, plan)) {
        return false;
    }
    if (context.options.dry_run) {
        tell(context, plan);
        return false;
    }
    if (!plan.empty()) {
        settle_records(context, plan);
        push(context, plan.uploads);
        deliver(context, plan.deliveries, device_version);
    }
    commit_progress(context, plan, device_version);
    return !plan.empty();
}

}  // namespace

bool nothing_to_do(CloudStore& cloud, HostDatabase& database, int calendar_version) {
    return database.number(setting::kDeviceVersion) == calendar_version &&
           need(cloud.revision()) == database.number(setting::kCloudRevision) &&
           Journal(database.connection()).empty();
}

void run_sync(SyncContext& context) {
    check_cloud_identity(context);
    check_device_identity(context);
    uncover_unfinished(context);
    for (int round = 0; round < kMostRounds; ++round) {
        if (!run_round(context)) {
            return;
        }
    }
    context.report.add(What::kNote, "the sync", "",
                       "both sides kept changing; what came last is synced the next time");
}

void start_over(HostDatabase& database) {
    Items items(database.connection());
    Journal journal(database.connection());
    WriteBatch batch(database.connection());
    items.each([&](Item item) {
        if (item.id == 0) {
            items.forget(item.key);
            return;
        }
        journal.note_change(item.id, false, now_ms());
        item.document.clear();
        item.revision = 0;
        items.store(item);
    });
    database.set(setting::kCloudRevision, std::int64_t{0});
    batch.commit();
}

}  // namespace qor
