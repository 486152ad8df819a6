// SPDX-License-Identifier: Apache-2.0
//
// Guards the JSON library's parser, which recurses once per level, against texts made to exhaust
// the stack.
#pragma once

#include <cstddef>

// The deepest nesting of arrays and objects that is handed to the JSON library.
inline constexpr int kDeepestJson = 256;

// Whether a text can be parsed without nesting deeper than kDeepestJson. Exact for JSON (RFC 8259).
// The library also takes texts that are not: from the first comment, single quote or broken escape
// on, every opening bracket counts as one more level.
bool is_shallow_json(const char* text, size_t length) noexcept;
