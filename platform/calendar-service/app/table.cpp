// SPDX-License-Identifier: Apache-2.0
#include "platform/calendar-service/app/table.h"

#include <fmt/format.h>
#include <unicode/uchar.h>
#include <unicode/utf8.h>
#include <unistd.h>

#include <algorithm>
#include <cstdint>

namespace calendar_app {
namespace {

constexpr UChar32 kReplacement = 0xFFFD;
constexpr int kGap = 2;

// The next character, or a negative number for bytes that are none.
UChar32 next_character(std::string_view text, std::size_t* at) {
    const auto* bytes = reinterpret_cast<const std::uint8_t*>(text.data());
    auto i = static_cast<std::int64_t>(*at);
    const auto length = static_cast<std::int64_t>(text.size());
    UChar32 c = 0;
    U8_NEXT(bytes, i, length, c);
    *at = static_cast<std::size_t>(i);
    return c;
}

int width_of(UChar32 c) {
    const auto type = u_charType(c);
    if (type == U_NON_SPACING_MARK || type == U_ENCLOSING_MARK || type == U_FORMAT_CHAR) {
        return 0;
    }
    const int east_asian = u_getIntPropertyValue(c, UCHAR_EAST_ASIAN_WIDTH);
    return east_asian == U_EA_WIDE || east_asian == U_EA_FULLWIDTH ? 2 : 1;
}

}  // namespace

bool is_utf8(std::string_view text) {
    for (std::size_t at = 0; at < text.size();) {
        if (next_character(text, &at) < 0) {
            return false;
        }
    }
    return true;
}

std::string one_line(std::string_view text) {
    std::string line;
    for (std::size_t at = 0; at < text.size();) {
        const std::size_t before = at;
        const UChar32 c = next_character(text, &at);
        if (c < 0) {
            line += "\uFFFD";
        } else if (u_iscntrl(c) != 0) {
            line += ' ';
        } else {
            line += text.substr(before, at - before);
        }
    }
    return line;
}

int display_width(std::string_view text) {
    int width = 0;
    for (std::size_t at = 0; at < text.size();) {
        const UChar32 c = next_character(text, &at);
        width += width_of(c < 0 ? kReplacement : c);
    }
    return width;
}

Table::Table(std::vector<std::string> headings) {
    rows_.push_back(std::move(headings));
}

void Table::add(std::vector<std::string> cells) {
    for (std::string& cell : cells) {
        cell = one_line(cell);
    }
    rows_.push_back(std::move(cells));
}

void Table::print() const {
    std::vector<int> widths(rows_.front().size());
    for (const auto& row : rows_) {
        for (std::size_t i = 0; i < row.size(); ++i) {
            widths[i] = std::max(widths[i], display_width(row[i]));
        }
    }
    const bool in_colour = isatty(STDOUT_FILENO) != 0;
    for (const auto& row : rows_) {
        std::string line;
        int missing = 0;  // blanks are written before the next text, never at a line's end
        for (std::size_t i = 0; i < row.size(); ++i) {
            if (!row[i].empty()) {
                line.append(static_cast<std::size_t>(missing), ' ');
                line += row[i];
                missing = 0;
            }
            missing += widths[i] - display_width(row[i]) + kGap;
        }
        const bool is_heading = in_colour && &row == &rows_.front();
        fmt::print("{}{}{}\n", is_heading ? "\033[1m" : "", line, is_heading ? "\033[0m" : "");
    }
}

}  // namespace calendar_app
