// SPDX-License-Identifier: Apache-2.0
//
// The cloud store: revisions, conditional writes, the change feed, the log, damaged files, and
// several processes at once.
#include "host/cloud/cloud_store.h"

#include <gtest/gtest.h>
#include <poll.h>
#include <sqlite3.h>
#include <sys/inotify.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <csignal>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <set>

#include "host/cloud/cloud_keys.h"

namespace qor {
namespace {

namespace fs = std::filesystem;
using Write = CloudWrite;

std::string event(const std::string& title, const std::string& more = "") {
    return R"({"EVENT":{"title":")" + title + "\"" + more + "}}";
}

class CloudStoreTest : public ::testing::Test {
  protected:
    void SetUp() override {
        std::string pattern = (fs::temp_directory_path() / "qor-cloud-XXXXXX").string();
        ASSERT_NE(mkdtemp(pattern.data()), nullptr);
        folder_ = pattern;
        file_ = (folder_ / "cloud.db").string();
    }
    void TearDown() override { fs::remove_all(folder_); }

    Result<CloudStore> try_open(bool create = true) {
        return CloudStore::open(file_, {.who = "A", .create = create, .busy_timeout_ms = 200});
    }
    CloudStore open_store(const std::string& who = "A") {
        return *CloudStore::open(file_, {.who = who, .create = true});
    }

