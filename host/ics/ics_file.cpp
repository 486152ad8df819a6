// SPDX-License-Identifier: Apache-2.0
//
// An .ics file cut into its components. Keeps no state; any thread.
#include "host/ics/ics_file.h"

#include <fmt/format.h>
#include <glib.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <memory>

namespace qor {
namespace {

std::string upper(std::string_view text) {
    std::string result(text);
    for (char& c : result) {
        c = g_ascii_toupper(c);
    }
    return result;
}

std::string_view trimmed(std::string_view text) {
    while (!text.empty() && g_ascii_isspace(text.back())) {
        text.remove_suffix(1);
    }
    return text;
}

// Old producers write ISO 8859-1 without saying so; each of its bytes is one code point.
std::string from_latin1(const std::string& text) {
    std::string result;
    result.reserve(text.size() + text.size() / 8);
    for (const char c : text) {
        const auto byte = static_cast<unsigned char>(c);
        if (byte < 0x80) {
            result += c;
        } else {
            result += static_cast<char>(0xc0 | (byte >> 6));
            result += static_cast<char>(0x80 | (byte & 0x3f));
        }
    }
    return result;
}

bool is_utf8(const std::string& text) {
    return g_utf8_validate(text.data(), static_cast<gssize>(text.size()), nullptr) != 0;
}

// Lines may be folded inside a character (RFC 5545 3.1), so the whole lines are what counts.
std::string unfolded(const std::string& text) {
    std::string result;
    result.reserve(text.size());
    for (std::size_t at = 0; at < text.size(); ++at) {
        const std::size_t end = at + (text.compare(at, 2, "\r\n") == 0 ? 1 : 0);
        const bool folded = text[end] == '\n' && end + 1 < text.size() &&
                            (text[end + 1] == ' ' || text[end + 1] == '\t');
        if (folded) {
            at = end + 1;
        } else {
            result += text[at];
        }
    }
    return result;
}

void normalise(IcsFile& file) {
    std::string& text = file.text;
    if (text.starts_with("\xef\xbb\xbf")) {
        text.erase(0, 3);
    }
    std::erase(text, '\0');  // never part of a calendar; would end a text early
    if (text.find('\n') == std::string::npos) {
        std::ranges::replace(text, '\r', '\n');
    }
    if (!is_utf8(text) && !is_utf8(unfolded(text))) {
        text = from_latin1(text);
        file.was_utf8 = false;
    }
}

// Walks the lines of a file and cuts where a component of the calendar begins and ends.
class Cutter {
  public:
    explicit Cutter(IcsFile& file) : file_(file) {}

    void run() {
        const std::string_view text = file_.text;
        for (std::size_t at = 0; at < text.size();) {
            const std::size_t end = std::min(text.find('\n', at), text.size() - 1) + 1;
            ++line_;
            take(at, end, trimmed(text.substr(at, end - at)));
            at = end;
        }
        close(text.size(), false);
    }

  private:
    void take(std::size_t at, std::size_t end, std::string_view line) {
        const std::size_t colon = line.find_first_of(":;");
        if (colon == std::string_view::npos || line.front() == ' ' || line.front() == '\t') {
            return;  // a folded line goes with the one before it
        }
        const std::string name = upper(line.substr(0, colon));
        const std::string_view value = line.substr(std::min(line.find(':'), line.size() - 1) + 1);
        if (name == "BEGIN") {
            begin(at, upper(trimmed(value)));
        } else if (name == "END") {
            this->end(end, upper(trimmed(value)));
        } else if (kinds_.empty() && name == "X-WR-TIMEZONE") {
            calendar().zone_name = std::string(value);
        } else if (kinds_.empty() && name == "METHOD") {
            calendar().method = upper(value);
        }
    }

    // A component of the calendar inside another one means that the first was never ended.
    void begin(std::size_t at, std::string kind) {
        const bool calendar_part = kind == "VCALENDAR" || kind == "VEVENT" || kind == "VTIMEZONE" ||
                                   kind == "VTODO" || kind == "VJOURNAL" || kind == "VFREEBUSY";
        if (calendar_part) {
            close(at, false);
        }
        if (kind == "VCALENDAR") {
            file_.calendars.emplace_back();
            return;
        }
        if (kinds_.empty()) {
            start_ = at;
            start_line_ = line_;
        }
        kinds_.push_back(std::move(kind));
    }

    void end(std::size_t end, const std::string& kind) {
        const auto open = std::find(kinds_.rbegin(), kinds_.rend(), kind);
        if (kind == "VCALENDAR") {
            close(end, false);
        } else if (open != kinds_.rend()) {
            const bool complete = open == kinds_.rbegin();
            if (std::next(open) == kinds_.rend()) {
                close(end, complete);
            } else {
                kinds_.erase(std::next(open).base(), kinds_.end());
            }
        }
    }

    void close(std::size_t end, bool complete) {
        if (!kinds_.empty()) {
            calendar().components.push_back(
                {kinds_.front(), std::string_view(file_.text).substr(start_, end - start_),
                 start_line_, complete});
            kinds_.clear();
        }
    }

    IcsCalendar& calendar() {
        if (file_.calendars.empty()) {
            file_.calendars.emplace_back();
        }
        return file_.calendars.back();
    }

    IcsFile& file_;
    std::vector<std::string> kinds_;  // of the open components, outermost first
    std::size_t line_ = 0;
    std::size_t start_ = 0;
    std::size_t start_line_ = 0;
};

Result<std::string> read_all(std::FILE* file, const std::string& path) {
    std::string text;
    std::vector<char> block(1 << 20);
    std::size_t size = 0;
    while ((size = std::fread(block.data(), 1, block.size(), file)) > 0) {
        text.append(block.data(), size);
    }
    if (std::ferror(file) != 0) {
        return Error{ErrorKind::kOther, fmt::format("{}: {}", path, std::strerror(errno))};
    }
    return text;
}

}  // namespace

Result<std::unique_ptr<IcsFile>> cut_ics(std::string text, const std::string& name) {
    auto file = std::make_unique<IcsFile>();
    if (text.starts_with("\xff\xfe") || text.starts_with("\xfe\xff")) {
        return Error{
            ErrorKind::kInput,
            fmt::format("{}: is UTF-16; convert it first: iconv -f UTF-16 -t UTF-8", name)};
    }
    file->text = std::move(text);
    normalise(*file);
    Cutter(*file).run();
    if (file->calendars.empty()) {
        return Error{ErrorKind::kInput, fmt::format("{}: holds no calendar", name)};
    }
    return file;
}

Result<std::unique_ptr<IcsFile>> read_ics(const std::string& path) {
    struct Close {
        void operator()(std::FILE* file) const noexcept { std::fclose(file); }
    };
    if (path == "-") {
        Result<std::string> text = read_all(stdin, "standard input");
        return text ? cut_ics(*std::move(text), "standard input") : text.error();
    }
    const std::unique_ptr<std::FILE, Close> file(std::fopen(path.c_str(), "rbe"));
    if (!file) {
        return Error{ErrorKind::kMissing, fmt::format("{}: {}", path, std::strerror(errno))};
    }
    Result<std::string> text = read_all(file.get(), path);
    return text ? cut_ics(*std::move(text), path) : text.error();
}

}  // namespace qor
