// SPDX-License-Identifier: Apache-2.0
//
// How much an action leaves on the heap, also under a sanitizer.
#pragma once

#include <malloc.h>

#include <cstddef>

#if defined(__has_feature)
#if __has_feature(address_sanitizer) || __has_feature(thread_sanitizer)
#include <sanitizer/allocator_interface.h>
#define QOR_SANITIZED_HEAP 1
#endif
#endif

#ifdef QOR_SANITIZED_HEAP
inline constexpr bool kIsSanitized = true;
inline size_t heap_in_use() {
    return __sanitizer_get_current_allocated_bytes();
}
#else
inline constexpr bool kIsSanitized = false;
inline size_t heap_in_use() {
    return mallinfo2().uordblks;
}
#endif

// Bytes by which the heap grows per run of the action, once caches are warm: 0, or what an
// allocation takes at least. What the allocator keeps at hand for the next one varies, and is left
// out.
template <typename Action>
std::ptrdiff_t heap_growth(const Action& action) {
    constexpr int kRuns = kIsSanitized ? 20 : 200;
    constexpr std::ptrdiff_t kSmallest = 16;
    for (int i = 0; i < kRuns; ++i) {
        action();
    }
    const size_t before = heap_in_use();
    for (int i = 0; i < kRuns; ++i) {
        action();
    }
    const auto grown = static_cast<std::ptrdiff_t>(heap_in_use() - before);
    return grown / kRuns >= kSmallest ? grown / kRuns : 0;
}
