// SPDX-License-Identifier: Apache-2.0
//
// An .ics file cut into its components before anything is parsed, so that a broken one harms no
// other. Takes LF, CRLF and CR, a byte order mark, text that is not UTF-8, missing ENDs.
#pragma once

#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "host/result.h"

namespace qor {

struct IcsComponent {
    std::string kind;       // "VEVENT", "VTIMEZONE", "VTODO", ...; upper case
    std::string_view text;  // from its BEGIN line to its END line, lines ended by LF or CRLF
    std::size_t line = 0;   // of its BEGIN line, from 1
    bool complete = true;   // it has an END line
};

struct IcsCalendar {
    std::string zone_name;  // X-WR-TIMEZONE; empty when there is none
    std::string method;     // METHOD, upper case
    std::vector<IcsComponent> components;
};

struct IcsFile {
    std::string text;  // what the components look into; UTF-8
    bool was_utf8 = true;
    std::vector<IcsCalendar> calendars;
};

// Cuts a text up. Components outside a VCALENDAR count as one calendar. An error when it holds no
// component at all.
Result<std::unique_ptr<IcsFile>> cut_ics(std::string text, const std::string& name);

// Reads the file ("-" is standard input) and cuts it up.
Result<std::unique_ptr<IcsFile>> read_ics(const std::string& path);

}  // namespace qor
