// SPDX-License-Identifier: Apache-2.0
//
// What ends a command of the host. Inside the host failures are thrown; main() turns one into a
// message and the exit status 3. Failures of single items are results, never thrown.
#pragma once

#include <stdexcept>
#include <string>

#include "host/result.h"

namespace qor {

// One line: what failed, on what, what to do next.
class Failure : public std::runtime_error {
  public:
    using std::runtime_error::runtime_error;
};

// The value, or the error thrown.
template <typename T>
T need(Result<T> result) {
    if (!result) {
        throw Failure(result.error().message);
    }
    return std::move(result.value());
}

}  // namespace qor
