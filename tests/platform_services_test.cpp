// SPDX-License-Identifier: Apache-2.0
//
// The smaller services of the device: accounts, opening databases, logging.
#include <fcntl.h>
#include <sqlite3.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <string>
#include <thread>
#include <vector>

#include "tests/support/device_test.h"

// The service's own, without the fault layer between.
extern "C" __attribute__((format(printf, 4, 5))) int __real___dlog_print(int log_id, int priority,
                                                                         const char* tag,
                                                                         const char* format, ...);

namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::MatchesRegex;

class PlatformServices : public DeviceTest {
  protected:
    ~PlatformServices() override { unsetenv("QOR_LOG"); }

    static std::vector<std::string> user_names() {
        std::vector<std::string> names;
        EXPECT_EQ(account_foreach_account_from_db(
                      [](account_h account, void* user_data) {
                          char* name = nullptr;
                          int id = 0;
                          EXPECT_EQ(account_get_user_name(account, &name), 0);
                          EXPECT_EQ(account_get_account_id(account, &id), 0);
                          const MallocText owner(name);
                          static_cast<std::vector<std::string>*>(user_data)->push_back(
                              std::to_string(id) + name);
                          return std::string(name) != "stop";
                      },
                      &names),
                  0);
        return names;
    }

    static std::vector<std::string> lines(const char* file) {
        std::ifstream stream(file);
        std::vector<std::string> result;
        for (std::string line; std::getline(stream, line);) {
            result.push_back(line);
        }
        return result;
    }
};

TEST_F(PlatformServices, AccountsAreKeptInTheOrderOfTheirIds) {
    int id = 0;
    EXPECT_EQ(account_insert("ann", &id), ACCOUNT_ERROR_NOT_CONNECTED);
    EXPECT_EQ(account_disconnect(), ACCOUNT_ERROR_NOT_CONNECTED);
    ASSERT_EQ(account_connect(), 0);
    EXPECT_THAT(user_names(), IsEmpty());
    EXPECT_EQ(account_insert("zoe", &id), 0);
    EXPECT_EQ(id, 1);
    EXPECT_EQ(account_insert("ann", &id), 0);
    EXPECT_EQ(id, 2);
    EXPECT_EQ(account_insert("zoe", &id), 0);
    EXPECT_EQ(id, 1) << "known already";
    EXPECT_THAT(user_names(), ElementsAre("1zoe", "2ann"));
    EXPECT_EQ(account_delete(2), 0);
    EXPECT_EQ(account_delete(2), ACCOUNT_ERROR_NO_DATA);
    EXPECT_EQ(account_insert("stop", nullptr), 0);
    EXPECT_EQ(account_insert("unseen", nullptr), 0);
    EXPECT_THAT(user_names(), ElementsAre("1zoe", "3stop")) << "the callback ended it";
    for (const int result :
         {account_insert("", &id), account_insert(nullptr, &id),
          account_foreach_account_from_db(nullptr, nullptr),
          account_get_user_name(nullptr, nullptr), account_get_account_id(nullptr, &id)}) {
        EXPECT_EQ(result, ACCOUNT_ERROR_INVALID_PARAMETER);
    }
    EXPECT_EQ(account_disconnect(), 0);
    std::filesystem::remove_all(QOR_DEVICE_ROOT "/opt/usr/dbspace");
    EXPECT_EQ(account_connect(), ACCOUNT_ERROR_DB_FAILED);
    std::filesystem::create_directories(QOR_DEVICE_ROOT "/opt/usr/dbspace/.account-service.db");
    EXPECT_EQ(account_connect(), ACCOUNT_ERROR_DB_FAILED);
}

TEST_F(PlatformServices, DatabasesOpenWithABusyTimeout) {
    sqlite3* db = nullptr;
    ASSERT_EQ(db_util_open("new.db", &db, 0), SQLITE_OK);
    EXPECT_EQ(sqlite3_exec(db, "CREATE TABLE t(a)", nullptr, nullptr, nullptr), SQLITE_OK);
    int timeout = 0;
    const auto read_timeout = [](void* out, int, char** values, char**) {
        *static_cast<int*>(out) = std::atoi(values[0]);
        return 0;
    };
    EXPECT_EQ(sqlite3_exec(db, "PRAGMA busy_timeout", read_timeout, &timeout, nullptr), SQLITE_OK);
    EXPECT_EQ(timeout, 5000);
    EXPECT_EQ(db_util_close(db), SQLITE_OK);
    EXPECT_EQ(query("new.db", "SELECT name FROM sqlite_master"), "t");
    const struct {
        const char* path;
        int option;
        int expected;
    } cases[] = {{"missing/new.db", 0, SQLITE_CANTOPEN},
                 {".", 0, SQLITE_CANTOPEN},
                 {"", 0, SQLITE_MISUSE},
                 {nullptr, 0, SQLITE_MISUSE},
                 {"new.db", 1, SQLITE_MISUSE}};
    for (const auto& c : cases) {
        db = reinterpret_cast<sqlite3*>(&timeout);
        EXPECT_EQ(db_util_open(c.path, &db, c.option), c.expected) << (c.path ? c.path : "null");
        EXPECT_EQ(db, nullptr);
    }
    EXPECT_EQ(db_util_open("new.db", nullptr, 0), SQLITE_MISUSE);
}

