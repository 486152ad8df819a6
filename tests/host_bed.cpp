// SPDX-License-Identifier: Apache-2.0
//
// A test bed for the host.
#include "tests/host_bed.h"

#include <fcntl.h>
#include <fmt/format.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <csignal>
#include <ctime>
#include <nlohmann/json.hpp>
#include <stdexcept>

#include "host/adapter/adapter_session.h"
#include "host/failure.h"
#include "host/sync/collect.h"
#include "host/sync/engine.h"

namespace bed {

namespace {

namespace fs = std::filesystem;

void check(int rc, const char* what) {
    if (rc != CALENDAR_ERROR_NONE) {
        throw std::runtime_error(fmt::format("{}: {}", what, rc));
    }
}

const qor::AdapterLibrary& library() {
    static const qor::AdapterLibrary loaded =
        qor::load_adapter(QOR_LIB_DIR "/libqor-adapter-calendar.so");
    return loaded;
}

class Record {
  public:
    explicit Record(const char* view) { check(calendar_record_create(view, &handle_), "create"); }
    explicit Record(int event) {
        check(calendar_db_get_record(_calendar_event._uri, event, &handle_), "get");
    }
    Record(const Record&) = delete;
    Record& operator=(const Record&) = delete;
    ~Record() { calendar_record_destroy(handle_, true); }
    calendar_record_h get() const { return handle_; }
    void set(unsigned int property, const std::string& text) {
        check(calendar_record_set_str(handle_, property, text.c_str()), "set text");
    }
    void set(unsigned int property, int value) {
        check(calendar_record_set_int(handle_, property, value), "set number");
    }
    void set(unsigned int property, calendar_time_s time) {
        check(calendar_record_set_caltime(handle_, property, time), "set time");
    }

