// SPDX-License-Identifier: Apache-2.0
//
// What a sync has to do.
#include "host/sync/plan.h"

#include <fmt/format.h>

#include <algorithm>
#include <set>
#include <unordered_map>
#include <utility>

#include "host/cloud/cloud_keys.h"
#include "host/failure.h"
#include "host/sync/decide.h"
#include "host/sync/device_changes.h"
#include "host/sync/series.h"

namespace qor {

namespace {

constexpr std::size_t kLongestKey = 512;

// Adapters put keys into their SQL as they are.
bool safe_key(const std::string& key) {
    return !key.empty() && key.size() <= kLongestKey &&
           std::ranges::all_of(key, [](char c) { return c > ' ' && c <= '~' && c != '\''; });
}

class Gatherer {
  public:
    Gatherer(SyncContext& context, std::vector<KeyChange> changes)
        : context_(context), changes_(std::move(changes)) {
        for (std::size_t i = 0; i < changes_.size(); ++i) {
            by_key_.emplace(changes_[i].key, i);
        }
    }

    // Returns up to where the feed was read.
    std::int64_t add_cloud_changes() {
        const std::int64_t since = context_.database.number(setting::kCloudRevision);
        CloudChanges feed = need(context_.cloud.changes(since));
        std::unordered_map<std::string, Retry> retries;
        for (Retry& retry : context_.journal.retries()) {
            retries.emplace(retry.key, retry);
        }
        for (CloudDocument& document : feed.documents) {
            const auto retry = retries.find(document.key);
            add(std::move(document), retry == retries.end() ? nullptr : &retry->second);
            if (retry != retries.end()) {
                retries.erase(retry);
            }
        }
        for (const auto& [key, retry] : retries) {
            if (auto document = need(context_.cloud.get(key))) {
                add(std::move(*document), &retry);
            } else {
                retry_without_document(key);
            }
        }
        return feed.revision;
    }

    std::vector<KeyChange> take() { return std::move(changes_); }

  private:
    KeyChange& change_of(const std::string& key, std::optional<Item> item) {
        const auto [at, added] = by_key_.emplace(key, changes_.size());
        if (added) {
            changes_.emplace_back();
            changes_.back().key = key;
            changes_.back().item = std::move(item);
        }
        return changes_[at->second];
    }

    void add(CloudDocument document, const Retry* retry) {
        std::optional<Item> item = context_.items.by_key(document.key);
        const bool news = !item || document.revision > item->revision;
        if ((!news && retry == nullptr) || (document.deleted && !item)) {
            drop_retry(document.key, retry);
            return;
        }
        auto event = SyncedDocument::parse(document.text);
        if (!document.deleted && (!event || !safe_key(document.key))) {
            put_aside(document, event ? "its key holds characters that a device cannot use"
                                      : "the cloud's text is no event document");
            return;
        }
        KeyChange& change = change_of(document.key, std::move(item));
        change.retried = retry != nullptr;
        change.interrupted = retry != nullptr && retry->interrupted;
        if (news) {
            change.cloud = document.deleted ? Side::kGone : Side::kChanged;
        }
        change.cloud_event = std::move(event);
        change.cloud_document = std::move(document);
    }

    void drop_retry(const std::string& key, const Retry* retry) {
        if (retry != nullptr) {
            context_.journal.drop_retry(key);
        }
    }

    // The cloud never had it: a new item of the device that is still to be uploaded, or nothing.
    void retry_without_document(const std::string& key) {
        context_.journal.drop_retry(key);
        const std::optional<Item> item = context_.items.by_key(key);
        if (item && item->id == 0) {
            context_.items.forget(key);
        }
    }

    void put_aside(const CloudDocument& document, const char* reason) {
        const std::string label = document.title.empty() ? document.key : document.title;
        context_.journal.retry({document.key, reason, label, now_ms(), false});
        context_.report.add(What::kProblem, label, document.key, reason);
    }

    SyncContext& context_;
    std::vector<KeyChange> changes_;
    std::unordered_map<std::string, std::size_t> by_key_;
};

}  // namespace

std::string KeyChange::label() const {
    if (device_document) {
        return device_document->label();
    }
    if (cloud_event) {
        return cloud_event->label();
    }
    return item ? item->label : key;
}

Plan make_plan(SyncContext& context) {
    Gatherer gatherer(context, read_device_changes(context));
    Plan plan;
    plan.cloud_revision = gatherer.add_cloud_changes();
    for (KeyChange& change : gatherer.take()) {
        if (context.failed.contains(change.key)) {
            continue;  // put aside in this run already
        }
        decide(context, std::move(change), plan);
    }
    complete_series(context, plan);
    return plan;
}

}  // namespace qor
