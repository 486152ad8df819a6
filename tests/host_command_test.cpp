// SPDX-License-Identifier: Apache-2.0
//
// The program qor-host as people and scripts meet it: exit statuses, messages, JSON, and two
// watching processes.
#include <fcntl.h>
#include <gmock/gmock.h>
#include <poll.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <csignal>
#include <fstream>
#include <iterator>
#include <nlohmann/json.hpp>

#include "host/cloud/cloud_keys.h"
#include "tests/host_bed.h"

extern char** environ;  // NOLINT(readability-redundant-declaration): not every libc declares it

namespace bed {
namespace {

namespace fs = std::filesystem;
using ::testing::AllOf;
using ::testing::HasSubstr;
using ::testing::IsEmpty;

std::string read_file(const fs::path& path) {
    std::ifstream in(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(in), {}};
}

struct Ran {
    int status = -1;
    std::string out;
    std::string err;
    nlohmann::json json() const { return nlohmann::json::parse(out, nullptr, false); }
};

pid_t start(const std::vector<std::string>& arguments, posix_spawn_file_actions_t* actions) {
    const std::string program = QOR_BIN_DIR "/qor-host";
    std::vector<char*> argv = {const_cast<char*>(program.c_str())};
    for (const std::string& argument : arguments) {
        argv.push_back(const_cast<char*>(argument.c_str()));
    }
    argv.push_back(nullptr);
    pid_t child = -1;
    EXPECT_EQ(posix_spawn(&child, program.c_str(), actions, nullptr, argv.data(), environ), 0);
    return child;
}

class HostCommandTest : public HostTest {
  protected:
    Ran run(const std::vector<std::string>& arguments) {
        const fs::path out = directory() / "out";
        const fs::path err = directory() / "err";
        posix_spawn_file_actions_t actions;
        posix_spawn_file_actions_init(&actions);
        posix_spawn_file_actions_addopen(&actions, 0, "/dev/null", O_RDONLY, 0);
        constexpr int kNew = O_WRONLY | O_CREAT | O_TRUNC;
        posix_spawn_file_actions_addopen(&actions, 1, out.c_str(), kNew, 0600);
        posix_spawn_file_actions_addopen(&actions, 2, err.c_str(), kNew, 0600);
        int status = 0;
        waitpid(start(arguments, &actions), &status, 0);
        posix_spawn_file_actions_destroy(&actions);
        return {WIFEXITED(status) ? WEXITSTATUS(status) : -1, read_file(out), read_file(err)};
    }
    // On the device of this name.
    Ran on(const std::string& name, std::vector<std::string> arguments) {
        arguments.insert(arguments.begin(), {"--device", (directory() / name).string()});
        return run(arguments);
    }
    Ran sign_in(const std::string& name) {
        return on(name, {"--cloud", cloud_path(), "--json", "sign-in", "alice"});
    }
    std::string file_with(const std::string& text) {
        std::string path = (directory() / "document.json").string();
        std::ofstream(path) << text;
        return path;
    }
    // Every file of the device and the cloud that is not empty, with a digest of its contents.
    std::map<std::string, std::string> files() {
        std::map<std::string, std::string> result;
        for (const auto& entry : fs::recursive_directory_iterator(directory())) {
            const std::string name = entry.path().filename().string();
            // Maps of the write-ahead logs: readers leave marks in them.
            if (entry.is_regular_file() && name != "out" && name != "err" &&
                !name.ends_with("-shm") && entry.file_size() > 0) {
                result[entry.path().string()] = qor::text_digest(read_file(entry.path()));
            }
        }
        return result;
    }
};

TEST_F(HostCommandTest, SaysWhatIsWrongAndWhatToDo) {
    struct Case {
        std::vector<std::string> arguments;
        int status;
        const char* message;
    };
    const std::string nowhere = (directory() / "nowhere").string();
    const std::string no_adapter = QOR_LIB_DIR "/libqor-platform.so";
    const Case cases[] = {
        {{}, 2, "no command given; see 'qor-host --help'"},
        {{"snyc"}, 2, "unknown command \"snyc\"; did you mean 'sync'?"},
        {{"sync", "--polcy", "device"}, 2, "did you mean '--policy'?"},
        {{"sync", "--policy", "coin"}, 2, "--policy"},
        {{"watch", "--debounce", "-1"}, 2, "--debounce"},
        {{"get"}, 2, "item is required"},
        {{"--device", nowhere, "sync"}, 3, "not a device directory"},
        {{"--device", directory().string(), "sync"}, 3, "nobody has signed in here"},
        {{"--device", nowhere, "get", "x1"}, 3, "'x1' is no item number"},
        {{"--device", nowhere, "sign-in", "alice"}, 3, "no cloud is known yet"},
        {{"--device", nowhere, "--adapter", "/nowhere.so", "ids"}, 3, "cannot load the adapter"},
        {{"--device", nowhere, "--adapter", no_adapter, "ids"},
         3,
         "is no adapter: 23 of its 23 entry points are missing: qor_adapter_get_cid"},
    };
    for (const Case& c : cases) {
        const Ran ran = run(c.arguments);
        SCOPED_TRACE(c.message);
        EXPECT_EQ(ran.status, c.status);
        EXPECT_THAT(ran.err, AllOf(testing::StartsWith("qor-host: error: "), HasSubstr(c.message)));
        EXPECT_EQ(std::count(ran.err.begin(), ran.err.end(), '\n'), 1);
        EXPECT_THAT(ran.out, IsEmpty());
    }
    EXPECT_THAT(run({"--help"}).out, HasSubstr("Exit status: 0 done"));
    EXPECT_EQ(run({"sync", "--help"}).status, 0);
}

TEST_F(HostCommandTest, ADeviceSignsInSyncsAndSignsOut) {
    EXPECT_EQ(sign_in("a").json()["account"], "alice");
    EXPECT_EQ(sign_in("a").status, 0);
    const Ran other = on("a", {"sign-in", "bob"});
    EXPECT_EQ(other.status, 3);
    EXPECT_THAT(other.err, HasSubstr("signed in as 'alice'"));
    // The baseline is stored: what is added now is reported to a host that starts later.
    EXPECT_GT(on("a", {"status", "--json"}).json()["baseline"], 0);
    TestDevice a(directory() / "a", cloud_path());
    a.add({});
    const Ran early = on("a", {"sign-out"});
    EXPECT_EQ(early.status, 3);
    EXPECT_THAT(early.err, HasSubstr("1 changes of this device are not in the cloud yet"));

    const Ran synced = on("a", {"sync", "--json"});
    EXPECT_EQ(synced.status, 0);
    EXPECT_EQ(synced.json()["uploaded_new"], 1);
    EXPECT_EQ(synced.json()["entries"][0]["title"], "event (2026-01-05 15:00 UTC)");
    const nlohmann::json status = on("a", {"status", "--json"}).json();
    EXPECT_EQ(status["events"], 1);
    EXPECT_EQ(status["calendar_version"], status["synced_calendar_version"]);
    EXPECT_EQ(status["cloud"]["revision"], status["cloud"]["synced_revision"]);
    EXPECT_NE(status["last_sync"], "never");
    EXPECT_THAT(on("a", {"log"}).out, HasSubstr("to cloud: new       event (2026-01-05"));

    EXPECT_EQ(on("a", {"sign-out"}).status, 0);
    EXPECT_THAT(a.contents(), IsEmpty());
    EXPECT_EQ(on("a", {"sync"}).status, 3);
    sign_in("a");
    EXPECT_EQ(on("a", {"sync", "--json"}).json()["device_new"], 1);
}

TEST_F(HostCommandTest, ASyncWithNothingToDoWritesNothing) {
    sign_in("a");
    TestDevice(directory() / "a", cloud_path()).add({});
    put("other", document({{"title", "other"}, {"dtstart", "0"}, {"dtend", "0"}}));
    on("a", {"sync"});
    const auto before = files();
    const Ran ran = on("a", {"sync"});
    EXPECT_EQ(ran.status, 0);
    EXPECT_EQ(ran.out, "nothing to do: device and cloud agree\n");
    EXPECT_EQ(files(), before);
}

TEST_F(HostCommandTest, TitlesCanBeKeptOutOfTheLog) {
    on("a", {"--cloud", cloud_path(), "sign-in", "alice", "--hide-titles"});
    TestDevice a(directory() / "a", cloud_path());
    NewEvent secret;
    secret.title = "surgery";
    a.add(secret);
    EXPECT_THAT(on("a", {"sync"}).out, HasSubstr("surgery"));
    EXPECT_THAT(on("a", {"log"}).out, AllOf(HasSubstr("ev-"), testing::Not(HasSubstr("surgery"))));
}

TEST_F(HostCommandTest, TheShellReachesSingleEntryPoints) {
    const std::string file =
        file_with(document({{"title", "x"}, {"dtstart", "0"}, {"dtend", "0"}}));
    EXPECT_EQ(on("a", {"--json", "insert", file}).json()["item"], 1);
    EXPECT_EQ(on("a", {"get", "1"}).json()["EVENT"]["title"], "x");
    file_with(document({{"title", "y"}, {"dtstart", "0"}, {"dtend", "0"}}));
    EXPECT_EQ(on("a", {"update", "1", file}).status, 0);
    EXPECT_EQ(on("a", {"get", "1"}).json()["EVENT"]["title"], "y");
    EXPECT_EQ(on("a", {"delete", "1"}).status, 0);
    EXPECT_EQ(on("a", {"get", "1"}).status, 3);
    file_with("{}{");
    EXPECT_EQ(on("a", {"update", "1", file}).status, 3);

    // On a device that is signed in, what the shell does takes part in the next sync.
    sign_in("b");
    file_with(document({{"title", "z"}, {"dtstart", "0"}, {"dtend", "0"}}));
    EXPECT_EQ(on("b", {"--json", "insert", file}).json()["item"], 1);
    TestDevice b(directory() / "b", cloud_path());
    b.add({});
    EXPECT_EQ(on("b", {"--json", "ids"}).json()["changed"], nlohmann::json({2}));
    EXPECT_EQ(on("b", {"--json", "ids", "--clear"}).json()["changed"], nlohmann::json({2}));
    EXPECT_EQ(on("b", {"--json", "ids"}).json()["changed"], nlohmann::json::array());
    EXPECT_EQ(on("b", {"--json", "sync"}).json()["uploaded_new"], 2);
}

TEST_F(HostCommandTest, AConflictIsListedShownAndRestored) {
    sign_in("a");
    put("k", document({{"title", "one"}, {"dtstart", "0"}, {"dtend", "0"}}));
    on("a", {"sync"});
    TestDevice a(directory() / "a", cloud_path());
    a.set_title(a.find("one"), "here");
    put("k", document({{"title", "there"}, {"dtstart", "0"}, {"dtend", "0"}}));
    EXPECT_EQ(on("a", {"--json", "sync"}).json()["conflicts"], 1);
    EXPECT_EQ(on("a", {"--json", "conflicts"}).json()[0]["lost"], "device");
    EXPECT_EQ(on("a", {"conflicts", "show", "1"}).json()["document"]["EVENT"]["title"], "here");
    EXPECT_EQ(on("a", {"conflicts", "show", "2"}).status, 3);
    EXPECT_EQ(on("a", {"conflicts", "restore", "1"}).status, 0);
    on("a", {"sync"});
    EXPECT_NE(a.find("here"), 0);
    // What was there before is kept in turn.
    const nlohmann::json all = on("a", {"--json", "conflicts"}).json();
    ASSERT_EQ(all.size(), 2u);
    EXPECT_EQ(all[0]["restored"], true);
    EXPECT_EQ(all[1]["lost"], "cloud");
}

// A watching process, ended with the test.
class Watcher {
  public:
    explicit Watcher(const fs::path& device) {
        int ends[2];
        EXPECT_EQ(pipe2(ends, O_CLOEXEC), 0);
        posix_spawn_file_actions_t actions;
        posix_spawn_file_actions_init(&actions);
        posix_spawn_file_actions_adddup2(&actions, ends[1], 1);
        child_ =
            start({"--device", device.string(), "--json", "watch", "--debounce", "50"}, &actions);
        posix_spawn_file_actions_destroy(&actions);
        close(ends[1]);
        out_ = ends[0];
    }
    Watcher(const Watcher&) = delete;
    Watcher& operator=(const Watcher&) = delete;
    ~Watcher() {
        if (child_ > 0) {
            stop();
        }
    }

