// SPDX-License-Identifier: Apache-2.0
//
// Reading and writing a typical event document, each beside its floor: the calls of the JSON
// library, ICU, the C library and the calendar record that this document needs, one after the other
// and with their arguments known beforehand. What lies between the two is the adapter's own work.
// Prints the ratios and fails when one is above kLimit. On a machine with other work, run it with
// --benchmark_enable_random_interleaving=true.
#include <benchmark/benchmark.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <map>
#include <string>

#include "bench/document_floor.h"
#include "common/owned.h"
#include "data-sync/calendar/qor_adapter_data_sync_calendar_parser_event.h"

namespace {

constexpr double kLimit = 1.15;
constexpr int kRuns = 5;  // the best one counts

Record new_event() {
    calendar_record_h record = nullptr;
    if (calendar_record_create(_calendar_event._uri, &record) != 0) {
        std::abort();
    }
    return Record(record);
}

void read_document(calendar_record_h record) {
    calendar_adapter_row row{};
    row.record = record;
    if (_qor_calendar_parse_event_from_json(kFloorDocument, 0, sizeof kFloorDocument - 1, 0,
                                            &row) != 0) {
        std::abort();
    }
}

GText write_document(calendar_record_h record) {
    char* text = nullptr;
    size_t length = 0;
    if (_qor_calendar_parse_make_event_to_json(record, nullptr, &text, &length) != 0) {
        std::abort();
    }
    return GText(text);
}

// ---- Running ------------------------------------------------------------------------------------

template <void (*Read)(calendar_record_h)>
void bench_read(benchmark::State& state) {
    for (auto _ : state) {
        const Record record = new_event();
        Read(record.get());
    }
}

template <GText (*Write)(calendar_record_h)>
void bench_write(benchmark::State& state) {
    const Record record = new_event();
    read_document(record.get());
    for (auto _ : state) {
        benchmark::DoNotOptimize(Write(record.get()));
    }
}

BENCHMARK(bench_read<read_document>)->Name("read")->Repetitions(kRuns);
BENCHMARK(bench_read<read_document_floor>)->Name("read/floor")->Repetitions(kRuns);
BENCHMARK(bench_write<write_document>)->Name("write")->Repetitions(kRuns);
BENCHMARK(bench_write<write_document_floor>)->Name("write/floor")->Repetitions(kRuns);

// The console's lines, and the best time of each benchmark's repetitions.
class BestTimes : public benchmark::ConsoleReporter {
  public:
    void ReportRuns(const std::vector<Run>& runs) override {
        for (const Run& run : runs) {
            if (run.run_type == Run::RT_Iteration) {
                double& best = best_[run.run_name.function_name];
                const double time = run.GetAdjustedCPUTime();
                best = best == 0 ? time : std::min(best, time);
            }
        }
        ConsoleReporter::ReportRuns(runs);
    }

    // True as well when a filter has left the benchmark out.
    bool print_ratio(const std::string& name) {
        if (best_[name] == 0 || best_[name + "/floor"] == 0) {
            return true;
        }
        const double ratio = best_[name] / best_[name + "/floor"];
        std::printf("%s: %.3f of the floor (at most %.2f)\n", name.c_str(), ratio, kLimit);
        return ratio <= kLimit;
    }

  private:
    std::map<std::string, double> best_;
};

// The floor does the same work, or it measures something else.
bool is_same_work() {
    const Record ours = new_event();
    const Record floor = new_event();
    read_document(ours.get());
    read_document_floor(floor.get());
    const GText text = write_document(ours.get());
    return std::strcmp(text.get(), write_document(floor.get()).get()) == 0 &&
           std::strcmp(text.get(), write_document_floor(ours.get()).get()) == 0;
}

}  // namespace

int main(int argc, char** argv) {
    benchmark::Initialize(&argc, argv);
    if (!is_same_work()) {
        std::fprintf(stderr, "translation_bench: error: the floor gives another document\n");
        return 2;
    }
    BestTimes times;
    benchmark::RunSpecifiedBenchmarks(&times);
    const bool read = times.print_ratio("read");
    const bool write = times.print_ratio("write");
    return read && write ? 0 : 1;
}
