// SPDX-License-Identifier: Apache-2.0
//
// Carries the cloud's changes to the device.
#include "host/sync/deliver.h"

#include <algorithm>
#include <set>
#include <utility>

#include "host/adapter/adapter_files.h"
#include "host/sync/versions.h"

namespace qor {

namespace {

constexpr std::size_t kBatch = 200;

enum class Outcome {
    kDone,
    kPending,
    kFailed,
    kTouched,      // edited on the device since it was listed: the next round decides
    kStaysAsItIs,  // an occurrence of a series that was not written after all
};

// Tells whether somebody else has written to the calendar since it was listed.
class CalendarWatch {
  public:
    explicit CalendarWatch(int listed_version) : seen_(listed_version) {}

    void before_own_write() { others_wrote_ = others_wrote_ || calendar_version() != seen_; }
    void after_own_write() { seen_ = calendar_version(); }
    bool others_wrote() const { return others_wrote_; }

  private:
    int seen_;
    bool others_wrote_ = false;
};

struct Delivered {
    Outcome outcome = Outcome::kFailed;
    int id = 0;
    std::string device_document;
    const char* reason = "";
};

constexpr const char* kRefused = "the device refused it";
constexpr const char* kNotDeleted = "the device could not delete it";
constexpr const char* kNotApplied = "the device could not store it in the calendar";

// Somebody edited the item since it was listed: the edit is uploaded before anything is written.
bool touched(const SyncContext& context, const Delivery& delivery) {
    const Item& item = *delivery.change.item;
    if (delivery.expected_device.empty() || item.kind == ItemKind::kCancelled || item.pending) {
        return false;
    }
    const ItemValue value = context.device.get(item.id);
    if (value.state != ItemValue::State::kRead || value.document == delivery.expected_device) {
        return false;
    }
    const auto now = SyncedDocument::parse(value.document);
    const auto expected = SyncedDocument::parse(delivery.expected_device);
    const bool same = now && expected && documents_agree(*now, *expected);
    const bool written_already =
        now && delivery.action != Action::kRemove && documents_agree(*now, delivery.document);
    return !same && !written_already;
}

bool parent_is_missing(SyncContext& context, const SyncedDocument& document) {
    if (document.kind() == ItemKind::kOrdinary) {
        return false;
    }
    const std::optional<Item> parent = context.items.by_key(document.parent_key());
    return !parent || parent->id == 0 || parent->pending;
}

Delivered insert(SyncContext& context, const Delivery& delivery) {
    Delivered result;
    result.reason = kRefused;
    result.id = context.device.insert(for_device(delivery.document));
    if (result.id <= 0) {
        result.id = 0;
        return result;
    }
    ItemValue value = context.device.get(result.id);
    result.device_document = std::move(value.document);
    if (value.state == ItemValue::State::kRead) {
        result.outcome = Outcome::kDone;
    } else if (parent_is_missing(context, delivery.document)) {
        result.outcome = Outcome::kPending;
    } else {
        context.device.remove(result.id);  // a dead row, which nothing would apply any more
        result.id = 0;
        result.reason = kNotApplied;
    }
    return result;
}

// An item that is not there any more counts as removed.
bool remove_item(const SyncContext& context, int id) {
    return context.device.remove(id) || context.device.get(id).state == ItemValue::State::kGone;
}

Delivered update(SyncContext& context, const Delivery& delivery) {
    const int id = delivery.change.item->id;
    Delivered result;
    result.reason = kRefused;
    result.id = id;
    if (!context.device.update(id, for_device(delivery.document))) {
        // Missing on the device though nobody deleted it: it comes back.
        return context.device.get(id).state == ItemValue::State::kGone ? insert(context, delivery)
                                                                       : result;
    }
    result.device_document = context.device.get(id).document;
    result.outcome = Outcome::kDone;
    return result;
}

// Writing a series drops its list of cancelled occurrences, which no document shows: one that has
// been cancelled since the listing would be lost.
bool may_drop_a_cancellation(const Delivery& delivery) {
    const auto present = SyncedDocument::parse(delivery.change.item->device_document);
    return delivery.action == Action::kUpdate && (!present || present->recurring());
}

Delivered carry_out(SyncContext& context, const Delivery& delivery, bool others_wrote) {
    if (delivery.action == Action::kInsert) {
        return insert(context, delivery);
    }
    if (touched(context, delivery) || (others_wrote && may_drop_a_cancellation(delivery))) {
        return {Outcome::kTouched, 0, {}, ""};
    }
    if (delivery.action == Action::kUpdate) {
        return update(context, delivery);
    }
    if (!remove_item(context, delivery.change.item->id)) {
        return {Outcome::kFailed, delivery.change.item->id, {}, kNotDeleted};
    }
    for (const int alias : context.items.aliases(delivery.change.key)) {
        context.device.remove(alias);  // the row of a number; forgotten with the item
    }
    return delivery.action == Action::kReplace ? insert(context, delivery)
                                               : Delivered{Outcome::kDone, 0, {}, ""};
}

// What the batches of one round share.
struct Round {
    CalendarWatch calendar;
    std::set<std::string> unwritten{};  // keys of series that were to be written and were not
};

class Batch {
  public:
    Batch(SyncContext& context, Round& round, const Delivery* first, const Delivery* last)
        : context_(context), round_(round), first_(first), last_(last) {}

