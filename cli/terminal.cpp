// SPDX-License-Identifier: Apache-2.0
//
// Keeps no state; any thread.
#include "cli/terminal.h"

#include <fmt/format.h>
#include <unicode/uchar.h>
#include <unicode/utf8.h>
#include <unistd.h>

#include <algorithm>
#include <cstdint>
#include <cstdio>

namespace qor {
namespace {

// The next character, negative for bytes that are none.
UChar32 next_character(std::string_view text, std::size_t& at) {
    const auto* bytes = reinterpret_cast<const std::uint8_t*>(text.data());
    const std::size_t length = text.size();
    UChar32 c = 0;
    U8_NEXT(bytes, at, length, c);
    return c;
}

std::size_t width_of(UChar32 c) {
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
        if (next_character(text, at) < 0) {
            return false;
        }
    }
    return true;
}

std::string one_line(std::string_view text) {
    std::string line;
    for (std::size_t at = 0; at < text.size();) {
        const std::size_t before = at;
        const UChar32 c = next_character(text, at);
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

std::size_t display_width(std::string_view text) {
    std::size_t width = 0;
    for (std::size_t at = 0; at < text.size();) {
        width += width_of(next_character(text, at));
    }
    return width;
}

std::string shortened(std::string_view text, std::size_t width) {
    if (display_width(text) <= width) {
        return std::string(text);
    }
    std::size_t used = 1;  // for the ellipsis
    std::size_t at = 0;
    for (std::size_t end = 0; end < text.size();) {
        used += width_of(next_character(text, end));
        if (used > width) {
            break;
        }
        at = end;
    }
    return std::string(text.substr(0, at)) + "…";
}

void Table::add(std::vector<std::string> cells) {
    for (std::string& cell : cells) {
        cell = one_line(cell);
    }
    rows_.push_back(std::move(cells));
}

std::string Table::text(bool colour) const {
    std::vector<std::size_t> widths(rows_.front().size());
    for (const auto& row : rows_) {
        for (std::size_t i = 0; i < row.size(); ++i) {
            widths[i] = std::max(widths[i], display_width(row[i]));
        }
    }
    std::string result;
    for (const auto& row : rows_) {
        std::string line;
        for (std::size_t i = 0; i < row.size(); ++i) {
            const std::string gap(widths[i] - display_width(row[i]), ' ');
            const bool right = std::ranges::find(right_, i) != right_.end();
            line += fmt::format("{}{}{}", i == 0 ? "" : "  ", right ? gap + row[i] : row[i],
                                right ? "" : gap);
        }
        line.erase(line.find_last_not_of(' ') + 1);
        const bool bold = colour && &row == &rows_.front();
        result += fmt::format("{}{}{}\n", bold ? "\033[1m" : "", line, bold ? "\033[0m" : "");
    }
    return result;
}

void Table::print() const {
    fmt::print("{}", text(isatty(STDOUT_FILENO) != 0));
}

Progress::Progress(std::string what)
    : what_(std::move(what)), on_terminal_(isatty(STDERR_FILENO) != 0) {}

Progress::~Progress() {
    if (shown_) {
        fmt::print(stderr, "\r\033[K");
    }
}

void Progress::show(std::size_t done, std::size_t total) {
    if (on_terminal_) {
        shown_ = true;
        fmt::print(stderr, "\r\033[K{} {}/{}", what_, done, total);
    }
}

std::string plural(std::size_t count, std::string_view noun) {
    return fmt::format("{} {}{}", count, noun, count == 1 ? "" : "s");
}

}  // namespace qor
