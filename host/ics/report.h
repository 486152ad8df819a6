// SPDX-License-Identifier: Apache-2.0
//
// What an import or export did, and what it could not do. Nothing is left out without a line here.
#pragma once

#include <cstddef>
#include <map>
#include <string>
#include <vector>

namespace qor {

// Something that documents do not hold, such as "ATTENDEE", and where it was met first.
struct NotCarried {
    std::size_t count = 0;
    std::string example;  // the title of the first event that has it
};

struct Problem {
    std::string where;  // "work.ics:120"
    std::string title;  // of the event; empty when it is not known
    std::string what;
};

struct IcsReport {
    std::map<std::string, NotCarried> not_carried;  // by kind
    std::map<std::string, std::string> zones;       // zone name in the file, how it was understood
    std::vector<Problem> problems;                  // what was left out, or not read as meant

    void count(const std::string& kind, const std::string& title) {
        NotCarried& entry = not_carried[kind];
        if (entry.count++ == 0) {
            entry.example = title;
        }
    }
};

}  // namespace qor
