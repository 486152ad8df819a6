// SPDX-License-Identifier: Apache-2.0
//
// The qor-cloud program: what it prints where, and how it ends.
#include <fmt/format.h>
#include <gtest/gtest.h>
#include <sqlite3.h>
#include <sys/wait.h>

#include <atomic>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <nlohmann/json.hpp>
#include <sstream>
#include <thread>

namespace {

namespace fs = std::filesystem;
using nlohmann::json;

std::string file_text(const fs::path& path) {
    std::ostringstream text;
    text << std::ifstream(path).rdbuf();
    return text.str();
}

struct Outcome {
    int status = -1;
    std::string out;
    std::string err;
};

class QorCloudTest : public ::testing::Test {
  protected:
    void SetUp() override {
        std::string pattern = (fs::temp_directory_path() / "qor-cloud-XXXXXX").string();
        ASSERT_NE(mkdtemp(pattern.data()), nullptr);
        folder_ = pattern;
        write("one.ics",
              "SUMMARY:Dentist\nDTSTART:20260105T083000Z\nRRULE:FREQ=WEEKLY\n"
              "EXDATE:20260112T083000Z\nATTENDEE:mailto:a@x.org\n");
    }
    void TearDown() override { fs::remove_all(folder_); }

    void write(const std::string& name, const std::string& lines, const std::string& uid = "one") {
        std::ofstream(folder_ / name) << "BEGIN:VCALENDAR\nBEGIN:VEVENT\nUID:" << uid << "\n"
                                      << lines << "END:VEVENT\nEND:VCALENDAR\n";
    }
    Outcome run(const std::string& arguments, const std::string& environment = "",
                const std::string& program = "qor-cloud") {
        const std::string id = std::to_string(++runs_);
        const fs::path out = folder_ / ("out" + id);
        const fs::path err = folder_ / ("err" + id);
        const std::string command =
            fmt::format("cd '{}' && env -u QOR_CLOUD {} '{}/{}' {} >'{}' 2>'{}'", folder_.string(),
                        environment, QOR_BIN_DIR, program, arguments, out.string(), err.string());
        const int status = std::system(command.c_str());
        return {WIFEXITED(status) ? WEXITSTATUS(status) : -1, file_text(out), file_text(err)};
    }

    fs::path folder_;
    std::atomic<int> runs_{0};
};

TEST_F(QorCloudTest, EndsWithTheStatusThatTheInputDeserves) {
    write("bad.ics", "SUMMARY:No start\n", "bad");
    std::ofstream(folder_ / "text.ics") << "not a calendar\n";
    std::ofstream(folder_ / "foreign.db") << std::string(5000, 'x');
    const struct {
        const char* arguments;
        int status;
        const char* message;  // in stderr
    } cases[] = {
        {"import one.ics", 0, ""},
        {"import one.ics bad.ics", 1,
         "bad.ics:2: \"No start\": it has no usable DTSTART; left out"},
        {"import one.ics missing.ics", 1, "missing.ics: No such file or directory"},
        {"import text.ics", 3, "text.ics: holds no calendar"},
        {"import", 2, "see 'qor-cloud import --help'"},
        {"import --zone Nowhere one.ics", 2, "no such zone"},
        {"", 2, "no command given"},
        {"improt one.ics", 2, "did you mean 'import'?"},
        {"list --mach x", 2, "did you mean '--match'?"},
        {"list", 0, ""},
        {"--cloud nowhere.db list", 3, "--cloud FILE"},
        {"--cloud foreign.db import one.ics", 3, "not a cloud file"},
        {"show nothing", 3, "'qor-cloud list' shows the keys"},
        {"export /nowhere/out.ics", 3, "No such file or directory"},
        {"--help", 0, ""},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.arguments);
        const Outcome outcome = run(c.arguments);
        EXPECT_EQ(outcome.status, c.status) << outcome.err;
        EXPECT_NE(outcome.err.find(c.message), std::string::npos) << outcome.err;
        EXPECT_EQ(outcome.err.find('\033'), std::string::npos);
        EXPECT_EQ(outcome.out.find('\033'), std::string::npos);
    }
    EXPECT_EQ(file_text(folder_ / "foreign.db"), std::string(5000, 'x'));
}

TEST_F(QorCloudTest, TablesLineUpAndNameWhatIsNotCarried) {
    const Outcome imported = run("import one.ics");
    EXPECT_EQ(imported.out,
              "FILE     EVENTS  CHANGED OCC.  CANCELLED OCC.  ADDED  CHANGED  UNCHANGED  KEPT\n"
              "one.ics       1             0               1      2        0          0     0\n"
              "\n"
              "NOT CARRIED BY DOCUMENTS  COUNT  FOR EXAMPLE\n"
              "ATTENDEE                      1  Dentist\n");
    write("wide.ics", "SUMMARY:\xe5\xbc\x95\xe3\x81\x8d\nDTSTART;VALUE=DATE:20250105\n", "wide");
    run("import wide.ics");
    EXPECT_EQ(
        run("list").out,
        "START             TITLE    REPEATS               ZONE  REV  KEY\n"
        "2025-01-05        \xe5\xbc\x95\xe3\x81\x8d                                   3  wide\n"
        "2026-01-05 08:30  Dentist  weekly                UTC     1  one\n"
        "2026-01-12 08:30  Dentist  cancelled occurrence          2  one#20260112T083000Z\n");
    EXPECT_EQ(run("list --match DENT --since 1").out,
              "START             TITLE    REPEATS               ZONE  REV  KEY\n"
              "2026-01-12 08:30  Dentist  cancelled occurrence          2  one#20260112T083000Z\n");
    EXPECT_NE(run("show wi").out.find("Start     2025-01-05"), std::string::npos);
}