    fs::path folder_;
    std::string file_;
};

TEST_F(CloudStoreTest, WritesHappenOnlyWhereTheirExpectationHolds) {
    CloudStore store = open_store();
    constexpr auto kAny = std::nullopt;
    using enum WriteOutcome;
    const struct {
        const char* name;
        Write write;
        std::int64_t revision;
        WriteOutcome outcome;
        bool deleted;
    } steps[] = {
        {"a deletion of nothing", {"a", "", true, kAny, ""}, 0, kUnchanged, false},
        {"an update of nothing", {"a", event("1"), false, 1, ""}, 0, kConflict, false},
        {"new", {"a", event("1"), false, 0, ""}, 1, kWritten, false},
        {"new again", {"a", event("2"), false, 0, ""}, 1, kConflict, false},
        {"the same text", {"a", event("1"), false, kAny, ""}, 1, kUnchanged, false},
        {"another text", {"a", event("2"), false, 1, ""}, 2, kWritten, false},
        {"from an old revision", {"a", event("3"), false, 1, ""}, 2, kConflict, false},
        {"a deletion of an old revision", {"a", "", true, 1, ""}, 2, kConflict, false},
        {"a deletion", {"a", "", true, 2, ""}, 3, kWritten, true},
        {"deleted twice", {"a", "", true, kAny, ""}, 3, kUnchanged, true},
        {"from before the deletion", {"a", event("3"), false, 2, ""}, 3, kConflict, true},
        {"new after a deletion", {"a", event("2"), false, 0, ""}, 4, kWritten, false},
    };
    for (const auto& step : steps) {
        SCOPED_TRACE(step.name);
        const auto result = store.write(step.write);
        ASSERT_TRUE(result.ok());
        EXPECT_EQ(result->outcome, step.outcome);
        EXPECT_EQ(result->revision, step.revision);
        EXPECT_EQ(result->deleted, step.deleted);
    }
    EXPECT_EQ(*store.revision(), 4);
    EXPECT_FALSE(store.get("b")->has_value());
    const auto a = *store.get("a");
    ASSERT_TRUE(a.has_value());
    EXPECT_EQ(a->text, event("2"));
    EXPECT_EQ(a->modified_by, "A");
}

TEST_F(CloudStoreTest, TheChangeFeedTellsEachKeyOnceInOrderOfItsLatestRevision) {
    CloudStore store = open_store();
    const std::vector<Write> batch = {
        {"a", event("a"), false, {}, ""},
        {"b", event("b"), false, {}, ""},
        {"c", event("c", R"(,"original_sync_id":"a")"), false, {}, ""},
        {"a", event("a2"), false, {}, ""},
        {"b", "", true, {}, ""},
    };
    ASSERT_TRUE(store.write(batch).ok());

    const auto all = *store.changes(0);
    ASSERT_EQ(all.documents.size(), 3U);
    EXPECT_EQ(all.revision, 5);
    EXPECT_FALSE(all.more);
    const char* const keys[] = {"c", "a", "b"};
    for (std::size_t i = 0; i < 3; ++i) {
        EXPECT_EQ(all.documents[i].key, keys[i]);
        EXPECT_EQ(all.documents[i].revision, static_cast<std::int64_t>(i) + 3);
    }
    EXPECT_TRUE(all.documents[2].deleted);
    EXPECT_EQ(all.documents[2].text, "");

    const auto page = *store.changes(3, 1);
    ASSERT_EQ(page.documents.size(), 1U);
    EXPECT_EQ(page.documents[0].key, "a");
    EXPECT_EQ(page.revision, 4);
    EXPECT_TRUE(page.more);
    EXPECT_TRUE(store.changes(5)->documents.empty());

    ASSERT_EQ(store.occurrences("a")->size(), 1U);
    EXPECT_EQ(store.occurrences("a")->front().key, "c");
    EXPECT_TRUE(store.occurrences("")->empty());
    EXPECT_EQ(store.documents()->size(), 2U);
}

TEST_F(CloudStoreTest, ABatchKeepsWhatIsNotInConflictAndAnErrorKeepsNothing) {
    CloudStore store = open_store();
    ASSERT_TRUE(store.write(Write{"a", event("a"), false, {}, ""}).ok());
    const auto results = store.write(
        std::vector<Write>{{"a", event("x"), false, 0, ""}, {"b", event("b"), false, 0, ""}});
    ASSERT_TRUE(results.ok());
    EXPECT_EQ((*results)[0].outcome, WriteOutcome::kConflict);
    EXPECT_EQ((*results)[1].outcome, WriteOutcome::kWritten);

    const Write bad[] = {{"d", "not JSON", false, {}, ""},
                         {"d", "[1]", false, {}, ""},
                         {"d", "{}", false, {}, ""},
                         {"it's", event("t"), false, {}, ""},
                         {"a b", event("t"), false, {}, ""},
                         {"", event("t"), false, {}, ""},
                         {"d", "{\"EVENT\":{\"title\":\"\xff\"}}", false, {}, ""}};
    for (const Write& write : bad) {
        SCOPED_TRACE(write.key + " " + write.text);
        const auto failed =
            store.write(std::vector<Write>{{"c", event("c"), false, {}, ""}, write});
        ASSERT_FALSE(failed.ok());
        EXPECT_EQ(failed.error().kind, ErrorKind::kInput);
        EXPECT_FALSE(store.get("c")->has_value());
        EXPECT_EQ(*store.revision(), 2);
    }
}

TEST_F(CloudStoreTest, OriginsStayWhenOthersWrite) {
    CloudStore store = open_store();
    ASSERT_TRUE(store.write(Write{"a", event("1"), false, {}, "digest"}).ok());
    ASSERT_TRUE(store.write(Write{"a", event("2"), false, {}, ""}).ok());
    ASSERT_TRUE(store.write(Write{"a", "", true, {}, ""}).ok());
    EXPECT_EQ((*store.get("a"))->origin, "digest");
}

TEST_F(CloudStoreTest, TheLogNamesWhoDidWhatToWhich) {
    {
        CloudStore store = open_store("phone");
        const std::string cancelled = R"({"EVENT":{"eventStatus":"2","original_sync_id":"a"}})";
        for (const Write& write :
             {Write{"a", event("Choir"), false, {}, ""}, Write{"a", event("Choir!"), false, {}, ""},
              Write{"a#1", cancelled, false, {}, ""}, Write{"a", "", true, {}, ""},
              Write{"a", event("Choir"), false, {}, ""}}) {
            ASSERT_TRUE(store.write(write).ok());
        }
    }
    auto quiet = *CloudStore::open(file_, {.who = "desk", .log_titles = false});
    ASSERT_TRUE(quiet.write(Write{"a", "", true, {}, ""}).ok());

    std::vector<std::string> lines;
    for (const CloudLogEntry& entry : *quiet.log()) {
        lines.push_back(entry.who + " " + entry.what + " " + entry.key + " " + entry.title);
    }
    const std::vector<std::string> expected = {"phone add a Choir",       "phone change a Choir!",
                                               "phone cancel a#1 Choir!", "phone delete a Choir!",
                                               "phone restore a Choir",   "desk delete a "};
    EXPECT_EQ(lines, expected);
    EXPECT_EQ(quiet.log(2)->front().revision, 5);
    EXPECT_EQ(quiet.log(0, "a#1")->size(), 1U);
}

TEST_F(CloudStoreTest, WatchersHearOfChangesAndOfNothingElse) {
    CloudStore store = open_store();
    const int watch = inotify_init1(IN_NONBLOCK | IN_CLOEXEC);
    ASSERT_GE(inotify_add_watch(watch, store.notify_path().c_str(), IN_CLOSE_WRITE), 0);
    const auto heard = [&] {
        char events[4096];
        pollfd poller{watch, POLLIN, 0};
        return ::poll(&poller, 1, 0) == 1 && ::read(watch, events, sizeof events) > 0;
    };
    ASSERT_TRUE(store.write(Write{"a", event("a"), false, {}, ""}).ok());
    EXPECT_TRUE(heard());
    ASSERT_TRUE(store.write(Write{"a", event("a"), false, {}, ""}).ok());
    ASSERT_TRUE(store.write(Write{"a", event("b"), false, 7, ""}).ok());
    ASSERT_TRUE(store.changes(0).ok());
    ASSERT_TRUE(CloudStore::open(file_, {}).ok());
    EXPECT_FALSE(heard());
    ::close(watch);
}

// Each process adds documents of its own and counts in a common one, re-reading after a conflict.
void work_at_once(const std::string& file, const std::string& name, int rounds) {
    auto store = CloudStore::open(file, {.who = name, .create = true, .busy_timeout_ms = 60000});
    if (!store) {
        std::cerr << store.error().message << "\n";
        _exit(1);
    }
    for (int i = 0; i < rounds; ++i) {
        if (!store->write(Write{name + std::to_string(i), event(name), false, 0, ""}).ok()) {
            _exit(2);
        }
        for (bool counted = false; !counted;) {
            const auto old = store->get("count");
            const bool exists = old.ok() && old->has_value();
            const int count = exists ? std::stoi((*old)->text.substr(19)) : 0;
            const std::int64_t expected = exists ? (*old)->revision : 0;
            const auto result =
                store->write(Write{"count", event(std::to_string(count + 1)), false, expected, ""});
            if (!result) {
                _exit(3);
            }
            counted = result->outcome == WriteOutcome::kWritten;
        }
    }
    _exit(0);
}

TEST_F(CloudStoreTest, ProcessesThatWriteAtOnceLoseNothing) {
    constexpr int kRounds = 40;
    std::vector<pid_t> children;
    for (const char* name : {"p", "q", "r"}) {
        const pid_t child = fork();
        if (child == 0) {
            work_at_once(file_, name, kRounds);
        }
        children.push_back(child);
    }
    for (const pid_t child : children) {
        int status = -1;
        ASSERT_EQ(waitpid(child, &status, 0), child);
        EXPECT_EQ(status, 0);
    }
    CloudStore store = open_store();
    EXPECT_EQ((*store.get("count"))->text, event(std::to_string(3 * kRounds)));
    EXPECT_EQ(store.documents()->size(), 3U * kRounds + 1);
    EXPECT_EQ(*store.revision(), 6 * kRounds);
    EXPECT_EQ(store.log()->size(), 6U * kRounds);
}

TEST_F(CloudStoreTest, UnusableFilesAreToldApart) {
    EXPECT_EQ(try_open(false).error().kind, ErrorKind::kMissing);
    file_ = (folder_ / "no" / "such" / "folder").string();
    EXPECT_EQ(try_open().error().kind, ErrorKind::kMissing);
    file_ = folder_.string();
    EXPECT_EQ(try_open().error().kind, ErrorKind::kForeign);

    file_ = (folder_ / "text").string();
    std::ofstream(file_) << std::string(5000, 'x');
    EXPECT_EQ(try_open().error().kind, ErrorKind::kForeign);
    EXPECT_EQ(fs::file_size(file_), 5000U);

    const struct {
        const char* name;
        const char* sql;
    } foreign[] = {{"other.db", "CREATE TABLE t (x)"},
                   {"newer.db",
                    "CREATE TABLE document (x); PRAGMA application_id = 1366258243;"
                    "PRAGMA user_version = 2"}};
    for (const auto& other : foreign) {
        SCOPED_TRACE(other.name);
        file_ = (folder_ / other.name).string();
        sqlite3* db = nullptr;
        sqlite3_open(file_.c_str(), &db);
        ASSERT_EQ(sqlite3_exec(db, other.sql, nullptr, nullptr, nullptr), SQLITE_OK);
        sqlite3_close(db);
        const auto opened = try_open();
        ASSERT_FALSE(opened.ok());
        EXPECT_EQ(opened.error().kind, ErrorKind::kForeign);
    }
}

TEST_F(CloudStoreTest, DamageAndLocksAreErrorsThatStoreNothing) {
    {
        CloudStore store = open_store();
        std::vector<Write> batch;
        batch.reserve(200);
        for (int i = 0; i < 200; ++i) {
            batch.push_back({"k" + std::to_string(i), event(std::string(200, 't')), false, {}, ""});
        }
        ASSERT_TRUE(store.write(batch).ok());
    }
    {
        auto store = *try_open();
        sqlite3* other = nullptr;
        sqlite3_open(file_.c_str(), &other);
        ASSERT_EQ(sqlite3_exec(other, "BEGIN IMMEDIATE", nullptr, nullptr, nullptr), SQLITE_OK);
        const auto locked = store.write(Write{"new", event("n"), false, {}, ""});
        ASSERT_FALSE(locked.ok());
        EXPECT_EQ(locked.error().kind, ErrorKind::kLocked);
        EXPECT_EQ(store.documents()->size(), 200U);  // readers do not wait for writers
        sqlite3_close(other);
        EXPECT_TRUE(store.write(Write{"new", event("n"), false, {}, ""}).ok());
    }
    {
        std::fstream damage(file_, std::ios::in | std::ios::out | std::ios::binary);
        damage.seekp(std::streamoff{3} * 4096);
        for (int i = 0; i < 10 * 4096; ++i) {
            damage.put('\x55');
        }
    }
    const auto store = try_open();
    ASSERT_TRUE(store.ok());
    const auto found = store->documents();
    ASSERT_FALSE(found.ok());
    EXPECT_EQ(found.error().kind, ErrorKind::kCorrupt);
}

TEST_F(CloudStoreTest, AWriteThatTheDiskRefusesIsTakenBackWhole) {
    ASSERT_TRUE(open_store().write(Write{"a", event("a"), false, {}, ""}).ok());
    const pid_t child = fork();
    if (child == 0) {
        std::signal(SIGXFSZ, SIG_IGN);
        auto store = try_open();
        constexpr rlim_t kSmall = 65536;
        const rlimit limit{kSmall, kSmall};
        setrlimit(RLIMIT_FSIZE, &limit);
        const auto result =
            store->write(std::vector<Write>{{"b", event("b"), false, {}, ""},
                                            {"c", event(std::string(500000, 'c')), false, {}, ""}});
        _exit(result.ok() || store->get("b")->has_value() ? 1 : 0);
    }
    int status = -1;
    ASSERT_EQ(waitpid(child, &status, 0), child);
    EXPECT_EQ(status, 0);
    CloudStore store = open_store();
    EXPECT_EQ(*store.revision(), 1);
    EXPECT_TRUE(store.write(Write{"b", event("b"), false, {}, ""}).ok());
}

TEST(CloudKeys, NameTheSameThingAlike) {
    EXPECT_EQ(occurrence_key("ev-1", 1767603600000), "ev-1#20260105T090000Z");
    EXPECT_EQ(occurrence_key("ev-1", -86400000), "ev-1#19691231T000000Z");
    EXPECT_EQ(occurrence_key("ev-1", INT64_MIN), "ev-1#-9223372036854775808");
    EXPECT_EQ(key_from_uid("abc-1@example.org"), "abc-1@example.org");
    for (const std::string uid : {"it's", "a b", "\xc3\xa9", "", "\"q\""}) {
        const std::string key = key_from_uid(uid);
        EXPECT_EQ(key.size(), 36U) << uid;
        EXPECT_EQ(key_from_uid(key), key);
    }
    EXPECT_NE(key_from_uid("a b"), key_from_uid("a c"));
    EXPECT_EQ(key_from_uid(std::string(300, 'x')).size(), 36U);
    std::set<std::string> keys;
    for (int i = 0; i < 100; ++i) {
        keys.insert(new_cloud_key());
    }
    EXPECT_EQ(keys.size(), 100U);
    EXPECT_EQ(keys.begin()->size(), 35U);
}

}  // namespace
}  // namespace qor
