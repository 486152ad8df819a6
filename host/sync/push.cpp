// SPDX-License-Identifier: Apache-2.0
//
// Carries the device's changes into the cloud.
#include "host/sync/push.h"

#include <algorithm>

#include "host/failure.h"

namespace qor {

namespace {

constexpr std::size_t kBatch = 500;

void store_uploaded(SyncContext& context, const Upload& upload, const WriteResult& result) {
    Item item = context.items.by_key(upload.change.key).value_or(Item{});
    if (upload.change.item && upload.change.item->id > 0 && item.id == 0) {
        return;  // lost by the device meanwhile; it is delivered anew
    }
    const SyncedDocument& document = *upload.change.device_document;
    item.key = upload.change.key;
    item.id = upload.change.device_id;
    item.kind = document.kind() == ItemKind::kCancelled ? ItemKind::kCancelled
                : item.kind == ItemKind::kCancelled     ? ItemKind::kOrdinary
                                                        : item.kind;
    item.label = document.label();
    item.document = upload.text;
    item.device_document = upload.change.device_text;
    item.revision = result.revision;
    context.items.store(item);
}

void store_result(SyncContext& context, const Upload& upload, const WriteResult& result) {
    const KeyChange& change = upload.change;
    if (result.outcome == WriteOutcome::kConflict) {
        return;  // changed in the cloud since the feed was read
    }
    const bool is_new = !change.item || change.item->revision == 0;
    if (upload.deleted) {
        context.items.forget(change.key);
    } else if (change.device_id > 0) {
        store_uploaded(context, upload, result);
    }
    for (const int id : change.noted) {
        context.journal.drop_change(id);
    }
    context.journal.drop_retry(change.key);
    if (result.outcome == WriteOutcome::kWritten) {
        context.report.add(upload.deleted ? What::kUploadDeletion
                           : is_new       ? What::kUploadNew
                                          : What::kUploadChange,
                           change.label(), change.key);
    }
}

void push_batch(SyncContext& context, const Upload* first, const Upload* last) {
    std::vector<CloudWrite> writes;
    for (const Upload* upload = first; upload != last; ++upload) {
        writes.push_back({upload->change.key, upload->text, upload->deleted, upload->expected, {}});
    }
    const std::vector<WriteResult> results = need(context.cloud.write(writes));
    WriteBatch batch(context.database.connection());
    for (std::size_t i = 0; i < results.size(); ++i) {
        store_result(context, first[i], results[i]);
    }
    batch.commit();
}

}  // namespace

void push(SyncContext& context, const std::vector<Upload>& uploads) {
    for (std::size_t done = 0; done < uploads.size(); done += kBatch) {
        const std::size_t end = std::min(done + kBatch, uploads.size());
        push_batch(context, uploads.data() + done, uploads.data() + end);
        context.progress("to the cloud", end, uploads.size());
    }
}

}  // namespace qor