    void run() {
        note_intents();
        for (const Delivery* delivery = first_; delivery != last_; ++delivery) {
            results_.push_back(write(*delivery));
        }
        check_cancellations();
        store_results();
    }

  private:
    Delivered write(const Delivery& delivery) {
        if (delivery.again && round_.unwritten.contains(delivery.document.parent_key())) {
            return {Outcome::kStaysAsItIs, 0, {}, ""};
        }
        round_.calendar.before_own_write();
        Delivered result = carry_out(context_, delivery, round_.calendar.others_wrote());
        round_.calendar.after_own_write();
        if (delivery.action == Action::kUpdate && result.outcome != Outcome::kDone) {
            round_.unwritten.insert(delivery.change.key);
        }
        return result;
    }

    void note_intents() {
        WriteBatch batch(context_.database.connection());
        const std::int64_t base = std::max(context_.database.number(setting::kHighestId),
                                           highest_adapter_id().value_or(0));
        for (const Delivery* delivery = first_; delivery != last_; ++delivery) {
            context_.journal.intend({delivery->action, delivery->change.key, delivery->text,
                                     delivery->revision, static_cast<int>(base)});
            if (delivery->action == Action::kRemove) {
                context_.database.set(setting::kCascadeCheck, 1);
            }
        }
        batch.commit();
    }

    // A cancellation that could not be written reads like one that was: only the adapter's records
    // tell them apart.
    void check_cancellations() {
        std::set<int> unapplied;
        for (const PendingRow& row : pending_rows()) {
            unapplied.insert(row.id);
        }
        for (std::size_t i = 0; i < results_.size(); ++i) {
            if (results_[i].outcome == Outcome::kDone && unapplied.contains(results_[i].id) &&
                first_[i].document.kind() == ItemKind::kCancelled) {
                context_.device.remove(results_[i].id);
                results_[i] = {Outcome::kFailed, 0, {}, kNotApplied};
            }
        }
    }

    void store_results() {
        WriteBatch batch(context_.database.connection());
        for (std::size_t i = 0; i < results_.size(); ++i) {
            store(first_[i], results_[i]);
        }
        context_.journal.drop_intents();
        batch.commit();
    }

    void store(const Delivery& delivery, const Delivered& result) {
        context_.remember_id(result.id);
        switch (result.outcome) {
            case Outcome::kDone:
            case Outcome::kPending:
                settle(delivery, result);
                return;
            case Outcome::kTouched:
                context_.journal.retry(
                    {delivery.change.key, "", delivery.change.label(), now_ms(), delivery.again});
                return;
            case Outcome::kStaysAsItIs:
                context_.journal.drop_retry(delivery.change.key);
                return;
            case Outcome::kFailed:
                put_aside(delivery, result);
                return;
        }
    }

