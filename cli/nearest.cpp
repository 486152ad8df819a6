// SPDX-License-Identifier: Apache-2.0
#include "cli/nearest.h"

#include <algorithm>
#include <numeric>
#include <vector>

namespace qor {
namespace {

char lower(char c) {
    return c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c;
}

// Letters to insert, remove or replace to turn one text into the other.
std::size_t distance(std::string_view a, std::string_view b) {
    std::vector<std::size_t> row(b.size() + 1);
    std::iota(row.begin(), row.end(), std::size_t{0});
    for (std::size_t i = 1; i <= a.size(); ++i) {
        std::size_t diagonal = row[0];
        row[0] = i;
        for (std::size_t j = 1; j <= b.size(); ++j) {
            const std::size_t changed = diagonal + (lower(a[i - 1]) == lower(b[j - 1]) ? 0 : 1);
            diagonal = row[j];
            row[j] = std::min({changed, row[j] + 1, row[j - 1] + 1});
        }
    }
    return row[b.size()];
}

}  // namespace

void Nearest::offer(std::string_view candidate) {
    const std::size_t changes = distance(typed_, candidate);
    if (changes < best_distance_) {
        best_distance_ = changes;
        best_ = candidate;
    }
}

std::string Nearest::name() const {
    const std::size_t limit = std::max<std::size_t>(2, typed_.size() / 3);
    return best_distance_ <= limit ? best_ : std::string();
}

}  // namespace qor
