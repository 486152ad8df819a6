// SPDX-License-Identifier: Apache-2.0
//
// Owners for libical's objects, and its settings.
#pragma once

#include <libical/ical.h>

#include <algorithm>
#include <memory>
#include <string>

namespace qor {

struct FreeIcal {
    void operator()(icalcomponent* component) const noexcept { icalcomponent_free(component); }
    void operator()(icalproperty* property) const noexcept { icalproperty_free(property); }
    void operator()(icaltimezone* zone) const noexcept { icaltimezone_free(zone, 1); }
    void operator()(char* text) const noexcept { icalmemory_free_buffer(text); }
};
using IcalComponent = std::unique_ptr<icalcomponent, FreeIcal>;
using IcalProperty = std::unique_ptr<icalproperty, FreeIcal>;
using IcalZone = std::unique_ptr<icaltimezone, FreeIcal>;
using IcalText = std::unique_ptr<char, FreeIcal>;

// The value of a property as it stands in a file; empty when it has none.
inline std::string value_text(const icalproperty* property) {
    const IcalText text(icalproperty_get_value_as_string_r(property));
    return text ? std::string(text.get()) : std::string();
}

inline std::string name_text(const icalproperty* property) {
    const IcalText text(icalproperty_get_property_name_r(property));
    return text ? std::string(text.get()) : std::string();
}

// A text without the characters that no .ics file may hold (RFC 5545 3.1), whoever wrote it.
inline std::string without_controls(std::string text) {
    std::erase_if(text, [](char c) {
        return (static_cast<unsigned char>(c) < ' ' && c != '\n' && c != '\t') || c == '\x7f';
    });
    return text;
}

// A text without blanks around it, which files do not keep.
inline std::string without_outer_blanks(std::string text) {
    text.erase(text.find_last_not_of(" \t\n") + 1);
    text.erase(0, std::min(text.find_first_not_of(" \t\n"), text.size()));
    return text;
}

// Broken input is told by results, not by aborting; unknown names are kept, not refused.
inline void set_up_ical() {
    icalerror_set_errors_are_fatal(0);
    ical_set_unknown_token_handling_setting(ICAL_ASSUME_IANA_TOKEN);
}

}  // namespace qor
