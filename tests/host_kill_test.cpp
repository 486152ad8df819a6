// SPDX-License-Identifier: Apache-2.0
//
// A sync that is killed at a write, any write, and run again: nothing is lost, and nothing is there
// twice. By default every 7th write is tried; QOR_KILL_EVERY=1 tries all of them.
#include <fmt/format.h>
#include <gmock/gmock.h>

#include <cstdlib>

#include "tests/host_bed.h"

namespace bed {
namespace {

namespace fs = std::filesystem;

constexpr int kEvery = 7;
constexpr long long kMonday = 1767625200;  // 2026-01-05 15:00 UTC
constexpr long long kWeek = 604800;

std::string series(const std::string& title) {
    return document({{"title", title},
                     {"dtstart", std::to_string(kMonday * 1000)},
                     {"dtend", std::to_string((kMonday + 3600) * 1000)},
                     {"eventTimezone", "Europe/Berlin"},
                     {"rrule", "FREQ=WEEKLY;COUNT=8"}});
}

std::string occurrence(const std::string& parent, int week, const std::string& title) {
    const std::string at = std::to_string((kMonday + week * kWeek) * 1000);
    if (title.empty()) {
        return document(
            {{"eventStatus", "2"}, {"original_sync_id", parent}, {"originalInstanceTime", at}});
    }
    return document({{"title", title},
                     {"dtstart", at},
                     {"dtend", at},
                     {"original_sync_id", parent},
                     {"originalInstanceTime", at}});
}

int environment_number(const char* name, int otherwise) {
    const char* const text = std::getenv(name);
    return text == nullptr ? otherwise : std::atoi(text);
}

class HostKillTest : public HostTest {
  protected:
    // What both sides have changed since they last agreed.
    void prepare() {
        TestDevice& a = device("a");
        TestDevice& b = device("b");
        for (const char* title : {"one", "two", "three", "four"}) {
            NewEvent event;
            event.title = title;
            a.add(event);
        }
        put("class", series("class"));
        put("class#20260112T150000Z", occurrence("class", 1, ""));
        put("class#20260119T150000Z", occurrence("class", 2, ""));
        put("talks", series("talks"));
        put("talks#20260112T150000Z", occurrence("talks", 1, "guest talk"));
        sync_all();

        a.set_title(a.find("one"), "one of a");
        a.remove(a.find("two"));
        a.cancel_occurrence(a.find("class"), "20260126T150000Z");
        NewEvent added;
        added.title = "new on a";
        added.reminders = {15};
        a.add(added);
        b.set_title(b.find("three"), "three of b");
        b.remove(b.find("four"));
        for (const char* title : {"new on b", "newer on b"}) {
            added.title = title;
            b.add(added);
        }
        b.sync();
        put("class", series("evening class"));
        put("talks#20260112T150000Z", occurrence("talks", 1, "other guest"));
        put("choir", series("choir"));
        put("choir#20260112T150000Z", occurrence("choir", 1, ""));
        put("choir#20260119T150000Z", occurrence("choir", 2, "concert"));
        fs::copy(directory(), saved(), fs::copy_options::recursive);
    }

    void restore() {
        for (const char* name : {"a", "b"}) {
            fs::remove_all(directory() / name);
            fs::copy(saved() / name, directory() / name, fs::copy_options::recursive);
        }
        for (const auto& entry : fs::directory_iterator(saved())) {
            if (entry.is_regular_file()) {
                fs::copy(entry.path(), directory() / entry.path().filename(),
                         fs::copy_options::overwrite_existing);
            }
        }
    }

    fs::path saved() const { return directory().string() + ".saved"; }
    ~HostKillTest() override {
        std::error_code ignored;  // a leftover directory is no fault of what was tested
        fs::remove_all(saved(), ignored);
    }
};

TEST_F(HostKillTest, NothingIsLostOrDoubled) {
    prepare();
    sync_all();
    const std::vector<std::string> expected = device("a").contents();
    ASSERT_EQ(device("b").contents(), expected);
    ASSERT_EQ(expected.size(), 10u);

    const int every = environment_number("QOR_KILL_EVERY", kEvery);
    int n = environment_number("QOR_KILL_FROM", 1);
    for (restore(); device("a").sync_killed_at(n); n += every, restore()) {
        SCOPED_TRACE(fmt::format("killed at write {}", n));
        sync_all();
        EXPECT_EQ(device("a").contents(), expected);
        EXPECT_EQ(device("b").contents(), expected);
        EXPECT_THAT(told(device("a").sync()), testing::IsEmpty());
        if (HasFailure()) {
            break;
        }
    }
    fmt::print("a sync of {} writes, every {} of them tried\n", n, every);
    EXPECT_GT(n, 100);
}

}  // namespace
}  // namespace bed