    void settle(const Delivery& delivery, const Delivered& result) {
        for (const int id : delivery.change.noted) {
            context_.journal.drop_change(id);
        }
        context_.journal.drop_retry(delivery.change.key);
        if (delivery.action == Action::kRemove) {
            forget(delivery);
        } else {
            store_item(delivery, result);
        }
        if (!delivery.again || result.outcome == Outcome::kPending) {
            context_.report.add(what_of(delivery, result), label_of(delivery), delivery.change.key);
        }
    }

    static std::string label_of(const Delivery& delivery) {
        return delivery.action == Action::kRemove ? delivery.change.label()
                                                  : delivery.document.label();
    }

    static What what_of(const Delivery& delivery, const Delivered& result) {
        if (result.outcome == Outcome::kPending) {
            return What::kPending;
        }
        if (delivery.action == Action::kRemove) {
            return What::kDeviceDeletion;
        }
        const auto& item = delivery.change.item;
        return item && (item->id > 0 || delivery.change.interrupted) ? What::kDeviceChange
                                                                     : What::kDeviceNew;
    }

    // With a series its occurrences are gone from the device.
    void forget(const Delivery& delivery) {
        for (const Item& child : context_.items.children(delivery.change.key)) {
            if (child.id > 0) {
                context_.journal.drop_change(child.id);
            }
            context_.journal.drop_retry(child.key);
            context_.items.forget(child.key);
        }
        context_.items.forget(delivery.change.key);
    }

    void store_item(const Delivery& delivery, const Delivered& result) {
        Item item = context_.items.by_key(delivery.change.key).value_or(Item{});
        item.key = delivery.change.key;
        item.id = result.id;
        item.kind = delivery.document.kind();
        item.parent_key = delivery.document.parent_key();
        item.label = delivery.document.label();
        item.device_document = result.device_document;
        item.pending = result.outcome == Outcome::kPending;
        if (delivery.revision >= item.revision) {  // not uploaded in between
            item.document = delivery.text;
            item.revision = delivery.revision;
        }
        for (const int alias : context_.items.aliases(item.key)) {
            context_.items.drop_alias(alias);
        }
        context_.items.store(item);
    }

    void put_aside(const Delivery& delivery, const Delivered& result) {
        const std::string& key = delivery.change.key;
        context_.failed.insert(key);
        context_.journal.retry({key, result.reason, label_of(delivery), now_ms(), true});
        if (std::optional<Item> item = context_.items.by_key(key);
            item && result.id == 0 && delivery.action == Action::kReplace) {
            item->id = 0;  // removed, but not written again
            context_.items.store(*item);
        }
        context_.report.add(What::kProblem, label_of(delivery), key, result.reason);
    }

    SyncContext& context_;
    Round& round_;
    const Delivery* first_;
    const Delivery* last_;
    std::vector<Delivered> results_;
};

}  // namespace

void deliver(SyncContext& context, const std::vector<Delivery>& deliveries, int listed_version) {
    {
        WriteBatch batch(context.database.connection());
        for (const Delivery& delivery : deliveries) {
            if (delivery.again) {
                context.journal.retry(
                    {delivery.change.key, "", delivery.change.label(), now_ms(), true});
            }
        }
        batch.commit();
    }
    Round round{CalendarWatch(listed_version)};
    const Delivery* const end = deliveries.data() + deliveries.size();
    for (const Delivery* first = deliveries.data(); first != end;) {
        // An adapter finds a parent by its key only once the parent's batch is committed.
        const Delivery* last = first;
        while (last != end && last->rank == first->rank &&
               last - first < static_cast<std::ptrdiff_t>(kBatch)) {
            ++last;
        }
        Batch(context, round, first, last).run();
        first = last;
        context.progress("to the device", static_cast<std::size_t>(first - deliveries.data()),
                         deliveries.size());
    }
}

}  // namespace qor