TEST_F(PlatformServices, ALogLineHasTimePriorityAndTagAndNoColourInAFile) {
    setenv("QOR_LOG", "log", 1);
    EXPECT_EQ(__real___dlog_print(2, DLOG_ERROR, "TAG", "%s", "\033[0;31m* red *\033[0;m end"), 23);
    EXPECT_EQ(__real___dlog_print(2, DLOG_WARN, "TAG", "two\nlines\r"), 10);
    EXPECT_EQ(__real___dlog_print(2, DLOG_INFO, "TAG", "no colour: \033[2J \033[1"), 19);
    EXPECT_EQ(__real___dlog_print(2, 9, nullptr, "%s", std::string(5000, 'x').c_str()), 5000);
    setenv("QOR_LOG", "other", 1);
    EXPECT_EQ(__real___dlog_print(2, DLOG_INFO, "TAG", "elsewhere"), 9);
    setenv("QOR_LOG", "off", 1);
    EXPECT_EQ(__real___dlog_print(2, DLOG_INFO, "TAG", "%d", 12345), 5);
    unsetenv("QOR_LOG");
    EXPECT_EQ(__real___dlog_print(2, DLOG_INFO, "TAG", "%d", 12345), 5);
    setenv("QOR_LOG", "missing/log", 1);
    EXPECT_EQ(__real___dlog_print(2, DLOG_INFO, "TAG", "lost"), -ENOENT);
    EXPECT_EQ(__real___dlog_print(2, DLOG_INFO, "TAG", nullptr), -EINVAL);
    const std::string time = "[0-9]+-[0-9][0-9]-[0-9][0-9] [0-9:]+\\.[0-9][0-9][0-9] ";
    EXPECT_THAT(lines("log"),
                ElementsAre(MatchesRegex(time + "E TAG: \\* red \\* end"),
                            MatchesRegex(time + "W TAG: two lines "),
                            MatchesRegex(time + "I TAG: no colour: \033\\[2J \033\\[1"),
                            MatchesRegex(time + "\\? : x+")));
    EXPECT_EQ(lines("log").back().size() - lines("log").back().find('x'), 5000U);
    EXPECT_THAT(lines("other"), ElementsAre(MatchesRegex(".*I TAG: elsewhere")));
}

TEST_F(PlatformServices, ALogLineKeepsItsColourOnATerminal) {
    const int terminal = posix_openpt(O_RDWR | O_NOCTTY);
    ASSERT_GE(terminal, 0);
    ASSERT_EQ(grantpt(terminal), 0);
    ASSERT_EQ(unlockpt(terminal), 0);
    setenv("QOR_LOG", ptsname(terminal), 1);
    EXPECT_EQ(__real___dlog_print(2, DLOG_ERROR, "TAG", "\033[0;31mred\033[0;m"), 15);
    char buffer[200] = {};
    EXPECT_GT(::read(terminal, buffer, sizeof buffer - 1), 0);
    EXPECT_THAT(buffer, ::testing::HasSubstr("E TAG: \033[0;31mred\033[0;m"));
    setenv("QOR_LOG", "log", 1);
    EXPECT_EQ(__real___dlog_print(2, DLOG_ERROR, "TAG", "lets the terminal go"), 20);
    close(terminal);
}

TEST_F(PlatformServices, LogLinesOfSeveralThreadsNeverMix) {
    setenv("QOR_LOG", "log", 1);
    std::vector<std::thread> threads;
    for (const char letter : {'a', 'b', 'c'}) {
        threads.emplace_back([letter] {
            const std::string message(300, letter);
            for (int i = 0; i < 100; ++i) {
                EXPECT_EQ(__real___dlog_print(2, DLOG_INFO, "TAG", "%s", message.c_str()), 300);
            }
        });
    }
    for (std::thread& thread : threads) {
        thread.join();
    }
    const std::vector<std::string> all = lines("log");
    EXPECT_EQ(all.size(), 300U);
    for (const std::string& line : all) {
        EXPECT_EQ(line.find_last_not_of(line.back()) + 301, line.size()) << line;
    }
}

}  // namespace
