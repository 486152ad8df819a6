// SPDX-License-Identifier: Apache-2.0
//
// Reads the items that the journal names from the device.
#include "host/sync/device_changes.h"

#include <fmt/format.h>

#include <map>
#include <unordered_map>
#include <utility>

#include "host/adapter/adapter_files.h"
#include "host/cloud/cloud_keys.h"
#include "host/failure.h"

namespace qor {

namespace {

constexpr const char* kUnreadable =
    "the device cannot write it as a document; open it there, look at its reminders, save it";

class Reader {
  public:
    explicit Reader(SyncContext& context) : context_(context) {
        for (const Item& item : context.items.absent()) {
            absent_.emplace(item.label, item);
        }
    }

    // Ordinary items first: an occurrence can be read only when its series has a key.
    std::vector<KeyChange> read() {
        std::vector<DeviceChange> later;
        const std::vector<DeviceChange> all = context_.journal.changes();
        WriteBatch batch(context_.database.connection());
        std::size_t done = 0;
        for (const DeviceChange& change : all) {
            context_.progress("reading the device", ++done, all.size());
            if (change.gone) {
                read_gone(change);
            } else if (!read_present(change)) {
                later.push_back(change);
            }
        }
        batch.commit();
        WriteBatch second(context_.database.connection());
        for (const DeviceChange& change : later) {
            if (read_present(change)) {
                continue;
            }
            if (!has_row(change.id) && !context_.items.by_id(change.id)) {
                context_.journal.drop_change(
                    change.id);  // went with its series since it was listed
            } else {
                put_aside(change, kUnreadable);
            }
        }
        second.commit();
        return std::move(changes_);
    }

  private:
    KeyChange& change_of(const Item& item) {
        const auto [at, added] = by_key_.emplace(item.key, changes_.size());
        if (added) {
            changes_.emplace_back();
            changes_.back().key = item.key;
            changes_.back().item = item;
        }
        return changes_[at->second];
    }

    void read_gone(const DeviceChange& noted) {
        const std::optional<Item> item = context_.items.by_id(noted.id);
        if (!item) {  // made and deleted between two syncs, or listed twice
            context_.items.drop_alias(noted.id);
            context_.journal.drop_change(noted.id);
            return;
        }
        KeyChange& change = change_of(*item);
        change.noted.push_back(noted.id);
        if (change.device == Side::kSame) {  // not cancelled instead, under another number
            change.device = Side::kGone;
            change.noticed_ms = noted.noticed_ms;
        }
    }

    // False when the item cannot be read (yet).
    bool read_present(const DeviceChange& noted) {
        if (context_.items.is_alias(noted.id)) {
            context_.journal.drop_change(noted.id);
            return true;
        }
        const ItemValue value = context_.device.get(noted.id);
        if (value.state == ItemValue::State::kUnapplied) {  // waits for its series
            context_.journal.drop_change(noted.id);
            return true;
        }
        auto document = SyncedDocument::parse(value.document);
        if (value.state != ItemValue::State::kRead || !document) {
            return false;
        }
        std::optional<Item> item = context_.items.by_id(noted.id);
        if (!item) {
            item = document->kind() == ItemKind::kCancelled
                       ? cancelled_item(noted, *document)
                       : new_item(noted.id, *document, value.document);
        }
        if (!item || unchanged(*item, noted.id, *document, value.document)) {
            context_.journal.drop_change(noted.id);
            return true;
        }
        KeyChange& change = change_of(*item);
        change.device = Side::kChanged;
        change.device_id = noted.id;
        change.device_document = std::move(document);
        change.device_text = value.document;
        change.noticed_ms = noted.noticed_ms;
        change.noted.push_back(noted.id);
        return true;
    }

    static bool unchanged(const Item& item, int id, const SyncedDocument& now,
                          const std::string& text) {
        if (item.document.empty() || item.id != id) {
            return false;
        }
        if (item.device_document == text || item.kind == ItemKind::kCancelled) {
            return true;
        }
        const auto before = SyncedDocument::parse(item.device_document);
        return before && documents_agree(*before, now);
    }

    // An occurrence has one key, whoever cancels it. No value: it is known under another number.
    std::optional<Item> cancelled_item(const DeviceChange& noted, const SyncedDocument& document) {
        const std::string key = occurrence_key(document.parent_key(), document.instant_ms());
        std::optional<Item> item = context_.items.by_key(key);
        if (item && item->id > 0 && on_device(*item)) {
            context_.items.add_alias(noted.id, key);
            return std::nullopt;
        }
        if (item) {  // the changed occurrence of this key is gone, and cancelled instead
            return item;
        }
        item = Item{};
        item->key = key;
        item->id = noted.id;
        item->kind = ItemKind::kCancelled;
        item->parent_key = document.parent_key();
        item->label = document.label();
        context_.items.store(*item);
        return item;
    }

    bool on_device(const Item& item) {
        return item.kind == ItemKind::kCancelled ||
               context_.device.get(item.id).state == ItemValue::State::kRead;
    }

    Item new_item(int id, const SyncedDocument& document, const std::string& text) {
        const auto [first, last] = absent_.equal_range(document.label());
        for (auto candidate = first; candidate != last; ++candidate) {
            const auto wanted = SyncedDocument::parse(candidate->second.document);
            if (wanted && documents_agree(*wanted, document)) {
                Item item = candidate->second;
                absent_.erase(candidate);
                item.id = id;
                item.device_document = text;
                context_.items.store(item);
                context_.journal.drop_retry(item.key);
                return item;
            }
        }
        Item item;
        item.key = new_cloud_key();
        if (item.key.empty()) {
            throw Failure("the system has no random numbers to make a key of");
        }
        item.id = id;
        item.label = document.label();
        context_.items.store(item);
        return item;
    }

    void put_aside(const DeviceChange& noted, const char* reason) {
        const std::optional<Item> item = context_.items.by_id(noted.id);
        const std::string label = item ? item->label : fmt::format("item {}", noted.id);
        context_.journal.explain_change(noted.id, reason, label);
        context_.report.add(What::kProblem, label, item ? item->key : "", reason);
    }

    SyncContext& context_;
    std::multimap<std::string, Item> absent_;
    std::vector<KeyChange> changes_;
    std::unordered_map<std::string, std::size_t> by_key_;
};

}  // namespace

std::vector<KeyChange> read_device_changes(SyncContext& context) {
    return Reader(context).read();
}

}  // namespace qor
