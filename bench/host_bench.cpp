// SPDX-License-Identifier: Apache-2.0
//
// Whole syncs of the reference host, as its user sees them: each is a run of qor-host, measured
// from its start to its end. Prints one table; exits 1 when a sync with nothing to do wrote
// anything.
#include <fmt/format.h>
#include <qor_platform.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <string>
#include <vector>

#include "bench/bench_device.h"

namespace {

constexpr int kSizes[] = {1000, 5000};
constexpr int64_t kFirstStart = 1767603600;  // 2026-01-05 09:00 UTC
constexpr int64_t kHour = 3600;

struct Cost {
    double wall_s = 0;
    double cpu_s = 0;
    double peak_mb = 0;
};

double seconds(const timeval& time) {
    return static_cast<double>(time.tv_sec) + static_cast<double>(time.tv_usec) / 1e6;
}

// Runs one of our programs, its output dropped.
Cost run(const std::string& program, std::vector<std::string> arguments) {
    const std::string path = QOR_BIN_DIR "/" + program;
    std::vector<char*> argv = {const_cast<char*>(path.c_str())};
    for (std::string& argument : arguments) {
        argv.push_back(argument.data());
    }
    argv.push_back(nullptr);
    const Moment start = moment_now();
    const pid_t child = fork();
    if (child == 0) {
        static_cast<void>(freopen("/dev/null", "w", stdout));
        execv(path.c_str(), argv.data());
        _exit(127);
    }
    int status = 0;
    rusage usage{};
    require(child > 0 && wait4(child, &status, 0, &usage) == child && status == 0, path.c_str());
    return {(moment_now().wall_us - start.wall_us) / 1e6,
            seconds(usage.ru_utime) + seconds(usage.ru_stime),
            static_cast<double>(usage.ru_maxrss) / 1024};
}

Cost sync(const std::string& device) {
    return run("qor-host", {"--device", device, "sync"});
}

void sign_in(const std::string& device, const std::string& cloud) {
    run("qor-host", {"--device", device, "--cloud", cloud, "sign-in", "bench"});
}

void print(int events, const char* what, const Cost& cost) {
    fmt::print("{:>6}  {:<34}{:>9.3f}{:>9.3f}{:>8.1f}{:>10.2f}\n", events, what, cost.wall_s,
               cost.cpu_s, cost.peak_mb, cost.wall_s * 1000 / events);
    std::fflush(stdout);
}

void write_calendar(const char* file, int events) {
    std::ofstream out(file);
    out << "BEGIN:VCALENDAR\r\nVERSION:2.0\r\nPRODID:-//bench//EN\r\n";
    for (int i = 0; i < events; ++i) {
        out << fmt::format(
            "BEGIN:VEVENT\r\nUID:bench-{0}\r\nDTSTAMP:20260101T000000Z\r\nSUMMARY:Event {0}\r\n"
            "DTSTART:2026{1:02}{2:02}T{3:02}0000Z\r\nDURATION:PT1H\r\nLOCATION:Room {4}\r\n{5}"
            "BEGIN:VALARM\r\nACTION:DISPLAY\r\nDESCRIPTION:x\r\nTRIGGER:-PT15M\r\nEND:VALARM\r\n"
            "END:VEVENT\r\n",
            i, 1 + i % 12, 1 + i % 28, i % 24, i % 7,
            i % 5 == 0 ? "RRULE:FREQ=WEEKLY;COUNT=10\r\n" : "");
    }
    out << "END:VCALENDAR\r\n";
}

// Works on a device's calendar as its user does, directly through its service.
template <typename Work>
void on_device(const std::string& device, Work work) {
    const std::filesystem::path back = std::filesystem::current_path();
    std::filesystem::current_path(device);
    require(calendar_connect() == 0, "connecting to the calendar");
    work();
    require(calendar_disconnect() == 0, "leaving the calendar");
    std::filesystem::current_path(back);
}

void add_events(int events) {
    for (int i = 0; i < events; ++i) {
        calendar_record_h event = nullptr;
        require(calendar_record_create(_calendar_event._uri, &event) == 0, "making an event");
        calendar_time_s start{};
        start.time.utime = kFirstStart + i * kHour;
        calendar_time_s end = start;
        end.time.utime += kHour;
        const std::string title = fmt::format("Event {}", i);
        require(calendar_record_set_int(event, _calendar_event.calendar_book_id, 1) == 0 &&
                    calendar_record_set_str(event, _calendar_event.summary, title.c_str()) == 0 &&
                    calendar_record_set_caltime(event, _calendar_event.start_time, start) == 0 &&
                    calendar_record_set_caltime(event, _calendar_event.end_time, end) == 0 &&
                    calendar_db_insert_record(event, nullptr) == 0,
                "adding an event");
        calendar_record_destroy(event, true);
    }
}

void edit_every_hundredth(int events) {
    for (int id = 1; id <= events; id += 100) {
        calendar_record_h event = nullptr;
        require(calendar_db_get_record(_calendar_event._uri, id, &event) == 0 &&
                    calendar_record_set_str(event, _calendar_event.location, "Elsewhere") == 0 &&
                    calendar_db_update_record(event) == 0,
                "editing an event");
        calendar_record_destroy(event, true);
    }
}

// A sync with nothing to do leaves the cloud's file as it is.
bool idle(int events, const std::string& device) {
    const auto before = std::filesystem::last_write_time("cloud.db");
    print(events, "nothing to do", sync(device));
    return std::filesystem::last_write_time("cloud.db") == before;
}

bool measure(int events) {
    const BenchDevice workspace;
    write_calendar("calendar.ics", events);
    print(events, "import of the .ics file",
          run("qor-cloud", {"--cloud", "cloud.db", "import", "calendar.ics"}));
    sign_in("A", "cloud.db");
    print(events, "first sync, cloud to device", sync("A"));
    const bool quiet = idle(events, "A");
    on_device("A", [&] { edit_every_hundredth(events); });
    print(events, "1% changed on the device", sync("A"));
    sign_in("B", "other.db");
    on_device("B", [&] { add_events(events); });
    print(events, "first sync, device to cloud", sync("B"));
    return quiet;
}

}  // namespace

int main() {
    fmt::print("{:>6}  {:<34}{:>9}{:>9}{:>8}{:>10}\n", "EVENTS", "WHAT", "WALL s", "CPU s",
               "PEAK MB", "ms/EVENT");
    std::fflush(stdout);  // before a child inherits what is buffered
    bool quiet = true;
    for (const int events : kSizes) {
        quiet = measure(events) && quiet;
    }
    if (!quiet) {
        std::fprintf(stderr, "host_bench: a sync with nothing to do wrote to the cloud\n");
        return 1;
    }
    return 0;
}
