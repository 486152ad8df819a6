// SPDX-License-Identifier: Apache-2.0
//
// A test bed for the host: devices (directories) that share one cloud file, driven through the real
// adapter library. What the device's user does goes through the calendar service.
#pragma once

#include <gtest/gtest.h>
#include <qor_platform.h>

#include <filesystem>
#include <functional>
#include <map>
#include <memory>
#include <string>
#include <vector>

#include "host/adapter/adapter_library.h"
#include "host/cloud/cloud_store.h"
#include "host/database/host_database.h"
#include "host/sync/context.h"

namespace bed {

// A new event as a user makes it. Times are UTC seconds; all-day events are whole UTC days.
struct NewEvent {
    std::string title = "event";
    long long start_s = 1767625200;  // 2026-01-05 15:00 UTC
    long long length_s = 3600;
    std::string zone = "Europe/Berlin";
    bool all_day = false;
    int frequency = 0;  // calendar_recurrence_frequency_e
    int count = 0;      // of occurrences; 0: see until_s
    long long until_s = 0;
    std::vector<int> reminders{};  // minutes
    int reminder_unit = 60;
    int parent = 0;
};

class TestDevice {
  public:
    TestDevice(std::filesystem::path directory, std::string cloud_path);

    void sign_in();
    qor::SyncReport sync(const qor::SyncOptions& options = {});

    // Runs the program, killed at its n-th write; false when it came to its end before.
    bool sync_killed_at(int n);

    // ---- The user's hands; each works on the account's calendar ----
    int add(const NewEvent& event);
    void set_title(int event, const std::string& title);
    // Enters an occurrence into the series' list of cancelled ones.
    void cancel_occurrence(int event, const std::string& instant);
    // The same, and an event of its own in its place.
    int move_occurrence(int event, const std::string& instant, const NewEvent& moved);
    void remove(int event);
    int find(const std::string& title);  // 0: there is none
    void wipe_calendar();                // the store's files, as a factory reset does

    // Everything that a user sees, one line per event, in order: what two devices that agree have
    // in common.
    std::vector<std::string> contents();
    int version();

    // Runs something in the device's directory, connected to the calendar service.
    void visit(const std::function<void()>& work);
    // Runs something with the host database open.
    void with_database(const std::function<void(qor::HostDatabase&)>& work);

    const std::filesystem::path& directory() const { return directory_; }

  private:
    int book();
    std::filesystem::path directory_;
    std::string cloud_path_;
};

// What the user does on the device that the process is at, connected to its calendar service: while
// a sync runs.
void enter_title(int event, const std::string& title);
void enter_cancellation(int event, const std::string& instant);

class HostTest : public ::testing::Test {
  protected:
    HostTest();
    ~HostTest() override;

    TestDevice& device(const std::string& name);  // signed in
    qor::CloudStore cloud();
    void put(const std::string& key, const std::string& text);  // as another host does
    std::string in_cloud(const std::string& key);               // empty when deleted or never there
    std::int64_t cloud_revision();
    void sync_all();  // until every device has everything

    const std::filesystem::path& directory() const { return directory_; }
    std::string cloud_path() const { return (directory_ / "cloud.db").string(); }

  private:
    std::filesystem::path directory_;
    std::filesystem::path before_;
    std::map<std::string, std::unique_ptr<TestDevice>> devices_;
};

// A document with these members of "EVENT", given as "key", "value" pairs.
std::string document(const std::vector<std::pair<std::string, std::string>>& members,
                     const std::vector<int>& reminders = {});

// The report's entries as "what: title", without times.
std::vector<std::string> told(const qor::SyncReport& report);

}  // namespace bed
