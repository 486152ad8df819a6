// SPDX-License-Identifier: Apache-2.0
//
// Which document goes under which key, and whether the cloud takes it. One thread.
#include "host/ics/ics_import.h"

#include <fmt/format.h>

#include <algorithm>

#include "host/cloud/cloud_keys.h"
#include "host/ics/event_series.h"
#include "host/ics/rule_text.h"

namespace qor {
namespace {

constexpr std::size_t kBatch = 500;  // documents per commit
constexpr int kTries = 5;            // for a document that others write meanwhile

// One component of the file, parsed; none when it is no event, which the report then tells.
std::optional<IcsEvent> event_of(const IcsComponent& part, const std::string& where,
                                 IcsZones& zones, IcsReport& report) {
    if (!part.complete) {
        report.problems.push_back(
            {where, "", fmt::format("{} without its END; left out", part.kind)});
        return std::nullopt;
    }
    const IcalComponent component(icalparser_parse_string(std::string(part.text).c_str()));
    if (!component || icalcomponent_isa(component.get()) != ICAL_VEVENT_COMPONENT) {
        report.problems.push_back({where, "", "cannot be parsed; left out"});
        return std::nullopt;
    }
    return read_event(component.get(), where, zones, report);
}

std::string floating_zone(const IcsCalendar& calendar, const ImportOptions& options) {
    if (!options.floating_zone.empty()) {
        return options.floating_zone;
    }
    const std::string named = olson_zone(calendar.zone_name);
    return named.empty() ? local_zone() : named;
}

void read_calendar(const IcsCalendar& calendar, const std::string& name, IcsZones& zones,
                   SeriesCollection& series, IcsReport& report) {
    for (const IcsComponent& part : calendar.components) {
        const std::string where = fmt::format("{}:{}", name, part.line);
        if (part.kind == "VTIMEZONE" && !zones.add(std::string(part.text).c_str())) {
            report.problems.push_back({where, "", "VTIMEZONE not understood"});
        }
    }
    for (const IcsComponent& part : calendar.components) {
        if (part.kind == "VTIMEZONE") {
            continue;
        }
        if (part.kind != "VEVENT") {
            report.count(part.kind, "");
            continue;
        }
        auto event = event_of(part, fmt::format("{}:{}", name, part.line), zones, report);
        if (event) {
            event->cancelled = event->cancelled || calendar.method == "CANCEL";
            series.add(std::move(*event));
        }
    }
}

enum class Decision { kAdd, kChange, kUnchanged, kKeep, kKeepAndTell };

// What two wordings of the same rule have in common: Monday begins the week unless a rule says so.
std::string plain_rule(const std::string& rule) {
    std::string text = ";" + ics_rule(rule, false);
    if (const std::size_t at = text.find(";WKST=MO"); at != std::string::npos) {
        text.erase(at, 8);
    }
    return text;
}

// Whether two documents say the same of an event. Devices order keys differently, and word the
// cancellation of an occurrence at greater length; files do not keep blanks around a text.
bool same_event(const std::string& a, const std::string& b) {
    auto first = EventDocument::parse(a);
    auto second = EventDocument::parse(b);
    if (!first || !second) {
        return false;
    }
    if (first->cancelled && second->cancelled) {
        return first->parent_key == second->parent_key && first->instance_ms == second->instance_ms;
    }
    for (EventDocument* document : {&*first, &*second}) {
        if (document->rule) {
            document->rule = plain_rule(*document->rule);
        }
        std::ranges::sort(document->reminders);
        // A file cannot tell an empty text from none.
        for (auto* text : {&document->title, &document->location, &document->description}) {
            std::string kept = without_outer_blanks(without_controls(text->value_or("")));
            *text = kept.empty() ? std::nullopt : std::optional(std::move(kept));
        }
    }
    return *first == *second;
}

Decision decide(const std::optional<CloudDocument>& old, const WantedDocument& wanted,
                const std::string& digest, bool overwrite) {
    if (!old) {
        return Decision::kAdd;
    }
    if (!old->deleted && (old->text == wanted.text || same_event(old->text, wanted.text))) {
        return Decision::kUnchanged;
    }
    if (!overwrite && old->origin == digest) {
        return Decision::kKeep;
    }
    const bool as_imported = !old->deleted && text_digest(old->text) == old->origin;
    if (!overwrite && !as_imported) {
        return Decision::kKeepAndTell;
    }
    return old->deleted ? Decision::kAdd : Decision::kChange;
}

// Brings documents into the cloud, batch by batch.
class Writer {
  public:
    Writer(CloudStore* store, const ImportOptions& options, ImportSummary& summary)
        : store_(store), options_(options), summary_(summary) {}

