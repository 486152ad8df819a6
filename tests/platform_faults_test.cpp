// SPDX-License-Identifier: Apache-2.0
//
// A calendar store that cannot be opened, read or written: a code of its own for each, nothing
// lost.
#include <sqlite3.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <unistd.h>

#include <csignal>
#include <filesystem>
#include <fstream>
#include <functional>
#include <string>

#include "tests/support/device_test.h"

namespace {

constexpr char kFolder[] = QOR_DEVICE_ROOT "/opt/usr/dbspace";
constexpr char kStore[] = QOR_DEVICE_ROOT "/opt/usr/dbspace/.calendar-service.db";

class PlatformFaults : public DeviceTest {
  protected:
    // A store with a book and an event, whose id is 1 each.
    static void make_store() {
        ASSERT_EQ(calendar_connect(), 0);
        ASSERT_EQ(add_event(add_book(1), "kept"), 1);
        ASSERT_EQ(calendar_disconnect(), 0);
    }

    static void overwrite(std::streamoff from) {
        std::fstream file(kStore, std::ios::in | std::ios::out | std::ios::binary);
        file.seekp(from);
        file << std::string(
            static_cast<size_t>(std::filesystem::file_size(kStore)) - static_cast<size_t>(from),
            '\xee');
    }
};

// For the superuser a read-only folder is none, so a test works as nobody meanwhile.
class AsNobody {
  public:
    AsNobody() { EXPECT_TRUE(geteuid() != 0 || seteuid(65534) == 0); }
    ~AsNobody() { EXPECT_EQ(seteuid(getuid()), 0); }
    AsNobody(const AsNobody&) = delete;
    AsNobody& operator=(const AsNobody&) = delete;
};

TEST_F(PlatformFaults, AStoreThatCannotBeOpenedIsACode) {
    const struct {
        const char* name;
        std::function<void()> damage;
    } cases[] = {
        {"no folder", [] { std::filesystem::remove_all(kFolder); }},
        {"a file for a folder",
         [] {
             std::filesystem::remove_all(kFolder);
             std::ofstream(kFolder) << "x";
         }},
        {"a folder for the store", [] { std::filesystem::create_directory(kStore); }},
        {"not a database", [] { std::ofstream(kStore) << std::string(5000, 'x'); }},
        {"a newer schema",
         [] {
             make_store();
             run_sql(kStore, "PRAGMA user_version = 2");
         }},
        {"damage behind the first page",
         [] {
             make_store();
             overwrite(4096);
         }},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.name);
        std::filesystem::remove_all(kFolder);
        std::filesystem::create_directories(kFolder);
        c.damage();
        EXPECT_EQ(calendar_connect(), CALENDAR_ERROR_DB_FAILED);
        int version = 0;
        EXPECT_EQ(calendar_db_get_current_version(&version), CALENDAR_ERROR_NOT_CONNECTED);
    }
    std::filesystem::remove_all(kFolder);
    std::filesystem::create_directories(kFolder);
    EXPECT_EQ(calendar_connect(), 0) << "a failed connect leaves nothing behind";
}

TEST_F(PlatformFaults, AReadOnlyStoreIsACode) {
    make_store();
    ASSERT_EQ(chmod(kStore, 0444), 0);
    ASSERT_EQ(chmod(kFolder, 0555), 0);
    ASSERT_EQ(chmod(".", 0755), 0);
    {
        const AsNobody nobody;
        EXPECT_EQ(calendar_connect(), CALENDAR_ERROR_DB_FAILED);
    }
    ASSERT_EQ(chmod(kFolder, 0755), 0);
    ASSERT_EQ(chmod(kStore, 0644), 0);
    EXPECT_EQ(calendar_connect(), 0);
    EXPECT_EQ(text(read(1), _calendar_event.summary), "kept");
}

// The limit stands in for a full disk: SQLite meets both in its writes.
TEST_F(PlatformFaults, AFullDiskRefusesTheWriteAndKeepsWhatWasThere) {
    make_store();
    ASSERT_EQ(calendar_connect(), 0);
    const int version = current_version();
    const Record event = new_record(_calendar_event._uri);
    ASSERT_EQ(calendar_record_set_int(event.get(), _calendar_event.calendar_book_id, 1), 0);
    ASSERT_EQ(calendar_record_set_str(event.get(), _calendar_event.description,
                                      std::string(1 << 20, 'x').c_str()),
              0);
    rlimit before{};
    ASSERT_EQ(getrlimit(RLIMIT_FSIZE, &before), 0);
    rlimit tight = before;
    tight.rlim_cur = 262144;
    ASSERT_NE(std::signal(SIGXFSZ, SIG_IGN), SIG_ERR);
    ASSERT_EQ(setrlimit(RLIMIT_FSIZE, &tight), 0);
    int id = -7;
    const int refused = calendar_db_insert_record(event.get(), &id);
    const int small = add_event(1, "fits");
    ASSERT_EQ(setrlimit(RLIMIT_FSIZE, &before), 0);
    ASSERT_NE(std::signal(SIGXFSZ, SIG_DFL), SIG_ERR);
    EXPECT_EQ(refused, CALENDAR_ERROR_FILE_NO_SPACE);
    EXPECT_EQ(id, -7);
    EXPECT_EQ(small, 2) << "the refused write left nothing";
    EXPECT_EQ(current_version(), version + 1);
    EXPECT_EQ(text(read(1), _calendar_event.summary), "kept");
    EXPECT_EQ(insert(event), 3);
}

TEST_F(PlatformFaults, AStoreLockedTooLongIsACode) {
    make_store();
    ASSERT_EQ(calendar_connect(), 0);
    sqlite3* db = nullptr;
    ASSERT_EQ(sqlite3_open(kStore, &db), SQLITE_OK);
    ASSERT_EQ(sqlite3_exec(db, "BEGIN IMMEDIATE", nullptr, nullptr, nullptr), SQLITE_OK);
    const int version = current_version();
    EXPECT_EQ(calendar_db_delete_record(_calendar_event._uri, 1), CALENDAR_ERROR_DB_LOCKED);
    EXPECT_EQ(text(read(1), _calendar_event.summary), "kept") << "readers are not kept out";
    EXPECT_EQ(current_version(), version);
    sqlite3_close(db);  // ends the transaction
    EXPECT_EQ(calendar_db_delete_record(_calendar_event._uri, 1), 0);
}

TEST_F(PlatformFaults, ASubscriptionWithoutItsFolderIsACode) {
    make_store();
    ASSERT_EQ(calendar_connect(), 0);
    std::filesystem::rename(kFolder, "gone");
    EXPECT_EQ(calendar_db_add_changed_cb(
                  _calendar_event._uri, [](const char*, void*) {}, nullptr),
              CALENDAR_ERROR_DB_FAILED);
    std::filesystem::rename("gone", kFolder);
    EXPECT_EQ(calendar_db_add_changed_cb(
                  _calendar_event._uri, [](const char*, void*) {}, nullptr),
              0);
}

}  // namespace
