// SPDX-License-Identifier: Apache-2.0
//
// Everything in the cloud as one .ics text. One thread.
#include "host/ics/ics_export.h"

#include <algorithm>
#include <map>

#include "host/ics/event_writer.h"

namespace qor {
namespace {

// The cloud's documents, each event with its occurrences.
struct Library {
    struct Occurrence {
        std::string key;
        EventDocument document;
        std::int64_t modified_ms = 0;
    };
    std::vector<EventToWrite> events;                            // in the order of their revisions
    std::map<std::string, std::vector<Occurrence>> occurrences;  // by their event's key
};

Library sorted(const std::vector<CloudDocument>& documents, IcsReport& report) {
    Library library;
    for (const CloudDocument& stored : documents) {
        auto document = EventDocument::parse(stored.text);
        if (!document) {
            report.problems.push_back({stored.key, stored.title, "no event document; left out"});
        } else if (document->is_occurrence()) {
            const std::string parent = *document->parent_key;
            library.occurrences[parent].push_back(
                {stored.key, *std::move(document), stored.modified_ms});
        } else {
            library.events.push_back(
                {stored.key, stored.key, *std::move(document), stored.modified_ms, nullptr, {}});
        }
    }
    return library;
}

std::string component_text(const IcalComponent& component) {
    const IcalText text(icalcomponent_as_ical_string_r(component.get()));
    return text ? text.get() : "";
}

class Exporter {
  public:
    explicit Exporter(ExportSummary& summary) : summary_(summary) {}

    void add(const EventToWrite& event, std::size_t& counter) {
        if (const IcalComponent component = write_event(event, zones_, summary_.report)) {
            texts_.push_back(component_text(component));
            ++counter;
        }
    }

    // An event, what is cancelled of it, and its changed occurrences.
    void add_series(EventToWrite event, const std::vector<Library::Occurrence>& occurrences) {
        for (const Library::Occurrence& occurrence : occurrences) {
            if (occurrence.document.cancelled) {
                event.excluded_ms.push_back(*occurrence.document.instance_ms);
                ++summary_.cancelled_occurrences;
            }
        }
        std::ranges::sort(event.excluded_ms);
        add(event, summary_.events);
        for (const Library::Occurrence& occurrence : occurrences) {
            if (!occurrence.document.cancelled) {
                add({occurrence.key,
                     event.uid,
                     occurrence.document,
                     occurrence.modified_ms,
                     &event.document,
                     {}},
                    summary_.changed_occurrences);
            }
        }
    }

    // Occurrences of an event that is not in the cloud (any more).
    void add_orphans(const std::vector<Library::Occurrence>& occurrences) {
        for (const Library::Occurrence& occurrence : occurrences) {
            const std::string title = occurrence.document.title.value_or(occurrence.key);
            if (occurrence.document.cancelled) {
                summary_.report.count("cancelled occurrence of an event that is gone (left out)",
                                      title);
                continue;
            }
            summary_.report.count(
                "changed occurrence of an event that is gone (written as an event)", title);
            add({occurrence.key,
                 occurrence.key,
                 occurrence.document,
                 occurrence.modified_ms,
                 nullptr,
                 {}},
                summary_.events);
        }
    }

    bool write(const std::function<bool(std::string_view)>& out) const {
        bool going =
            out("BEGIN:VCALENDAR\r\nVERSION:2.0\r\n"
                "PRODID:-//qor-adapter-calendar//qor-cloud//EN\r\nCALSCALE:GREGORIAN\r\n");
        for (const std::string& zone : zones_) {
            const IcalComponent component = write_zone(zone);
            going = going && (!component || out(component_text(component)));
        }
        for (const std::string& text : texts_) {
            going = going && out(text);
        }
        return going && out("END:VCALENDAR\r\n");
    }

  private:
    ExportSummary& summary_;
    std::set<std::string> zones_;
    std::vector<std::string> texts_;
};

}  // namespace

Result<ExportSummary> export_ics(const CloudStore& store,
                                 const std::function<bool(std::string_view)>& write) {
    set_up_ical();
    const Result<std::vector<CloudDocument>> documents = store.documents();
    if (!documents) {
        return documents.error();
    }
    ExportSummary summary;
    Library library = sorted(*documents, summary.report);
    Exporter exporter(summary);
    for (EventToWrite& event : library.events) {
        const auto occurrences = library.occurrences.extract(event.key);
        exporter.add_series(std::move(event), occurrences.empty()
                                                  ? std::vector<Library::Occurrence>()
                                                  : occurrences.mapped());
    }
    for (const auto& [parent, occurrences] : library.occurrences) {
        exporter.add_orphans(occurrences);
    }
    if (!exporter.write(write)) {
        return Error{ErrorKind::kOther, "the calendar could not be written whole"};
    }
    return summary;
}

}  // namespace qor
