// SPDX-License-Identifier: Apache-2.0
//
// The events of a file by UID: each event with its cancelled and changed occurrences, turned into
// documents under their keys.
#pragma once

#include <map>
#include <string>
#include <unordered_map>
#include <vector>

#include "host/ics/event_reader.h"
#include "host/ics/ics_import.h"

namespace qor {

class SeriesCollection {
  public:
    // Both must outlive it; `store` may be null.
    SeriesCollection(const CloudStore* store, ImportSummary& summary)
        : store_(store), summary_(summary) {}

    void add(IcsEvent event);

    // Each event before its occurrences, in the order of the file. Ends the collection's life.
    Result<std::vector<WantedDocument>> documents();

  private:
    struct Series {
        std::string uid;
        std::vector<IcsEvent> events;       // more than one: the UID is used twice
        std::vector<IcsEvent> occurrences;  // with a RECURRENCE-ID
    };
    // What the occurrences of an event need to know of it.
    struct Parent {
        std::string key;
        bool all_day = false;
        IcsZone zone;
        WallTime start;
    };

    Status append(Series& series);
    void append_event(const IcsEvent& event, const std::string& key,
                      const std::vector<IcsEvent>& occurrences);
    void append_occurrences(const Parent& parent, const IcsEvent* event,
                            const std::vector<IcsEvent>& occurrences);
    void append_orphans(const std::string& key, const std::vector<IcsEvent>& occurrences);
    std::vector<IcsEvent> newest(std::vector<IcsEvent> events);
    Result<std::optional<Parent>> parent_in_store(const std::string& key) const;
    void want(const std::string& key, const EventDocument& document, const IcsEvent& event);
    void count(const std::string& kind, const IcsEvent& event) {
        summary_.report.count(kind, event.document.title.value_or(""));
    }

    const CloudStore* store_;
    ImportSummary& summary_;
    std::vector<Series> series_;
    std::unordered_map<std::string, std::size_t> by_uid_;
    std::vector<WantedDocument> wanted_;
};

}  // namespace qor
