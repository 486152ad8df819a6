// SPDX-License-Identifier: Apache-2.0
#include "platform/calendar-service/app/time_text.h"

#include <fmt/format.h>

#include <algorithm>
#include <array>
#include <chrono>
#include <cstdlib>

namespace calendar_text {
namespace {

constexpr std::int64_t kLongestDuration_s = 36600 * kDay_s;

bool is_digit(char c) {
    return c >= '0' && c <= '9';
}

// Reads a text from left to right; once something does not fit, everything after fails too.
class Reader {
  public:
    explicit Reader(std::string_view text) : text_(text) {}

    bool at_end() const { return at_ == text_.size(); }
    bool ok() const { return ok_; }
    bool skip(std::string_view any_of) {
        if (at_end() || any_of.find(text_[at_]) == std::string_view::npos) {
            return false;
        }
        ++at_;
        return true;
    }
    int number(std::size_t digits) {
        int value = 0;
        for (std::size_t i = 0; i < digits; ++i) {
            if (at_end() || !is_digit(text_[at_])) {
                ok_ = false;
                return 0;
            }
            value = value * 10 + (text_[at_++] - '0');
        }
        return value;
    }

  private:
    std::string_view text_;
    std::size_t at_ = 0;
    bool ok_ = true;
};

// "Z" or "+01:00" after a time: the seconds that the wall clock is ahead of UTC.
std::optional<std::int64_t> read_offset(Reader& reader, bool* ok) {
    if (reader.at_end() || reader.skip("Zz")) {
        return 0;
    }
    const bool west = reader.skip("-");
    if (!west && !reader.skip("+")) {
        *ok = false;
        return std::nullopt;
    }
    const int hours = reader.number(2);
    static_cast<void>(reader.skip(":"));
    const int minutes = reader.number(2);
    *ok = reader.ok() && hours < 24 && minutes < 60;
    return (west ? -1 : 1) * (hours * 3600 + minutes * 60);
}

}  // namespace

Civil civil_of(std::int64_t wall_s) {
    const std::int64_t wall = std::clamp(wall_s, kEarliest_s, kLatest_s);
    const std::int64_t start = midnight(wall);
    const std::chrono::year_month_day date{
        std::chrono::sys_days{std::chrono::days{static_cast<int>(start / kDay_s)}}};
    const int rest = static_cast<int>(wall - start);
    return {static_cast<int>(date.year()),
            static_cast<int>(static_cast<unsigned>(date.month())),
            static_cast<int>(static_cast<unsigned>(date.day())),
            rest / 3600,
            rest / 60 % 60,
            rest % 60};
}

std::int64_t day_of(int year, int month, int day) {
    const std::chrono::year_month_day first{
        std::chrono::year{std::clamp(year, 1, 9999)},
        std::chrono::month{static_cast<unsigned>(std::clamp(month, 1, 12))}, std::chrono::day{1}};
    const std::int64_t days = std::chrono::sys_days{first}.time_since_epoch().count();
    return std::min((days + std::clamp(day, 1, 31) - 1) * kDay_s, midnight(kLatest_s));
}

std::int64_t midnight(std::int64_t wall_s) {
    const std::int64_t rest = wall_s % kDay_s;
    return wall_s - (rest < 0 ? rest + kDay_s : rest);
}

std::optional<GivenTime> parse_time(std::string_view text) {
    const std::string trimmed = trim(text);
    Reader reader(trimmed);
    const int year = reader.number(4);
    static_cast<void>(reader.skip("-"));
    const int month = reader.number(2);
    static_cast<void>(reader.skip("-"));
    const int day = reader.number(2);
    const std::chrono::year_month_day date{std::chrono::year{year},
                                           std::chrono::month{static_cast<unsigned>(month)},
                                           std::chrono::day{static_cast<unsigned>(day)}};
    if (!reader.ok() || year < 1 || !date.ok()) {
        return std::nullopt;
    }
    GivenTime given;
    given.wall_s = day_of(year, month, day);
    if (reader.at_end()) {
        return given;
    }
    if (!reader.skip("Tt ")) {
        return std::nullopt;
    }
    given.has_time = true;
    const int hour = reader.number(2);
    const bool colon = reader.skip(":");
    const int minute = reader.number(2);
    int second = 0;
    const Reader before_seconds = reader;
    if (colon ? reader.skip(":") : !reader.at_end()) {
        second = reader.number(2);
        if (!reader.ok() && !colon) {
            reader = before_seconds;  // "0930Z": a suffix follows, no seconds
            second = 0;
        }
    }
    if (!reader.ok() || hour > 23 || minute > 59 || second > 59) {
        return std::nullopt;
    }
    given.wall_s += hour * 3600 + minute * 60 + second;
    if (!reader.at_end()) {
        bool ok = true;
        const std::optional<std::int64_t> offset_s = read_offset(reader, &ok);
        if (!ok || !reader.at_end() || !offset_s) {
            return std::nullopt;
        }
        given.utc_s = given.wall_s - *offset_s;
    }
    return given;
}

std::optional<Duration> parse_duration(std::string_view text) {
    Duration duration;
    std::int64_t number = -1;
    const auto take = [&number](std::int64_t& total, std::int64_t unit) {
        const bool fits = number >= 0 && number <= kLongestDuration_s / unit;
        total += fits ? number * unit : 0;
        number = -1;
        return fits;
    };
    const std::string trimmed = trim(text);
    for (std::size_t i = 0; i < trimmed.size(); ++i) {
        const char c = static_cast<char>(trimmed[i] | 0x20);  // letters in lower case
        bool fits = true;
        if (is_digit(trimmed[i])) {
            number = std::max<std::int64_t>(number, 0) * 10 + (trimmed[i] - '0');
            fits = number <= kLongestDuration_s;
        } else if (c == 'w') {
            fits = take(duration.days, 7);
        } else if (c == 'd') {
            fits = take(duration.days, 1);
        } else if (c == 'h') {
            fits = take(duration.seconds, 3600);
        } else if (c == 'm') {
            fits = take(duration.seconds, 60);
        } else if (c == 's') {
            fits = take(duration.seconds, 1);
        } else {
            fits = number < 0 && ((c == 'p' && i == 0) || c == 't');
        }
        if (!fits) {
            return std::nullopt;
        }
    }
    if (number >= 0 && trimmed.find_first_not_of("0123456789") == std::string::npos) {
        static_cast<void>(take(duration.seconds, 60));
    }
    const bool has_unit = trimmed.find_first_of("0123456789") != std::string::npos;
    const bool too_long =
        duration.days > kLongestDuration_s / kDay_s || duration.seconds > kLongestDuration_s;
    return number < 0 && has_unit && !too_long ? std::optional(duration) : std::nullopt;
}

std::string trim(std::string_view text) {
    constexpr std::string_view kBlank = " \t\r\n";
    const std::size_t first = text.find_first_not_of(kBlank);
    if (first == std::string_view::npos) {
        return {};
    }
    return std::string(text.substr(first, text.find_last_not_of(kBlank) - first + 1));
}

std::string date_text(std::int64_t wall_s) {
    const Civil civil = civil_of(wall_s);
    return fmt::format("{:04}-{:02}-{:02}", civil.year, civil.month, civil.day);
}

std::string day_text(std::int64_t wall_s) {
    constexpr std::array<const char*, 7> kNames = {"Thu", "Fri", "Sat", "Sun", "Mon", "Tue", "Wed"};
    const std::int64_t day = midnight(wall_s) / kDay_s % 7;  // 1970-01-01 was a Thursday
    return fmt::format("{} {}", kNames[static_cast<std::size_t>((day + 7) % 7)], date_text(wall_s));
}

std::string clock_text(std::int64_t wall_s) {
    const Civil civil = civil_of(wall_s);
    return civil.second == 0
               ? fmt::format("{:02}:{:02}", civil.hour, civil.minute)
               : fmt::format("{:02}:{:02}:{:02}", civil.hour, civil.minute, civil.second);
}

std::string compact_text(const Moment& moment) {
    const Civil c = civil_of(moment.at_s);
    const std::string date = fmt::format("{:04}{:02}{:02}", c.year, c.month, c.day);
    return moment.is_date ? date
                          : fmt::format("{}T{:02}{:02}{:02}Z", date, c.hour, c.minute, c.second);
}

std::string instant_text(std::int64_t utc_s, const Zone& zone) {
    const std::int64_t wall_s = zone.to_wall(utc_s);
    const Civil c = civil_of(wall_s);
    const std::string wall =
        fmt::format("{}T{:02}:{:02}:{:02}", date_text(wall_s), c.hour, c.minute, c.second);
    const std::int64_t minutes = (wall_s - utc_s) / 60;
    if (wall_s == utc_s) {
        return wall + "Z";
    }
    if (wall_s - utc_s != minutes * 60) {
        return instant_text(utc_s, Zone::utc());  // an old offset with seconds cannot be written
    }
    return fmt::format("{}{}{:02}:{:02}", wall, minutes < 0 ? '-' : '+', std::abs(minutes) / 60,
                       std::abs(minutes) % 60);
}

std::string duration_text(std::int64_t seconds) {
    struct Unit {
        char letter;
        std::int64_t length_s;
    };
    constexpr Unit kUnits[] = {{'d', kDay_s}, {'h', 3600}, {'m', 60}, {'s', 1}};
    std::string text;
    std::int64_t rest = seconds;
    for (const Unit& unit : kUnits) {
        if (rest >= unit.length_s) {
            text += fmt::format("{}{}", rest / unit.length_s, unit.letter);
            rest %= unit.length_s;
        }
    }
    return text.empty() ? "0m" : text;
}

}  // namespace calendar_text
