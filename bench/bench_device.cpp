// SPDX-License-Identifier: Apache-2.0
#include "bench/bench_device.h"

#include <cstdio>
#include <cstdlib>
#include <ctime>

namespace fs = std::filesystem;

namespace {

constexpr char kAdapterFolder[] = "opt/usr/data/cloud-qor";
constexpr char kHostFolder[] = "opt/usr/dbspace";

double microseconds(clockid_t clock) {
    timespec time{};
    clock_gettime(clock, &time);
    return static_cast<double>(time.tv_sec) * 1e6 + static_cast<double>(time.tv_nsec) / 1e3;
}

}  // namespace

void require(bool worked, const char* what) {
    if (!worked) {
        std::fprintf(stderr, "bench: error: %s failed\n", what);
        std::exit(3);
    }
}

BenchDevice::BenchDevice() {
    std::string pattern = (fs::temp_directory_path() / "qor-bench.XXXXXX").string();
    require(mkdtemp(pattern.data()) != nullptr, "making a device directory");
    directory_ = pattern;
    fs::create_directories(directory_ / kAdapterFolder);
    fs::create_directories(directory_ / kHostFolder);
    fs::current_path(directory_);
}

BenchDevice::~BenchDevice() {
    fs::current_path("/");
    std::error_code ignored;  // a directory that stays is in nobody's way
    fs::remove_all(directory_, ignored);
}

std::string BenchDevice::adapter_file() const {
    return (directory_ / kAdapterFolder / ".qor-adapter-calendar.db").string();
}

Moment moment_now() {
    return {microseconds(CLOCK_PROCESS_CPUTIME_ID), microseconds(CLOCK_MONOTONIC)};
}