TEST_F(QorCloudTest, JsonSaysTheSame) {
    const json preview = json::parse(run("import --dry-run --json one.ics").out);
    EXPECT_EQ(preview["files"][0]["added"], 2);
    EXPECT_FALSE(fs::exists(folder_ / "cloud.db"));
    const json imported = json::parse(run("--json import one.ics", "QOR_CLOUD=other.db").out);
    EXPECT_EQ(imported["files"][0]["not_carried"][0]["kind"], "ATTENDEE");
    ASSERT_TRUE(fs::exists(folder_ / "other.db"));
    const json list = json::parse(run("--cloud other.db list --json").out);
    EXPECT_EQ(list["revision"], 2);
    EXPECT_EQ(list["documents"][0]["document"]["EVENT"]["title"], "Dentist");
    const json shown = json::parse(run("--cloud other.db show one --json").out);
    EXPECT_EQ(shown["occurrences"], json::array({"one#20260112T083000Z"}));
    const json log = json::parse(run("--cloud other.db log --json --limit 1").out);
    EXPECT_EQ(log[0]["what"], "cancel");
    EXPECT_EQ(log[0]["title"], "Dentist");
    EXPECT_EQ(log[0]["who"], "qor-cloud");
}

TEST_F(QorCloudTest, AnExportImportsAsItIs) {
    run("import one.ics");
    ASSERT_EQ(run("export all.ics").status, 0);
    const Outcome piped = run("export");
    EXPECT_EQ(piped.out, file_text(folder_ / "all.ics"));
    EXPECT_NE(piped.err.find("Exported 1 event, 0 changed occurrences and 1 cancelled occurrence"),
              std::string::npos);
    EXPECT_EQ(json::parse(run("import --json all.ics").out)["files"][0]["unchanged"], 2);
    EXPECT_EQ(run("export - | '" QOR_BIN_DIR "/qor-cloud' --cloud second.db import -").status, 0);
    EXPECT_EQ(json::parse(run("list --cloud second.db --json").out)["documents"].size(), 2U);
}

TEST_F(QorCloudTest, TheExamplesComeOutAsLibicalReadsThem) {
    const std::string examples = QOR_SOURCE_DIR "/examples/*.ics";
    ASSERT_EQ(run("import --zone Europe/Berlin " + examples).status, 0);
    ASSERT_EQ(run("export all.ics").status, 0);
    const auto compared = [&](const std::string& file) {
        return run("--zone Europe/Berlin --allow zone --allow 'a date for a time' " + file + " " +
                       examples,
                   "", "compare_ics");
    };
    const Outcome same = compared("all.ics");
    EXPECT_EQ(same.status, 0) << same.out << same.err;
    EXPECT_NE(same.out.find("53 compared"), std::string::npos) << same.out;
    const struct {
        const char* from;
        const char* to;
        const char* kind;
    } changes[] = {
        {"SUMMARY:Choir\r", "SUMMARY:Quire\r", "SUMMARY"},
        {"TRIGGER:-PT30M", "TRIGGER:-PT31M", "VALARM"},
        {"T193000", "T194500", "DTSTART"},
        {"EXDATE;TZID=Europe/Berlin:20260217T", "EXDATE;TZID=Europe/Berlin:20260216T",
         "occurrences"},
        {"BYDAY=TU", "BYDAY=WE", "occurrences"},
        {"LOCATION:Parish hall", "COMMENT:Parish hall", "LOCATION"},
    };
    const std::string text = file_text(folder_ / "all.ics");
    for (const auto& change : changes) {
        SCOPED_TRACE(change.to);
        const std::size_t at = text.find(change.from);
        ASSERT_NE(at, std::string::npos);
        std::ofstream(folder_ / "changed.ics")
            << text.substr(0, at) << change.to
            << text.substr(at + std::string_view(change.from).size());
        const Outcome differs = compared("changed.ics");
        EXPECT_EQ(differs.status, 1);
        EXPECT_NE(differs.out.find(fmt::format(" {}\n", change.kind)), std::string::npos)
            << differs.out;
    }
}

TEST_F(QorCloudTest, TwoImportsAtOnceBothArrive) {
    for (const char* name : {"a", "b"}) {
        std::ofstream file(folder_ / fmt::format("{}.ics", name));
        file << "BEGIN:VCALENDAR\n";
        for (int i = 0; i < 1500; ++i) {
            file << fmt::format(
                "BEGIN:VEVENT\nUID:{}{}\nDTSTART:20260105T083000Z\nEND:VEVENT\n"
                "BEGIN:VEVENT\nUID:common{}\nDTSTART:20260105T083000Z\nEND:VEVENT\n",
                name, i, i);
        }
        file << "END:VCALENDAR\n";
    }
    Outcome first;
    std::thread other([&] { first = run("import a.ics"); });
    const Outcome second = run("import b.ics");
    other.join();
    EXPECT_EQ(first.status, 0) << first.err;
    EXPECT_EQ(second.status, 0) << second.err;
    const json list = json::parse(run("list --json").out);
    EXPECT_EQ(list["documents"].size(), 4500U);
    EXPECT_EQ(list["revision"], 4500);
}

}  // namespace
