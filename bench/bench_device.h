// SPDX-License-Identifier: Apache-2.0
//
// A fresh device directory for a benchmark, made current and removed at the end, and what it takes
// to measure on it.
#pragma once

#include <filesystem>
#include <string>

// Ends the program when a step that has to work does not.
void require(bool worked, const char* what);

class BenchDevice {
  public:
    BenchDevice();
    ~BenchDevice();
    BenchDevice(const BenchDevice&) = delete;
    BenchDevice& operator=(const BenchDevice&) = delete;

    const std::filesystem::path& directory() const { return directory_; }
    // Absolute, so that a second device's file can be opened as well.
    std::string adapter_file() const;

  private:
    std::filesystem::path directory_;
};

// CPU time of this process, user and system, and the time of day; in microseconds.
struct Moment {
    double cpu_us;
    double wall_us;
};
Moment moment_now();
