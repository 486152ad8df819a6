// SPDX-License-Identifier: Apache-2.0
//
// A fresh device for each test: a directory of its own, made current, with the folders that the
// host framework's installer lays out. The log is captured from the start.
#pragma once

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <filesystem>
#include <functional>
#include <string>
#include <vector>

#include "common/device.h"
#include "common/owned.h"
#include "tests/support/faults.h"

inline constexpr const char* kAdapterFolder = QOR_DEVICE_ROOT "/opt/usr/data/cloud-qor";
inline constexpr const char* kAdapterFile =
    QOR_DEVICE_ROOT "/opt/usr/data/cloud-qor/.qor-adapter-calendar.db";
inline constexpr const char* kHostFile = QOR_DEVICE_ROOT "/opt/usr/dbspace/.cloud_qor.db";

class DeviceTest : public ::testing::Test {
  protected:
    DeviceTest();
    ~DeviceTest() override;  // leaves and removes the directory

    const std::filesystem::path& directory() const { return directory_; }

    // The lines logged since the last call.
    static std::vector<LogLine> log() { return faults::take_log(); }

    // Iterates the default main context until done() or, at the latest, ten seconds. Answers
    // done().
    static bool run_until(const std::function<bool()>& done);

    // ---- The calendar, as the device's user works on it (the service must be connected) ----

    static Record new_record(const char* view_uri);
    static int insert(const Record& record);  // id; 0 when it failed
    static Record read(int id, const char* view_uri = _calendar_event._uri);  // null: no such one
    static int add_book(int account_id);
    static int newest_book();  // its id
    static int add_event(int book_id, const std::string& summary, int original_event_id = 0);
    static void set_text(int event_id, unsigned int property, const char* text);
    static std::string text(const Record& record, unsigned int property);  // "(null)" when unset
    static int number(const Record& record, unsigned int property);
    static int current_version();

    // ---- SQLite files ----

    // Runs statements on a file, creating it when absent; fails the test when SQLite does.
    static void run_sql(const char* file, const std::string& sql);
    // The result as text: columns joined by "|", lines by "\n", NULL as "(null)".
    static std::string query(const char* file, const std::string& sql);
    // Makes the host sync database know an item.
    static void add_cloud_key(int adapter_id, const std::string& cloud_key);

  private:
    std::filesystem::path directory_;
};