  private:
    calendar_record_h handle_ = nullptr;
};

std::string text(calendar_record_h record, unsigned int property) {
    char* value = nullptr;
    check(calendar_record_get_str_p(record, property, &value), "get text");
    return value == nullptr ? std::string() : std::string(value);
}

int number(calendar_record_h record, unsigned int property) {
    int value = 0;
    check(calendar_record_get_int(record, property, &value), "get number");
    return value;
}

std::string time(calendar_record_h record, unsigned int property) {
    calendar_time_s value{};
    check(calendar_record_get_caltime(record, property, &value), "get time");
    const auto& date = value.time.date;
    return value.type == CALENDAR_TIME_UTIME
               ? std::to_string(value.time.utime)
               : fmt::format("{:04}-{:02}-{:02}", date.year, date.month, date.mday);
}

calendar_time_s to_time(long long seconds, bool all_day) {
    calendar_time_s value{};
    if (!all_day) {
        value.type = CALENDAR_TIME_UTIME;
        value.time.utime = seconds;
        return value;
    }
    const std::time_t at = seconds;
    std::tm date{};
    gmtime_r(&at, &date);
    value.type = CALENDAR_TIME_LOCALTIME;
    value.time.date.year = date.tm_year + 1900;
    value.time.date.month = date.tm_mon + 1;
    value.time.date.mday = date.tm_mday;
    return value;
}

void fill(Record& record, const NewEvent& event) {
    record.set(_calendar_event.summary, event.title);
    record.set(_calendar_event.start_time, to_time(event.start_s, event.all_day));
    record.set(_calendar_event.end_time, to_time(event.start_s + event.length_s, event.all_day));
    record.set(_calendar_event.start_tzid, event.zone);
    record.set(_calendar_event.end_tzid, event.zone);
    record.set(_calendar_event.freq, event.frequency);
    if (event.count > 0) {
        record.set(_calendar_event.range_type, CALENDAR_RANGE_COUNT);
        record.set(_calendar_event.count, event.count);
    } else if (event.until_s > 0) {
        record.set(_calendar_event.range_type, CALENDAR_RANGE_UNTIL);
        record.set(_calendar_event.until_time, to_time(event.until_s, event.all_day));
    }
    for (const int minutes : event.reminders) {
        calendar_record_h alarm = nullptr;
        check(calendar_record_create(_calendar_alarm._uri, &alarm), "create");
        check(calendar_record_set_int(alarm, _calendar_alarm.tick, minutes), "tick");
        check(calendar_record_set_int(alarm, _calendar_alarm.tick_unit, event.reminder_unit),
              "unit");
        check(calendar_record_add_child_record(record.get(), _calendar_event.calendar_alarm, alarm),
              "alarm");
    }
    if (event.parent > 0) {
        record.set(_calendar_event.original_event_id, event.parent);
    }
}

std::string reminders(calendar_record_h record) {
    int count = 0;
    check(calendar_record_get_child_record_count(record, _calendar_event.calendar_alarm, &count),
          "alarms");
    std::string result;
    for (int i = 0; i < count; ++i) {
        calendar_record_h alarm = nullptr;
        check(calendar_record_get_child_record_at_p(record, _calendar_event.calendar_alarm, i,
                                                    &alarm),
              "alarm");
        result += fmt::format(" -{}", number(alarm, _calendar_alarm.tick) *
                                          number(alarm, _calendar_alarm.tick_unit) / 60);
    }
    return result;
}

// Cancelled occurrences as a set: the list may name one twice, and blanks in it mean nothing.
std::string cancelled(const std::string& list) {
    std::vector<std::string> entries;
    std::string entry;
    for (const char c : list + ",") {
        if (c != ',' && c != ' ') {
            entry += c;
        } else if (!entry.empty()) {
            entries.push_back(std::exchange(entry, {}));
        }
    }
    std::sort(entries.begin(), entries.end());
    entries.erase(std::unique(entries.begin(), entries.end()), entries.end());
    return entries.empty() ? "" : fmt::format(" without {}", fmt::join(entries, " "));
}

std::string describe(calendar_record_h record) {
    const auto& e = _calendar_event;
    std::string line =
        fmt::format("{} {}-{} {}", text(record, e.summary), time(record, e.start_time),
                    time(record, e.end_time), text(record, e.start_tzid));
    if (const int freq = number(record, e.freq); freq != 0) {
        line +=
            fmt::format(" every {}x{} {}", number(record, e.interval), freq, text(record, e.byday));
        const int range = number(record, e.range_type);
        line += range == CALENDAR_RANGE_COUNT ? fmt::format(" {} times", number(record, e.count))
                : range == CALENDAR_RANGE_UNTIL
                    ? fmt::format(" until {}", time(record, e.until_time))
                    : "";
    }
    return line + reminders(record) + cancelled(text(record, e.exdate));
}

// One host, one process: an adapter keeps timers and handles beyond a session. What the work
// returns, the child's failures as exceptions.
std::string in_child(const std::function<std::string()>& work) {
    int ends[2];
    if (pipe(ends) != 0) {
        throw std::runtime_error("no pipe");
    }
    const pid_t child = fork();
    if (child == 0) {
        std::string result;
        try {
            result = "=" + work();
        } catch (const std::exception& error) {
            result = error.what();
        }
        for (std::size_t sent = 0; sent < result.size();) {
            const ssize_t n = write(ends[1], result.data() + sent, result.size() - sent);
            sent += n > 0 ? static_cast<std::size_t>(n) : result.size();
        }
        _exit(0);
    }
    close(ends[1]);
    std::string result;
    char buffer[4096];
    for (ssize_t n = 0; (n = read(ends[0], buffer, sizeof buffer)) > 0;) {
        result.append(buffer, static_cast<std::size_t>(n));
    }
    close(ends[0]);
    int status = 0;
    waitpid(child, &status, 0);
    if (!result.starts_with('=')) {
        throw std::runtime_error(fmt::format("host: {} (status {})", result, status));
    }
    return result.substr(1);
}

std::string to_text(const qor::SyncReport& report) {
    nlohmann::json json = {{"stopped", report.stopped}, {"entries", nlohmann::json::array()}};
    for (const qor::ReportEntry& entry : report.entries) {
        json["entries"].push_back(
            {qor::what_text(entry.what), entry.label, entry.key, entry.reason});
    }
    return json.dump();
}

qor::SyncReport from_text(const std::string& text) {
    const auto json = nlohmann::json::parse(text);
    qor::SyncReport report;
    report.stopped = json["stopped"];
    for (const auto& entry : json["entries"]) {
        report.entries.push_back(
            {qor::what_from_text(entry[0].get<std::string>()), entry[1], entry[2], entry[3]});
    }
    return report;
}

qor::CloudStore open_cloud(const std::string& path, const std::string& who) {
    qor::CloudOptions options;
    options.who = who;
    options.create = true;
    return qor::need(qor::CloudStore::open(path, options));
}

void each_event(const std::function<void(calendar_record_h)>& work) {
    calendar_query_h query = nullptr;
    calendar_list_h list = nullptr;
    check(calendar_query_create(_calendar_event._uri, &query), "query");
    check(calendar_db_get_records_with_query(query, 0, 0, &list), "events");
    calendar_record_h event = nullptr;
    for (int rc = calendar_list_first(list); rc == CALENDAR_ERROR_NONE;
         rc = calendar_list_next(list)) {
        check(calendar_list_get_current_record_p(list, &event), "event");
        work(event);
    }
    check(calendar_list_destroy(list, true), "list");
    check(calendar_query_destroy(query), "query");
}

}  // namespace

TestDevice::TestDevice(fs::path directory, std::string cloud_path)
    : directory_(std::move(directory)), cloud_path_(std::move(cloud_path)) {
    for (const char* folder : {"opt/usr/data/cloud-qor", "opt/usr/dbspace"}) {
        fs::create_directories(directory_ / folder);
    }
}

void TestDevice::visit(const std::function<void()>& work) {
    fs::current_path(directory_);
    check(calendar_connect(), "connect");
    work();
    check(calendar_disconnect(), "disconnect");
}

void TestDevice::with_database(const std::function<void(qor::HostDatabase&)>& work) {
    fs::current_path(directory_);
    qor::HostDatabase database = qor::HostDatabase::open(true);
    work(database);
}

void TestDevice::sign_in() {
    in_child([&] {
        with_database([&](qor::HostDatabase& database) {
            int account = 0;
            check(account_connect(), "account");
            check(account_insert("somebody", &account), "account");
            qor::CloudStore cloud = open_cloud(cloud_path_, directory_.filename());
            database.set(qor::setting::kAccountId, account);
            database.set(qor::setting::kAccountName, "somebody");
            database.set(qor::setting::kCloudPath, cloud_path_);
            qor::AdapterSession session(library(), account, true);
            const qor::SyncOptions options;
            qor::SyncReport report;
            qor::SyncContext context{session, cloud, database, options, report};
            qor::collect_device_changes(context, qor::calendar_version());
        });
        return std::string();
    });
}

qor::SyncReport TestDevice::sync(const qor::SyncOptions& options) {
    const std::string told = in_child([&] {
        qor::SyncReport report;
        with_database([&](qor::HostDatabase& database) {
            qor::CloudStore cloud = open_cloud(cloud_path_, directory_.filename());
            const int account = static_cast<int>(database.number(qor::setting::kAccountId));
            qor::AdapterSession session(library(), account, false);
            qor::SyncContext context{session, cloud, database, options, report};
            qor::run_sync(context);
        });
        return to_text(report);
    });
    return from_text(told);
}

bool TestDevice::sync_killed_at(int n) {
    const std::string program = QOR_BIN_DIR "/qor-host";
    const std::string device_path = directory_.string();
    const std::string preload = "LD_PRELOAD=" QOR_LIB_DIR "/libkill_at_write.so";
    const std::string at = "QOR_KILL_AT=" + std::to_string(n);
    const std::string sanitizer = "ASAN_OPTIONS=verify_asan_link_order=0:detect_leaks=0";
    const char* const arguments[] = {program.c_str(), "--device", device_path.c_str(),
                                     "sync",          "--json",   nullptr};
    const char* const environment[] = {preload.c_str(), at.c_str(), sanitizer.c_str(), nullptr};
    pid_t child = 0;
    posix_spawn_file_actions_t actions;
    posix_spawn_file_actions_init(&actions);
    posix_spawn_file_actions_addopen(&actions, 1, "/dev/null", O_WRONLY, 0);
    EXPECT_EQ(
        posix_spawn(&child, program.c_str(), &actions, nullptr, const_cast<char* const*>(arguments),
                    const_cast<char* const*>(environment)),
        0);
    posix_spawn_file_actions_destroy(&actions);
    int status = 0;
    waitpid(child, &status, 0);
    if (WIFEXITED(status)) {
        EXPECT_LE(WEXITSTATUS(status), 1);
        return false;
    }
    EXPECT_EQ(WTERMSIG(status), SIGKILL);
    return true;
}

int TestDevice::book() {
    calendar_query_h query = nullptr;
    calendar_list_h list = nullptr;
    check(calendar_query_create(_calendar_book._uri, &query), "query");
    check(calendar_db_get_records_with_query(query, 0, 1, &list), "books");
    calendar_record_h record = nullptr;
    check(calendar_list_get_current_record_p(list, &record), "book");
    const int id = number(record, _calendar_book.id);
    check(calendar_list_destroy(list, true), "list");
    check(calendar_query_destroy(query), "query");
    return id;
}

int TestDevice::add(const NewEvent& event) {
    int id = 0;
    visit([&] {
        Record record(_calendar_event._uri);
        record.set(_calendar_event.calendar_book_id, book());
        fill(record, event);
        check(calendar_db_insert_record(record.get(), &id), "insert");
    });
    return id;
}

void enter_title(int event, const std::string& title) {
    Record record(event);
    record.set(_calendar_event.summary, title);
    check(calendar_db_update_record(record.get()), "update");
}

void enter_cancellation(int event, const std::string& instant) {
    Record record(event);
    const std::string before = text(record.get(), _calendar_event.exdate);
    record.set(_calendar_event.exdate, before.empty() ? instant : before + "," + instant);
    check(calendar_db_update_record(record.get()), "update");
}

void TestDevice::set_title(int event, const std::string& title) {
    visit([&] { enter_title(event, title); });
}

void TestDevice::cancel_occurrence(int event, const std::string& instant) {
    visit([&] { enter_cancellation(event, instant); });
}

int TestDevice::move_occurrence(int event, const std::string& instant, const NewEvent& moved) {
    NewEvent exception = moved;
    exception.parent = event;
    const int id = add(exception);
    cancel_occurrence(event, instant);
    return id;
}

void TestDevice::remove(int event) {
    visit([&] { check(calendar_db_delete_record(_calendar_event._uri, event), "delete"); });
}

int TestDevice::find(const std::string& title) {
    int found = 0;
    visit([&] {
        each_event([&](calendar_record_h event) {
            if (text(event, _calendar_event.summary) == title) {
                found = number(event, _calendar_event.id);
            }
        });
    });
    return found;
}

void TestDevice::wipe_calendar() {
    for (const auto& entry : fs::directory_iterator(directory_ / "opt/usr/dbspace")) {
        if (entry.path().filename().string().starts_with(".calendar-service")) {
            fs::remove(entry.path());
        }
    }
}

std::vector<std::string> TestDevice::contents() {
    std::vector<std::string> lines;
    visit([&] { each_event([&](calendar_record_h event) { lines.push_back(describe(event)); }); });
    std::sort(lines.begin(), lines.end());
    return lines;
}

int TestDevice::version() {
    int version = 0;
    visit([&] { check(calendar_db_get_current_version(&version), "version"); });
    return version;
}

HostTest::HostTest() : before_(fs::current_path()) {
    // In memory where possible: durable commits would be most of a test's time.
    const fs::path memory = "/dev/shm";
    const fs::path parent = access(memory.c_str(), W_OK) == 0 ? memory : fs::temp_directory_path();
    std::string pattern = (parent / "qor-host-XXXXXX").string();
    if (mkdtemp(pattern.data()) == nullptr) {
        throw std::runtime_error("no directory for the test");
    }
    directory_ = pattern;
}

HostTest::~HostTest() {
    fs::current_path(before_);
    std::error_code ignored;  // a leftover directory is no fault of what was tested
    fs::remove_all(directory_, ignored);
}

TestDevice& HostTest::device(const std::string& name) {
    auto& device = devices_[name];
    if (!device) {
        device = std::make_unique<TestDevice>(directory_ / name, cloud_path());
        device->sign_in();
    }
    return *device;
}

qor::CloudStore HostTest::cloud() {
    return open_cloud(cloud_path(), "test");
}

void HostTest::put(const std::string& key, const std::string& text) {
    qor::CloudWrite write;
    write.key = key;
    write.text = text;
    write.deleted = text.empty();
    qor::need(cloud().write(write));
}

std::string HostTest::in_cloud(const std::string& key) {
    const auto found = qor::need(cloud().get(key));
    return found ? found->text : std::string();
}

std::int64_t HostTest::cloud_revision() {
    return qor::need(cloud().revision());
}

void HostTest::sync_all() {
    for (int round = 0; round < 2; ++round) {
        for (auto& [name, each] : devices_) {
            each->sync();
        }
    }
}

std::string document(const std::vector<std::pair<std::string, std::string>>& members,
                     const std::vector<int>& reminders) {
    nlohmann::ordered_json root = {{"EVENT", nlohmann::ordered_json::object()}};
    for (const auto& [key, value] : members) {
        root["EVENT"][key] = value;
    }
    for (const int minutes : reminders) {
        root["REMINDERS"].push_back({{"method", "1"}, {"minutes", std::to_string(minutes)}});
    }
    return root.dump();
}

std::vector<std::string> told(const qor::SyncReport& report) {
    std::vector<std::string> lines;
    for (const qor::ReportEntry& entry : report.entries) {
        const std::string title = entry.label.substr(0, entry.label.find(" ("));
        lines.push_back(fmt::format("{}: {}", qor::what_text(entry.what), title));
    }
    return lines;
}

}  // namespace bed