    // Waits until it tells of something with this text.
    bool tells(const std::string& text) {
        constexpr int kLongestMs = 10000;
        pollfd readable = {out_, POLLIN, 0};
        while (told_.find(text) == std::string::npos) {
            char buffer[4096];
            if (poll(&readable, 1, kLongestMs) != 1) {
                return false;
            }
            const ssize_t n = read(out_, buffer, sizeof buffer);
            if (n <= 0) {
                return false;
            }
            told_.append(buffer, static_cast<std::size_t>(n));
        }
        return true;
    }

    int stop() {
        kill(child_, SIGTERM);
        int status = 0;
        waitpid(child_, &status, 0);
        close(out_);
        child_ = 0;
        return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
    }

  private:
    pid_t child_ = 0;
    int out_ = -1;
    std::string told_;
};

TEST_F(HostCommandTest, WatchingDevicesTellEachOther) {
    sign_in("a");
    sign_in("b");
    put("first", document({{"title", "first"}, {"dtstart", "0"}, {"dtend", "0"}}));
    Watcher watch_a(directory() / "a");
    Watcher watch_b(directory() / "b");
    ASSERT_TRUE(watch_a.tells("first"));
    ASSERT_TRUE(watch_b.tells("first"));
    EXPECT_THAT(on("a", {"sync"}).err, HasSubstr("another qor-host is at work"));

    TestDevice a(directory() / "a", cloud_path());
    TestDevice b(directory() / "b", cloud_path());
    NewEvent event;
    event.title = "lunch";
    const auto start = std::chrono::steady_clock::now();
    a.add(event);
    ASSERT_TRUE(watch_b.tells("lunch"));
    const std::chrono::duration<double> took = std::chrono::steady_clock::now() - start;
    EXPECT_LT(took.count(), 5.0);  // about a quarter of a second where nothing else runs
    EXPECT_NE(b.find("lunch"), 0);
    b.set_title(b.find("lunch"), "late lunch");
    ASSERT_TRUE(watch_a.tells("late lunch"));
    EXPECT_EQ(watch_a.stop(), 0);
    EXPECT_EQ(watch_b.stop(), 0);
    EXPECT_EQ(a.contents(), b.contents());
}

}  // namespace
}  // namespace bed
