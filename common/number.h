// SPDX-License-Identifier: Apache-2.0
//
// Numbers as the documents carry them: decimal texts, and times that pass through a double. What
// does not fit stops at the limit of its type, so that no text makes an undefined conversion.
#pragma once

#include <algorithm>
#include <cstdint>
#include <cstdlib>
#include <limits>

// A base-10 text, read up to its first character that is not a digit: "2x" is 2, "" and "x" are 0.
inline int32_t to_int32(const char* text) noexcept {
    return static_cast<int32_t>(std::clamp<long>(std::strtol(text, nullptr, 10),
                                                 std::numeric_limits<int32_t>::min(),
                                                 std::numeric_limits<int32_t>::max()));
}

// Truncates toward zero.
inline int64_t to_int64(double value) noexcept {
    constexpr double kLimit = 9223372036854775808.0;  // 2^63, the first that does not fit
    if (value >= kLimit) {
        return std::numeric_limits<int64_t>::max();
    }
    return value >= -kLimit ? static_cast<int64_t>(value) : std::numeric_limits<int64_t>::min();
}

inline int64_t to_milliseconds(int64_t seconds) noexcept {
    return to_int64(static_cast<double>(seconds) * 1000.0);
}

inline int64_t to_seconds(int64_t milliseconds) noexcept {
    return to_int64(static_cast<double>(milliseconds) / 1000.0);
}
