// SPDX-License-Identifier: Apache-2.0
//
// The events of a file by UID, turned into documents under their keys. One thread.
#include "host/ics/event_series.h"

#include <fmt/format.h>

#include <algorithm>

#include "host/cloud/cloud_keys.h"

namespace qor {
namespace {

// An event without a UID is known by what it says.
std::string uid_of(const IcsEvent& event) {
    return event.uid.empty() ? "uid-" + text_digest(event.document.to_text()).substr(0, 32)
                             : event.uid;
}

EventDocument cancelled_document(const std::string& parent_key, std::int64_t instance_ms,
                                 bool all_day) {
    EventDocument document;
    document.cancelled = true;
    document.all_day = document.instance_is_date = all_day;
    document.start_ms = instance_ms;
    document.parent_key = parent_key;
    document.instance_ms = instance_ms;
    return document;
}

}  // namespace

void SeriesCollection::add(IcsEvent event) {
    if (event.uid.empty()) {
        count("UID missing (known by what the event says)", event);
    }
    const std::string uid = uid_of(event);
    if (key_from_uid(uid) != uid) {
        count("UID with characters that no key can have (a digest takes its place)", event);
    }
    const auto [found, is_new] = by_uid_.try_emplace(uid, series_.size());
    if (is_new) {
        series_.push_back({uid, {}, {}});
    }
    Series& series = series_[found->second];
    (event.recurrence_id ? series.occurrences : series.events).push_back(std::move(event));
}

Result<std::vector<WantedDocument>> SeriesCollection::documents() {
    for (Series& series : series_) {
        if (const Status status = append(series); !status) {
            return status.error();
        }
        series = {};
    }
    return std::move(wanted_);
}

void SeriesCollection::want(const std::string& key, const EventDocument& document,
                            const IcsEvent& event) {
    wanted_.push_back({key, document.to_text(), event.document.title.value_or(""), event.where});
}

// Of several versions of an event the one with the highest SEQUENCE; different events that share
// a UID are all kept.
std::vector<IcsEvent> SeriesCollection::newest(std::vector<IcsEvent> events) {
    long highest = 0;
    for (const IcsEvent& event : events) {
        highest = std::max(highest, event.sequence);
    }
    std::vector<IcsEvent> result;
    std::vector<std::string> texts;
    for (IcsEvent& event : events) {
        std::string text = event.document.to_text();
        if (event.sequence < highest) {
            count("older version of an event in the same file", event);
        } else if (std::ranges::find(texts, text) != texts.end()) {
            count("event that stands twice in the file", event);
        } else {
            texts.push_back(std::move(text));
            result.push_back(std::move(event));
        }
    }
    return result;
}

Result<std::optional<SeriesCollection::Parent>> SeriesCollection::parent_in_store(
    const std::string& key) const {
    if (store_ == nullptr) {
        return std::optional<Parent>();
    }
    const Result<std::optional<CloudDocument>> stored = store_->get(key);
    if (!stored) {
        return stored.error();
    }
    const auto document =
        stored->has_value() ? EventDocument::parse((*stored)->text) : std::nullopt;
    if (!document || !document->start_ms) {
        return std::optional<Parent>();
    }
    Parent parent{
        key, document->all_day, {olson_zone(document->zone.value_or(kUtcZone)), nullptr}, {}};
    if (parent.zone.olson.empty()) {
        parent.zone.olson = kUtcZone;
    }
    parent.start = parent.zone.wall(*document->start_ms / 1000);
    return std::optional(std::move(parent));
}

Status SeriesCollection::append(Series& series) {
    const std::string key = key_from_uid(series.uid);
    const std::vector<IcsEvent> events = newest(std::move(series.events));
    for (const IcsEvent& event : events) {
        const bool first = &event == &events.front();
        if (event.cancelled) {
            count("event with STATUS:CANCELLED (left out)", event);
            continue;
        }
        std::string own_key = key;
        if (!first) {
            own_key += "~" + text_digest(event.document.to_text()).substr(0, 8);
            count("UID that different events share (kept apart)", event);
        }
        append_event(event, own_key, first ? series.occurrences : std::vector<IcsEvent>());
    }
    if (!events.empty()) {
        return Done{};
    }
    const Result<std::optional<Parent>> parent = parent_in_store(key);
    if (!parent) {
        return parent.error();
    }
    if (parent->has_value()) {
        append_occurrences(**parent, nullptr, series.occurrences);
    } else {
        append_orphans(key, series.occurrences);
    }
    return Done{};
}

void SeriesCollection::append_event(const IcsEvent& event, const std::string& key,
                                    const std::vector<IcsEvent>& occurrences) {
    ++summary_.events;
    want(key, event.document, event);
    append_occurrences(
        {key, event.document.all_day,
         event.start.is_date ? IcsZone{kUtcZone, nullptr} : *event.start.zone, event.start.wall},
        &event, occurrences);
}

void SeriesCollection::append_occurrences(const Parent& parent, const IcsEvent* event,
                                          const std::vector<IcsEvent>& occurrences) {
    std::map<std::int64_t, const IcsEvent*> changed;
    for (const IcsEvent& occurrence : occurrences) {
        const std::int64_t instance =
            instance_ms(*occurrence.recurrence_id, parent.all_day, parent.zone, parent.start);
        const IcsEvent*& chosen = changed[instance];
        if (chosen != nullptr) {
            count("older version of an occurrence in the same file", occurrence);
        }
        if (chosen == nullptr || occurrence.sequence >= chosen->sequence) {
            chosen = &occurrence;
        }
    }
    std::map<std::int64_t, const IcsEvent*> cancelled;
    if (event != nullptr) {
        for (const IcsTime& excluded : event->excluded) {
            if (!event->document.rule) {
                count("EXDATE of an event without RRULE", *event);
                continue;
            }
            cancelled[instance_ms(excluded, parent.all_day, parent.zone, parent.start)] = event;
        }
    }
    for (const auto& [instance, occurrence] : changed) {
        if (occurrence->cancelled) {
            cancelled[instance] = occurrence;
        } else if (cancelled.erase(instance) != 0) {
            count("EXDATE of an occurrence that is changed too (the change is kept)", *occurrence);
        }
    }
    for (const auto& [instance, source] : cancelled) {
        ++summary_.cancelled_occurrences;
        want(occurrence_key(parent.key, instance),
             cancelled_document(parent.key, instance, parent.all_day), *source);
    }
    for (const auto& [instance, occurrence] : changed) {
        if (occurrence->cancelled) {
            continue;
        }
        ++summary_.changed_occurrences;
        EventDocument document = occurrence->document;
        if (document.rule) {
            count("RRULE of a changed occurrence", *occurrence);
            document.rule.reset();
        }
        document.parent_key = parent.key;
        document.instance_ms = instance;
        document.instance_is_date = parent.all_day;
        want(occurrence_key(parent.key, instance), document, *occurrence);
    }
}

// A changed occurrence of an event that is nowhere would wait for it for ever.
void SeriesCollection::append_orphans(const std::string& key,
                                      const std::vector<IcsEvent>& occurrences) {
    for (const IcsEvent& occurrence : occurrences) {
        if (occurrence.cancelled) {
            count("cancelled occurrence of an event that is not there (left out)", occurrence);
            continue;
        }
        count("changed occurrence of an event that is not there (stored as an event)", occurrence);
        append_event(occurrence, occurrence_key(key, occurrence.recurrence_id->ms()), {});
    }
}

}  // namespace qor
