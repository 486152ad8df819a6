// SPDX-License-Identifier: Apache-2.0
#include "common/json_depth.h"

#include <glib.h>

#include <cstring>

namespace {

constexpr char kOpening[] = {'[', '{'};

struct Text {
    const char* at;
    const char* end;
};

// "\uXXXX" at the text's position.
bool is_unicode_escape(const Text& text) {
    return text.end - text.at >= 6 && text.at[0] == '\\' && text.at[1] == 'u' &&
           g_ascii_isxdigit(text.at[2]) && g_ascii_isxdigit(text.at[3]) &&
           g_ascii_isxdigit(text.at[4]) && g_ascii_isxdigit(text.at[5]);
}

// The first half of a character beyond U+FFFF, or a stray second half: "\uD800" to "\uDFFF".
bool is_surrogate(const Text& escape) {
    return g_ascii_xdigit_value(escape.at[2]) == 0xD && g_ascii_xdigit_value(escape.at[3]) >= 8;
}

// Skips the escape at the text's position. False for one after which the library may take the
// closing quote for a part of the string.
bool skip_escape(Text* text) {
    if (text->end - text->at < 2 || text->at[1] != 'u') {
        text->at += 2;
        return true;
    }
    if (!is_unicode_escape(*text)) {
        return false;
    }
    const bool is_pair = is_surrogate(*text);
    text->at += 6;
    if (is_pair) {
        if (!is_unicode_escape(*text)) {
            return false;
        }
        text->at += 6;
    }
    return true;
}

// Skips the rest of a string and its closing quote; false as above.
bool skip_string(Text* text) {
    while (text->at < text->end) {
        if (*text->at == '\\') {
            if (!skip_escape(text)) {
                return false;
            }
        } else if (*text->at++ == '"') {
            break;
        }
    }
    return true;
}

// What nearly every text is, told at the speed of memchr().
bool has_few_brackets(const char* text, size_t length) {
    int count = 0;
    for (const char bracket : kOpening) {
        const char* at = text;
        const auto* const end = text + length;
        while ((at = static_cast<const char*>(
                    std::memchr(at, bracket, static_cast<size_t>(end - at)))) != nullptr) {
            if (++count > kDeepestJson) {
                return false;
            }
            ++at;
        }
    }
    return true;
}

bool is_opening(char c) {
    return c == '[' || c == '{';
}

}  // namespace

bool is_shallow_json(const char* text, size_t length) noexcept {
    if (has_few_brackets(text, length)) {
        return true;
    }
    Text rest{text, text + length};
    int depth = 0;
    bool is_json = true;
    while (rest.at < rest.end && is_json && depth <= kDeepestJson) {
        const char c = *rest.at++;
        if (c == '"') {
            is_json = skip_string(&rest);
        } else if (is_opening(c)) {
            ++depth;
        } else if (c == ']' || c == '}') {
            depth -= depth > 0 ? 1 : 0;
        } else {
            is_json = c != '\'' && c != '/';
        }
    }
    while (rest.at < rest.end && depth <= kDeepestJson) {
        depth += is_opening(*rest.at++) ? 1 : 0;
    }
    return depth <= kDeepestJson;
}
