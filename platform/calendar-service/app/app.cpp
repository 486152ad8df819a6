// SPDX-License-Identifier: Apache-2.0
#include "platform/calendar-service/app/app.h"

#include <charconv>
#include <nlohmann/json.hpp>

#include "cli/command_line.h"

namespace calendar_app {

void print_json(const Json& json) {
    fmt::print("{}\n", json.dump(2, ' ', false, Json::error_handler_t::replace));
}

void print_error(const std::string& text) {
    qor::print_error("qor-calendar", text);
}

void print_warnings(const calendar_text::Warnings& warnings) {
    for (const std::string& warning : warnings) {
        fmt::print(stderr, "qor-calendar: warning: {}\n", warning);
    }
}

int id_of(const std::string& text, const char* what) {
    int id = 0;
    const char* end = text.data() + text.size();
    const auto [at, error] = std::from_chars(text.data(), end, id);
    if (error != std::errc{} || at != end || id < 1) {
        fail(Exit::kUsage, "\"{}\" is no {} id; ids are numbers above 0, see 'qor-calendar {}'",
             text, what, what[0] == 'b' ? "books" : "list");
    }
    return id;
}

calendar_text::Zone find_zone(const std::string& id) {
    const std::optional<calendar_text::Zone> zone = calendar_text::Zone::find(id);
    if (!zone) {
        const std::string near = calendar_text::Zone::nearest_id(id);
        fail(Exit::kUsage, "unknown time zone \"{}\"; {}", id,
             near.empty() ? "zones are named like Europe/Berlin"
                          : fmt::format("did you mean {}?", near));
    }
    return *zone;
}

calendar_text::Zone given_zone(const Options& options) {
    return options.zone ? find_zone(*options.zone) : calendar_text::Zone::of_machine();
}

}  // namespace calendar_app
