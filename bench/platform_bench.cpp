// SPDX-License-Identifier: Apache-2.0
//
// The calendar service with 10,000 events of one year in one book, in a fresh device directory:
// what an insert costs the disk and whether that grows with the number of events, how long a read
// and a change list take. A benchmark that misses its bound ends with an error.
#include <benchmark/benchmark.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <string>
#include <vector>

#include "bench/counters.h"
#include "platform/include/calendar_service.h"

namespace {

using Clock = std::chrono::steady_clock;

constexpr int kEvents = 10000;
constexpr int kBlock = 5;               // a recurring event, two exceptions of it, two plain events
constexpr int64_t kStart = 1767225600;  // 2026-01-01
constexpr int64_t kYear = 31'536'000;   // seconds
constexpr double kMostSyncsPerInsert = 1.05;  // with those of the log's checkpoints
constexpr double kMostReadUs = 100;
constexpr double kMostChangesMs = 100;

int book_id = 0;
bool missed_a_bound = false;
std::vector<int> recurring_ids;

void require(int rc, const char* what) {
    if (rc != CALENDAR_ERROR_NONE) {
        std::fprintf(stderr, "platform_bench: %s failed (%d)\n", what, rc);
        std::exit(3);
    }
}

void require_bound(benchmark::State& state, bool held, const char* missed) {
    if (!held) {
        missed_a_bound = true;
        state.SkipWithError(missed);
    }
}

double microseconds_since(Clock::time_point start) {
    return std::chrono::duration<double, std::micro>(Clock::now() - start).count();
}

double median(std::vector<double> values) {
    const auto middle = values.begin() + static_cast<std::ptrdiff_t>(values.size() / 2);
    std::nth_element(values.begin(), middle, values.end());
    return *middle;
}

void add_alarms(calendar_record_h event) {
    for (const int minutes : {10, 60}) {
        calendar_record_h alarm = nullptr;
        require(calendar_record_create(_calendar_alarm._uri, &alarm), "creating an alarm");
        require(calendar_record_set_int(alarm, _calendar_alarm.tick, minutes), "setting its tick");
        require(calendar_record_set_int(alarm, _calendar_alarm.tick_unit,
                                        CALENDAR_ALARM_TIME_UNIT_MINUTE),
                "setting its unit");
        require(calendar_record_add_child_record(event, _calendar_event.calendar_alarm, alarm),
                "adding an alarm");
    }
}

// The n-th event of the year, with two alarms.
int insert_event(int n, int parent_id) {
    calendar_record_h event = nullptr;
    calendar_time_s time{};
    int id = 0;
    time.time.utime = kStart + kYear / kEvents * n;
    require(calendar_record_create(_calendar_event._uri, &event), "creating an event");
    require(calendar_record_set_int(event, _calendar_event.calendar_book_id, book_id), "its book");
    require(calendar_record_set_int(event, _calendar_event.original_event_id, parent_id), "parent");
    require(calendar_record_set_str(event, _calendar_event.summary, "Weekly planning"), "summary");
    require(calendar_record_set_str(event, _calendar_event.location, "Room 4"), "location");
    require(calendar_record_set_str(event, _calendar_event.start_tzid, "Europe/Berlin"), "zone");
    require(calendar_record_set_caltime(event, _calendar_event.start_time, time), "start");
    time.time.utime += 3600;
    require(calendar_record_set_caltime(event, _calendar_event.end_time, time), "end");
    add_alarms(event);
    require(calendar_db_insert_record(event, &id), "inserting an event");
    require(calendar_record_destroy(event, true), "destroying an event");
    return id;
}

void insert_book() {
    calendar_record_h book = nullptr;
    require(calendar_record_create(_calendar_book._uri, &book), "creating a book");
    require(calendar_db_insert_record(book, &book_id), "inserting a book");
    require(calendar_record_destroy(book, true), "destroying a book");
}

void insert_year(benchmark::State& state) {
    std::vector<double> times;
    for ([[maybe_unused]] auto _ : state) {
        const Counts counts = counts_now();
        int parent = 0;
        for (int n = 0; n < kEvents; ++n) {
            const int place = n % kBlock;
            const Clock::time_point start = Clock::now();
            const int id = insert_event(n, place == 1 || place == 2 ? parent : 0);
            times.push_back(microseconds_since(start));
            if (place == 0) {
                parent = id;
                recurring_ids.push_back(id);
            }
        }
        const double syncs_per_insert =
            static_cast<double>((counts_now() - counts).syncs) / kEvents;
        state.counters["syncs_per_insert"] = syncs_per_insert;
        require_bound(state, syncs_per_insert <= kMostSyncsPerInsert,
                      "more than one disk sync per insert");
    }
    const auto thousand = std::min<std::ptrdiff_t>(1000, std::ssize(times));
    state.counters["median_us_of_first_1000"] = median({times.begin(), times.begin() + thousand});
    state.counters["median_us_of_last_1000"] = median({times.end() - thousand, times.end()});
}
BENCHMARK(insert_year)->Iterations(1)->Unit(benchmark::kMillisecond);

// A recurring event with two exceptions, two alarms each.
void get_record(benchmark::State& state) {
    std::vector<double> times;
    for ([[maybe_unused]] auto _ : state) {
        const int id = recurring_ids[times.size() * 7919 % recurring_ids.size()];
        calendar_record_h event = nullptr;
        const Clock::time_point start = Clock::now();
        require(calendar_db_get_record(_calendar_event._uri, id, &event), "reading an event");
        times.push_back(microseconds_since(start));
        require(calendar_record_destroy(event, true), "destroying an event");
    }
    const double middle = median(times);
    state.counters["median_us"] = middle;
    require_bound(state, middle < kMostReadUs, "reading an event takes too long");
}
BENCHMARK(get_record)->Iterations(5000)->Unit(benchmark::kMicrosecond);

void get_changes(benchmark::State& state) {
    std::vector<double> times;
    int count = 0;
    for ([[maybe_unused]] auto _ : state) {
        calendar_list_h list = nullptr;
        int version = 0;
        const Clock::time_point start = Clock::now();
        require(
            calendar_db_get_changes_by_version(_calendar_event._uri, book_id, 0, &list, &version),
            "listing the changes");
        times.push_back(microseconds_since(start));
        require(calendar_list_get_count(list, &count), "counting the changes");
        require(calendar_list_destroy(list, true), "destroying the list");
    }
    const double longest_ms = *std::max_element(times.begin(), times.end()) / 1000;
    state.counters["changes"] = count;
    state.counters["longest_ms"] = longest_ms;
    require_bound(state, longest_ms < kMostChangesMs, "the change list takes too long");
}
BENCHMARK(get_changes)->Iterations(50)->Unit(benchmark::kMillisecond);

}  // namespace

int main(int argc, char** argv) {
    benchmark::Initialize(&argc, argv);
    std::string directory = (std::filesystem::temp_directory_path() / "qor-bench.XXXXXX").string();
    if (mkdtemp(directory.data()) == nullptr) {
        std::perror("platform_bench: making a device directory");
        return 3;
    }
    std::filesystem::current_path(directory);
    std::filesystem::create_directories(QOR_DEVICE_ROOT "/opt/usr/dbspace");
    require(calendar_connect(), "connecting");
    insert_book();
    benchmark::RunSpecifiedBenchmarks();
    require(calendar_disconnect(), "disconnecting");
    std::filesystem::current_path("/");
    std::filesystem::remove_all(directory);
    return missed_a_bound ? 1 : 0;
}