    Status run(std::vector<WantedDocument> wanted) {
        const std::size_t total = wanted.size();
        for (std::size_t at = 0; at < total; at += kBatch) {
            std::vector<const WantedDocument*> batch;
            for (std::size_t i = at; i < std::min(at + kBatch, total); ++i) {
                batch.push_back(&wanted[i]);
            }
            for (int tries = 0; !batch.empty() && tries < kTries; ++tries) {
                if (Status status = write(batch); !status) {
                    return status;
                }
            }
            for (const WantedDocument* document : batch) {
                summary_.report.problems.push_back(
                    {document->where, document->title, "others keep changing it; not imported"});
            }
            if (options_.progress) {
                options_.progress(std::min(at + kBatch, total), total);
            }
        }
        return Done{};
    }

  private:
    // Leaves in the batch what others have changed meanwhile.
    Status write(std::vector<const WantedDocument*>& batch) {
        std::vector<CloudWrite> writes;
        std::vector<std::pair<const WantedDocument*, Decision>> asked;
        for (const WantedDocument* wanted : batch) {
            Result<std::optional<CloudDocument>> old = std::optional<CloudDocument>();
            if (store_ != nullptr && !(old = store_->get(wanted->key))) {
                return old.error();
            }
            std::string digest = text_digest(wanted->text);
            const Decision decision = decide(*old, *wanted, digest, options_.overwrite);
            if (decision != Decision::kAdd && decision != Decision::kChange) {
                count(*wanted, decision, old->has_value() && (*old)->deleted);
                continue;
            }
            const std::int64_t expected = old->has_value() ? (*old)->revision : 0;
            writes.push_back({wanted->key, wanted->text, false, expected, std::move(digest)});
            asked.emplace_back(wanted, decision);
        }
        batch.clear();
        if (options_.dry_run || writes.empty()) {
            for (const auto& [wanted, decision] : asked) {
                count(*wanted, decision, false);
            }
            return Done{};
        }
        const Result<std::vector<WriteResult>> results = store_->write(writes);
        if (!results) {
            return results.error();
        }
        for (std::size_t i = 0; i < asked.size(); ++i) {
            if ((*results)[i].outcome == WriteOutcome::kConflict) {
                batch.push_back(asked[i].first);
            } else {
                count(*asked[i].first, asked[i].second, false);
            }
        }
        return Done{};
    }

    void count(const WantedDocument& wanted, Decision decision, bool deleted) {
        switch (decision) {
            case Decision::kAdd:
                ++summary_.added;
                break;
            case Decision::kChange:
                ++summary_.changed;
                break;
            case Decision::kUnchanged:
                ++summary_.unchanged;
                break;
            case Decision::kKeepAndTell:
                summary_.report.problems.push_back(
                    {wanted.where, wanted.title,
                     deleted ? "deleted in the cloud, and different in the file now; stays deleted "
                               "(--overwrite brings it back)"
                             : "changed in the cloud, and different in the file; the cloud's stays "
                               "(--overwrite takes the file's)"});
                [[fallthrough]];
            case Decision::kKeep:
                ++summary_.kept;
                break;
        }
    }

    CloudStore* store_;
    const ImportOptions& options_;
    ImportSummary& summary_;
};

}  // namespace

Result<std::vector<WantedDocument>> documents_of(const IcsFile& file, const std::string& name,
                                                 const ImportOptions& options,
                                                 const CloudStore* store, ImportSummary& summary) {
    set_up_ical();
    if (!file.was_utf8) {
        summary.report.count("text that is not UTF-8 (read as ISO 8859-1)", "");
    }
    // The zones must outlive the events, which look into them.
    std::vector<std::unique_ptr<IcsZones>> zones;
    SeriesCollection series(store, summary);
    for (const IcsCalendar& calendar : file.calendars) {
        zones.push_back(
            std::make_unique<IcsZones>(floating_zone(calendar, options), summary.report));
        read_calendar(calendar, name, *zones.back(), series, summary.report);
    }
    return series.documents();
}

Result<ImportSummary> import_ics(const std::string& path, CloudStore* store,
                                 const ImportOptions& options) {
    const Result<std::unique_ptr<IcsFile>> file = read_ics(path);
    if (!file) {
        return file.error();
    }
    ImportSummary summary;
    const std::string name = path == "-" ? "standard input" : path;
    Result<std::vector<WantedDocument>> wanted =
        documents_of(**file, name, options, store, summary);
    if (!wanted) {
        return wanted.error();
    }
    if (const Status written = Writer(store, options, summary).run(*std::move(wanted)); !written) {
        return written.error();
    }
    return summary;
}

}  // namespace qor
