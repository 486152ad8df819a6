// SPDX-License-Identifier: Apache-2.0
//
// The name that was probably meant: the one that takes the fewest changed letters, case aside.
#pragma once

#include <cstddef>
#include <limits>
#include <string>
#include <string_view>

namespace qor {

class Nearest {
  public:
    explicit Nearest(std::string_view typed) : typed_(typed) {}

    void offer(std::string_view candidate);

    // The nearest of what was offered, or an empty text when none is near.
    std::string name() const;

  private:
    std::string typed_;
    std::string best_;
    std::size_t best_distance_ = std::numeric_limits<std::size_t>::max();
};

}  // namespace qor
