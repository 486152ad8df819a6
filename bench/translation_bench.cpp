// SPDX-License-Identifier: Apache-2.0
//
// Reading and writing a typical event document, each beside its floor: the calls of the JSON
// library, ICU, the C library and the calendar record that this document needs, one after the other
// and with their arguments known beforehand. What lies between the two is the adapter's own work.
// Prints the ratios and fails when one is above kLimit. On a machine with other work, run it with
// --benchmark_enable_random_interleaving=true.
#include <benchmark/benchmark.h>
#include <unicode/ustring.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <map>
#include <string>

#include "common/owned.h"
#include "data-sync/calendar/qor_adapter_data_sync_calendar_parser_event.h"

namespace {

constexpr double kLimit = 1.15;
constexpr int kRuns = 5;  // the best one counts
constexpr int64_t kStart = 1394875800;
constexpr char kZone[] = "Asia/Seoul";
constexpr char kDocument[] =
    R"({"EVENT":{"title":"Weekly planning","eventLocation":"Room 5, second floor",)"
    R"("description":"Bring the list of open points and last week's figures.",)"
    R"("eventStatus":"0","dtstart":"1394875800000","dtend":"1394879400000",)"
    R"("eventTimezone":"Asia/Seoul","accessLevel":"0","hasAlarm":"1",)"
    R"("rrule":"FREQ=WEEKLY;INTERVAL=1;BYDAY=MO,WE;WKST=MO;UNTIL=20141231T000000Z",)"
    R"("lastDate":"0","hasAttendeeData":"0","organizer":"A. Person",)"
    R"("longitude":"126977969","latitude":"37566535"},)"
    R"("REMINDERS":[{"method":"1","minutes":"15"},{"method":"1","minutes":"60"}]})";

const calendar_event_view& kEvent = _calendar_event;

Record new_event() {
    calendar_record_h record = nullptr;
    if (calendar_record_create(kEvent._uri, &record) != 0) {
        std::abort();
    }
    return Record(record);
}

Ucal open_calendar(const char* zone) {
    const Owned<UChar, std::free> text(
        static_cast<UChar*>(std::calloc(std::strlen(zone) + 1, sizeof(UChar))));
    u_uastrcpy(text.get(), zone);
    UErrorCode status = U_ZERO_ERROR;
    return Ucal(ucal_open(text.get(), u_strlen(text.get()), "en_US", UCAL_DEFAULT, &status));
}

// ---- Reading ------------------------------------------------------------------------------------

void read_text(JsonNode* node) {
    GValue value = G_VALUE_INIT;
    json_node_get_value(node, &value);
    benchmark::DoNotOptimize(json_node_get_value_type(node));
    const GText text(g_value_dup_string(&value));
    g_value_unset(&value);
}

void read_members(JsonNode* node) {
    JsonObjectIter members;
    const char* name = nullptr;
    JsonNode* member = nullptr;
    json_object_iter_init_ordered(&members, json_node_get_object(node));
    while (json_object_iter_next_ordered(&members, &name, &member) != FALSE) {
        if (json_node_get_node_type(member) == JSON_NODE_VALUE) {
            read_text(member);
        }
    }
}

void set_time(calendar_record_h record, unsigned int property, const char* text) {
    calendar_time_s time{};
    calendar_record_get_caltime(record, property, &time);
    time.time.utime = std::strtoll(text, nullptr, 10) / 1000;
    calendar_record_set_caltime(record, property, time);
}

void set_rule(calendar_record_h record) {
    const char* uri = nullptr;
    for (int part = 0; part < 6; ++part) {  // the rule and its five parts
        calendar_record_get_uri_p(record, &uri);
    }
    calendar_record_set_int(record, kEvent.interval, 1);
    calendar_record_set_int(record, kEvent.freq, CALENDAR_RECURRENCE_WEEKLY);
    calendar_record_set_int(record, kEvent.interval,
                            static_cast<int>(std::strtol("1", nullptr, 10)));
    calendar_record_set_str(record, kEvent.byday, "MO,WE");
    calendar_record_set_int(record, kEvent.wkst, CALENDAR_MONDAY);
    calendar_record_set_int(record, kEvent.range_type, CALENDAR_RANGE_UNTIL);
    char* zone = nullptr;
    calendar_time_s until{};
    calendar_record_get_str_p(record, kEvent.start_tzid, &zone);
    calendar_record_get_caltime(record, kEvent.start_time, &until);
    int fields[6];
    char separators[2];
    static_cast<void>(std::sscanf("20141231T000000Z", "%4d%2d%2d%c%2d%2d%2d%c", &fields[0],
                                  &fields[1], &fields[2], &separators[0], &fields[3], &fields[4],
                                  &fields[5], &separators[1]));
    fields[1] -= 1;  // ICU counts months from 0
    const Ucal calendar = open_calendar(kZone);
    const UCalendarDateFields kFields[] = {UCAL_YEAR,        UCAL_MONTH,  UCAL_DATE,
                                           UCAL_HOUR_OF_DAY, UCAL_MINUTE, UCAL_SECOND};
    for (int i = 0; i < 6; ++i) {
        ucal_set(calendar.get(), kFields[i], fields[i]);
    }
    UErrorCode status = U_ZERO_ERROR;
    until.time.utime = static_cast<int64_t>(ucal_getMillis(calendar.get(), &status) / 1000.0);
    calendar_record_set_caltime(record, kEvent.until_time, until);
}

void set_alarm(calendar_record_h record, const char* minutes) {
    calendar_record_h alarm = nullptr;
    calendar_record_create(_calendar_alarm._uri, &alarm);
    calendar_record_set_int(alarm, _calendar_alarm.tick,
                            static_cast<int>(std::strtol(minutes, nullptr, 10)));
    calendar_record_set_int(alarm, _calendar_alarm.tick_unit, CALENDAR_ALARM_TIME_UNIT_MINUTE);
    calendar_record_add_child_record(record, kEvent.calendar_alarm, alarm);
}

void set_place(calendar_record_h record, unsigned int property, const char* text) {
    const char* uri = nullptr;
    calendar_record_get_uri_p(record, &uri);
    calendar_record_set_double(record, property,
                               static_cast<double>(std::strtoll(text, nullptr, 10)) / 1000000.0);
}

void read_floor(calendar_record_h record) {
    const Parser parser(json_parser_new());
    json_parser_load_from_data(parser.get(), kDocument, sizeof kDocument - 1, nullptr);
    const MallocText name(strdup("root"));
    const Node root(json_node_copy(json_parser_get_root(parser.get())));
    JsonObject* const document = json_node_get_object(root.get());
    read_members(root.get());
    read_members(json_object_get_member(document, "EVENT"));
    JsonArray* const reminders = json_node_get_array(json_object_get_member(document, "REMINDERS"));
    for (guint i = 0; i < json_array_get_length(reminders); ++i) {
        read_members(json_array_get_element(reminders, i));
    }
    calendar_record_set_str(record, kEvent.summary, "Weekly planning");
    calendar_record_set_str(record, kEvent.location, "Room 5, second floor");
    calendar_record_set_str(record, kEvent.description,
                            "Bring the list of open points and last week's figures.");
    set_time(record, kEvent.start_time, "1394875800000");
    set_time(record, kEvent.end_time, "1394879400000");
    calendar_record_set_str(record, kEvent.start_tzid, kZone);
    calendar_record_set_str(record, kEvent.end_tzid, kZone);
    calendar_record_set_int(record, kEvent.sensitivity, 0);
    set_rule(record);
    calendar_record_set_str(record, kEvent.organizer_email, "A. Person");
    calendar_record_set_str(record, kEvent.organizer_name, "A. Person");
    set_place(record, kEvent.longitude, "126977969");
    set_place(record, kEvent.latitude, "37566535");
    set_alarm(record, "15");
    set_alarm(record, "60");
}

void read_document(calendar_record_h record) {
    calendar_adapter_row row{};
    row.record = record;
    if (_qor_calendar_parse_event_from_json(kDocument, 0, sizeof kDocument - 1, 0, &row) != 0) {
        std::abort();
    }
}

// ---- Writing ------------------------------------------------------------------------------------

void set_number(JsonObject* object, const char* name, long long number) {
    char text[256] = {};
    std::snprintf(text, sizeof text, "%lld", number);
    json_object_set_string_member(object, name, text);
}

void add_text(JsonObject* object, const char* name, calendar_record_h record,
              unsigned int property) {
    char* text = nullptr;
    calendar_record_get_str_p(record, property, &text);
    json_object_set_string_member(object, name, text);
}

void add_rule(JsonObject* object, calendar_record_h record) {
    const char* uri = nullptr;
    char* text = nullptr;
    int number = 0;
    calendar_time_s until{};
    char buffer[1024] = {};
    calendar_record_get_uri_p(record, &uri);
    calendar_record_get_int(record, kEvent.freq, &number);
    calendar_record_get_int(record, kEvent.interval, &number);
    for (unsigned int property = kEvent.bysecond; property <= kEvent.bysetpos; ++property) {
        calendar_record_get_str_p(record, property, &text);
    }
    calendar_record_get_int(record, kEvent.wkst, &number);
    calendar_record_get_int(record, kEvent.range_type, &number);
    calendar_record_get_caltime(record, kEvent.until_time, &until);
    const Ucal calendar = open_calendar("Etc/GMT");
    UErrorCode status = U_ZERO_ERROR;
    ucal_setMillis(calendar.get(), static_cast<double>(until.time.utime) * 1000.0, &status);
    int fields[6];
    const UCalendarDateFields kFields[] = {UCAL_YEAR,        UCAL_MONTH,  UCAL_DATE,
                                           UCAL_HOUR_OF_DAY, UCAL_MINUTE, UCAL_SECOND};
    for (int i = 0; i < 6; ++i) {
        fields[i] = ucal_get(calendar.get(), kFields[i], &status);
    }
    std::snprintf(buffer, sizeof buffer, "%04d%02d%02dT%02d%02d%02dZ", fields[0], fields[1] + 1,
                  fields[2], fields[3], fields[4], fields[5]);
    const MallocText instant(strdup(buffer));
    std::snprintf(buffer, sizeof buffer, "FREQ=WEEKLY;INTERVAL=%d;BYDAY=MO,WE;WKST=MO;UNTIL=%s", 1,
                  instant.get());
    const MallocText rule(strdup(buffer));
    json_object_set_string_member(object, "rrule", rule.get());
}

void add_reminder(JsonArray* reminders, calendar_record_h record, int index) {
    calendar_record_h alarm = nullptr;
    int tick = 0;
    int unit = 0;
    calendar_record_get_child_record_at_p(record, kEvent.calendar_alarm, index, &alarm);
    JsonObject* const element = json_object_new();
    json_object_set_string_member(element, "method", "1");
    calendar_record_get_int(alarm, _calendar_alarm.tick, &tick);
    calendar_record_get_int(alarm, _calendar_alarm.tick_unit, &unit);
    set_number(element, "minutes", tick);
    json_array_add_object_element(reminders, element);
}

void add_place(JsonObject* object, const char* name, calendar_record_h record,
               unsigned int property) {
    const char* uri = nullptr;
    double degrees = 0;
    char text[32] = {};
    calendar_record_get_uri_p(record, &uri);
    calendar_record_get_double(record, property, &degrees);
    std::snprintf(text, sizeof text, "%.6f", degrees);
    char* const point = std::strchr(text, '.');
    std::memmove(point, point + 1, std::strlen(point));
    const MallocText place(strdup(text));
    json_object_set_string_member(object, name, place.get());
}

GText write_floor(calendar_record_h record) {
    JsonObject* const event = json_object_new();
    calendar_time_s time{};
    int number = 0;
    add_text(event, "title", record, kEvent.summary);
    add_text(event, "eventLocation", record, kEvent.location);
    add_text(event, "description", record, kEvent.description);
    json_object_set_string_member(event, "eventStatus", "0");
    calendar_record_get_caltime(record, kEvent.start_time, &time);
    calendar_record_get_caltime(record, kEvent.end_time, &time);
    set_number(event, "dtstart", kStart * 1000);
    set_number(event, "dtend", time.time.utime * 1000);
    add_text(event, "eventTimezone", record, kEvent.start_tzid);
    json_object_set_string_member(event, "accessLevel", "0");
    calendar_record_get_int(record, kEvent.has_alarm, &number);
    set_number(event, "hasAlarm", number);
    JsonArray* const reminders = json_array_new();
    calendar_record_get_child_record_count(record, kEvent.calendar_alarm, &number);
    add_reminder(reminders, record, 0);
    add_reminder(reminders, record, 1);
    add_rule(event, record);
    json_object_set_string_member(event, "hasAttendeeData", "0");
    add_text(event, "organizer", record, kEvent.organizer_name);
    add_place(event, "longitude", record, kEvent.longitude);
    add_place(event, "latitude", record, kEvent.latitude);

    const Generator generator(json_generator_new());
    const Node node(json_node_new(JSON_NODE_OBJECT));
    JsonObject* const root = json_object_new();
    json_object_set_object_member(root, "EVENT", event);
    json_object_set_array_member(root, "REMINDERS", reminders);
    json_node_take_object(node.get(), root);
    json_generator_set_root(generator.get(), node.get());
    gsize length = 0;
    return GText(json_generator_to_data(generator.get(), &length));
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
BENCHMARK(bench_read<read_floor>)->Name("read/floor")->Repetitions(kRuns);
BENCHMARK(bench_write<write_document>)->Name("write")->Repetitions(kRuns);
BENCHMARK(bench_write<write_floor>)->Name("write/floor")->Repetitions(kRuns);

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
    read_floor(floor.get());
    const GText text = write_document(ours.get());
    return std::strcmp(text.get(), write_document(floor.get()).get()) == 0 &&
           std::strcmp(text.get(), write_floor(ours.get()).get()) == 0;
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
