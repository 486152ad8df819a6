// SPDX-License-Identifier: Apache-2.0
//
// What one change of a recurring event means for its occurrences.
#include "host/sync/series.h"

#include <algorithm>
#include <set>
#include <unordered_map>
#include <utility>

#include "host/failure.h"
#include "host/sync/decide.h"

namespace qor {

namespace {

class Completion {
  public:
    Completion(SyncContext& context, Plan& plan) : context_(context), plan_(plan) {
        for (std::size_t i = 0; i < plan.deliveries.size(); ++i) {
            delivered_.emplace(plan.deliveries[i].change.key, i);
        }
    }

    void run() {
        drop_occurrences_of_removed();
        return_occurrences_of_kept();
        write_series_of_restored();
        std::vector<std::string> written;
        for (const Delivery& delivery : plan_.deliveries) {
            if (delivery.action != Action::kRemove && delivery.rank == 2) {
                written.push_back(delivery.change.key);
            }
        }
        for (const std::string& key : written) {
            deliver_occurrences(key);
        }
    }

  private:
    bool removes(const std::string& key) const {
        const auto found = delivered_.find(key);
        return found != delivered_.end() &&
               plan_.deliveries[found->second].action == Action::kRemove;
    }

    void add(Delivery delivery) {
        delivery.again = true;
        delivered_.emplace(delivery.change.key, plan_.deliveries.size());
        plan_.deliveries.push_back(std::move(delivery));
    }

    // Occurrences of a series that goes, go with it: they need no upload and no delivery. What is
    // known of them is forgotten when the series is gone.
    void drop_occurrences_of_removed() {
        const auto orphan = [&](const KeyChange& change) {
            std::string parent = change.item ? change.item->parent_key : std::string();
            if (change.cloud_event) {
                parent = change.cloud_event->parent_key();
            }
            return !parent.empty() && removes(parent);
        };
        std::erase_if(plan_.uploads,
                      [&](const Upload& u) { return !u.deleted && orphan(u.change); });
        std::erase_if(plan_.deliveries, [&](const Delivery& d) {
            return d.action != Action::kRemove && orphan(d.change);
        });
        delivered_.clear();
        for (std::size_t i = 0; i < plan_.deliveries.size(); ++i) {
            delivered_.emplace(plan_.deliveries[i].change.key, i);
        }
    }

    // A deletion of a series that lost to an edit takes the deletions of its occurrences with it.
    void return_occurrences_of_kept() {
        std::set<std::string> kept;
        for (const Delivery& delivery : plan_.deliveries) {
            if (delivery.change.device == Side::kGone) {
                kept.insert(delivery.change.key);
            }
        }
        for (Upload& upload : plan_.uploads) {
            const auto& item = upload.change.item;
            if (!upload.deleted || !item || !kept.contains(item->parent_key)) {
                continue;
            }
            if (auto document = SyncedDocument::parse(item->document)) {
                const std::string text = item->document;
                const std::int64_t revision = item->revision;
                add(delivery_of(upload.change, std::move(*document), text, revision));
                upload.change.key.clear();
            }
        }
        std::erase_if(plan_.uploads, [](const Upload& u) { return u.change.key.empty(); });
    }

    // A cancellation that is taken back: its series is written anew, without it.
    void write_series_of_restored() {
        std::set<std::string> parents;
        for (const Delivery& delivery : plan_.deliveries) {
            const auto& item = delivery.change.item;
            const bool was_cancelled =
                item && item->id > 0 && !item->pending && item->kind == ItemKind::kCancelled;
            const bool stays = delivery.action != Action::kRemove &&
                               delivery.document.kind() == ItemKind::kCancelled;
            if (was_cancelled && !stays) {
                parents.insert(item->parent_key);
            }
        }
        for (const std::string& key : parents) {
            std::optional<Item> parent = context_.items.by_key(key);
            if (delivered_.contains(key) || !parent || parent->id == 0) {
                continue;
            }
            if (auto document = SyncedDocument::parse(parent->document)) {
                KeyChange change;
                change.key = key;
                change.item = parent;
                add(delivery_of(std::move(change), std::move(*document), parent->document,
                                parent->revision));
            }
        }
    }

    // A series that is written: its cancelled occurrences once more. One that is new here: all
    // that the cloud has of it.
    void deliver_occurrences(const std::string& key) {
        const Delivery& series = plan_.deliveries[delivered_.at(key)];
        const bool is_new = series.action != Action::kUpdate;
        if (!series.document.recurring() && is_new) {
            return;
        }
        for (const Item& child : context_.items.children(key)) {
            if (child.kind == ItemKind::kCancelled && child.id > 0 &&
                !delivered_.contains(child.key)) {
                deliver_again(child);
            }
        }
        if (!is_new) {
            return;
        }
        for (CloudDocument& document : need(context_.cloud.occurrences(key))) {
            auto event = SyncedDocument::parse(document.text);
            if (!event || delivered_.contains(document.key)) {
                continue;
            }
            KeyChange change;
            change.key = document.key;
            change.item = context_.items.by_key(document.key);
            if (change.item && change.item->id > 0 && !change.item->pending) {
                continue;
            }
            add(delivery_of(std::move(change), std::move(*event), document.text,
                            document.revision));
        }
    }

    void deliver_again(const Item& child) {
        KeyChange change;
        change.key = child.key;
        change.item = child;
        std::string text = child.document;
        for (const Upload& upload : plan_.uploads) {  // cancelled on this device just now
            if (upload.change.key == child.key) {
                text = upload.deleted ? std::string() : upload.text;
            }
        }
        for (const KeyChange& adopted : plan_.adopted) {  // and in the cloud by an interrupted run
            if (adopted.key == child.key && adopted.cloud_event) {
                text = adopted.cloud_document.text;
            }
        }
        if (auto document = SyncedDocument::parse(text)) {
            add(delivery_of(std::move(change), std::move(*document), text, child.revision));
        }
    }

    SyncContext& context_;
    Plan& plan_;
    std::unordered_map<std::string, std::size_t> delivered_;
};

}  // namespace

void complete_series(SyncContext& context, Plan& plan) {
    Completion(context, plan).run();
    std::stable_sort(plan.deliveries.begin(), plan.deliveries.end(),
                     [](const Delivery& a, const Delivery& b) { return a.rank < b.rank; });
}

}  // namespace qor
