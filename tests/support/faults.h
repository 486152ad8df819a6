// SPDX-License-Identifier: Apache-2.0
//
// The fault layer: every function through which the adapter meets the device, SQLite, ICU, the JSON
// library and the allocator is wrapped at link time (-Wl,--wrap), so that a test can make its n-th
// call fail, and the log is captured on its way to the device. Thread safe.
#pragma once

#include <iosfwd>
#include <string>
#include <vector>

struct LogLine {
    std::string level;  // "Critical", "Warning" or "Info"
    std::string function;
    std::string text;
    bool operator==(const LogLine&) const = default;
};
std::ostream& operator<<(std::ostream& out, const LogLine& line);

inline LogLine critical(std::string function, std::string text) {
    return {"Critical", std::move(function), std::move(text)};
}
inline LogLine warning(std::string function, std::string text) {
    return {"Warning", std::move(function), std::move(text)};
}
inline LogLine info(std::string function, std::string text) {
    return {"Info", std::move(function), std::move(text)};
}

// Reached through a pointer, since a library under test that is loaded at run time carries a fault
// layer of its own: dlsym("qor_fault_control").
struct FaultControl {
    // The nth call (from 1) of a wrapped function fails, once; of any wrapped function for "".
    // Starts counting anew. With nth 0 nothing fails and calls are only counted.
    void (*fail)(const char* function, int nth);
    // Nothing fails any more.
    void (*clear)();
    // The function in which the armed failure has happened; null when it has not.
    const char* (*fired)();
    // Calls counted since fail().
    int (*calls)();
    // Hands each captured log line to the callback, oldest first, and forgets them.
    void (*take_log)(void (*line)(const char* level, const char* function, const char* text,
                                  void* user_data),
                     void* user_data);
};
extern "C" const FaultControl* qor_fault_control();

namespace faults {

std::vector<LogLine> take_log(const FaultControl* control = qor_fault_control());

inline void fail(const std::string& function, int nth = 1) {
    qor_fault_control()->fail(function.c_str(), nth);
}
inline void count(const std::string& function) {
    qor_fault_control()->fail(function.c_str(), 0);
}
inline void clear() {
    qor_fault_control()->clear();
}
inline bool fired() {
    return qor_fault_control()->fired() != nullptr;
}
inline int calls() {
    return qor_fault_control()->calls();
}

}  // namespace faults
