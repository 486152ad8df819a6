// SPDX-License-Identifier: Apache-2.0
//
// What the host's fallible functions return: a value, or an error with a kind to decide on and a
// message for people. Nothing is thrown across these interfaces.
#pragma once

#include <string>
#include <utility>
#include <variant>

namespace qor {

enum class ErrorKind {
    kInput,     // what the caller gave cannot be used; nothing is wrong with the store
    kMissing,   // the file does not exist, or cannot be made where it was asked for
    kForeign,   // the file is not a store, or was written by a newer program
    kReadOnly,  // no permission to write
    kLocked,    // another process held the lock for longer than the busy timeout
    kFull,      // the disk is full; what was being written was taken back
    kCorrupt,   // the file is damaged
    kOther,     // input/output errors, no memory
};

struct Error {
    ErrorKind kind = ErrorKind::kOther;
    std::string message;  // one line: what failed, on which file, what to do next
};

// A value or an error. value() and error() may only be called on the matching kind.
template <typename T>
class [[nodiscard]] Result {
  public:
    Result(T value) : held_(std::in_place_index<0>, std::move(value)) {}
    Result(Error error) : held_(std::in_place_index<1>, std::move(error)) {}

    bool ok() const { return held_.index() == 0; }
    explicit operator bool() const { return ok(); }

    T& value() & { return *std::get_if<0>(&held_); }
    const T& value() const& { return *std::get_if<0>(&held_); }
    T value() && { return std::move(*std::get_if<0>(&held_)); }  // no view of a temporary
    T& operator*() & { return value(); }
    const T& operator*() const& { return value(); }
    T operator*() && { return std::move(*this).value(); }
    T* operator->() { return &value(); }
    const T* operator->() const { return &value(); }
    const Error& error() const { return *std::get_if<1>(&held_); }

  private:
    std::variant<T, Error> held_;
};

// Success without a value.
struct Done {};
using Status = Result<Done>;

}  // namespace qor
