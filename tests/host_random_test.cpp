// SPDX-License-Identifier: Apache-2.0
//
// Random edits on two devices and in the cloud, random syncs, random kills; in the end all three
// agree. The seed is printed; QOR_SEED repeats a run, QOR_STEPS makes it longer.
#include <fmt/format.h>
#include <gmock/gmock.h>

#include <csignal>
#include <cstdlib>
#include <nlohmann/json.hpp>
#include <random>
#include <set>

#include "host/failure.h"
#include "tests/host_bed.h"

namespace bed {
namespace {

constexpr unsigned int kSeed = 20260105;
constexpr int kSteps = 150;
constexpr long long kMonday = 1767625200;  // 2026-01-05 15:00 UTC
constexpr long long kWeek = 604800;
constexpr long long kHour = 3600;

class HostRandomTest : public HostTest {
  protected:
    int pick(int below) { return static_cast<int>(random_() % static_cast<unsigned int>(below)); }

    std::string new_title() { return fmt::format("event {:05}", ++titles_); }

    TestDevice& any_device() { return device(pick(2) == 0 ? "a" : "b"); }

    NewEvent new_event() {
        NewEvent event;
        event.title = new_title();
        event.start_s = kMonday + pick(50) * kHour;
        event.frequency = pick(3) == 0 ? CALENDAR_RECURRENCE_WEEKLY : 0;
        event.count = event.frequency == 0 ? 0 : 10;
        if (pick(3) == 0) {
            event.reminders = {pick(60), 60 + pick(60)};
        }
        return event;
    }

    // The id of some event, 0 when there is none; of a series when asked. It is no longer as it was
    // made.
    int any_event(TestDevice& on, bool series) {
        std::vector<std::string> titles;
        for (const std::string& line : on.contents()) {
            if (!series || line.find(" every ") != std::string::npos) {
                titles.push_back(line.substr(0, line.find(" 176")));
            }
        }
        if (titles.empty()) {
            return 0;
        }
        const auto index = static_cast<std::size_t>(pick(static_cast<int>(titles.size())));
        untouched_.erase(titles[index]);
        return on.find(titles[index]);
    }

    void edit_device() {
        TestDevice& on = any_device();
        const int action = pick(10);
        if (action < 4) {
            const NewEvent added = new_event();
            on.add(added);
            untouched_.insert(added.title);
        } else if (action < 7) {
            if (const int event = any_event(on, false)) {
                on.set_title(event, new_title());
            }
        } else if (action == 7) {
            if (const int event = any_event(on, false)) {
                on.remove(event);
            }
        } else if (const int event = any_event(on, true)) {
            const std::string instant = fmt::format("202601{:02}T150000Z", 12 + 7 * pick(3));
            if (action == 8) {
                on.cancel_occurrence(event, instant);
            } else {
                NewEvent moved;
                moved.title = new_title();
                moved.start_s = kMonday + kWeek + pick(50) * kHour;
                on.move_occurrence(event, instant, moved);
            }
        }
    }

    void edit_cloud() {
        std::vector<qor::CloudDocument> documents = qor::need(cloud().documents());
        if (documents.empty() || pick(2) == 0) {
            const std::string title = new_title();
            untouched_.insert(title);
            put("cloud-" + std::to_string(titles_),
                document({{"title", title},
                          {"dtstart", std::to_string((kMonday + pick(50) * kHour) * 1000)},
                          {"dtend", std::to_string((kMonday + 60 * kHour) * 1000)}}));
            return;
        }
        const auto& chosen =
            documents[static_cast<std::size_t>(pick(static_cast<int>(documents.size())))];
        auto json = nlohmann::ordered_json::parse(chosen.text);
        untouched_.erase(chosen.title);
        json["EVENT"]["title"] = new_title();
        put(chosen.key, pick(4) == 0 ? "" : json.dump());
    }

    void sync_some() {
        qor::SyncOptions options;
        constexpr qor::Policy kPolicies[] = {qor::Policy::kCloud, qor::Policy::kDevice,
                                             qor::Policy::kNewest, qor::Policy::kKeepBoth};
        options.policy = kPolicies[pick(4)];
        options.allow_mass_delete = true;
        TestDevice& on = any_device();
        if (pick(3) == 0) {
            kills_ += on.sync_killed_at(1 + pick(400)) ? 1 : 0;
        } else {
            on.sync(options);
        }
    }

    std::mt19937 random_;
    int titles_ = 0;
    int kills_ = 0;
    std::set<std::string> untouched_;  // titles of events that nobody edited since they were made
};

TEST_F(HostRandomTest, AllThreeAgreeInTheEnd) {
    const char* const seed_text = std::getenv("QOR_SEED");
    const char* const steps_text = std::getenv("QOR_STEPS");
    const unsigned int seed =
        seed_text == nullptr ? kSeed : static_cast<unsigned int>(std::atoi(seed_text));
    const int steps = steps_text == nullptr ? kSteps : std::atoi(steps_text);
    fmt::print("QOR_SEED={} QOR_STEPS={}\n", seed, steps);
    random_.seed(seed);
    device("a");
    device("b");
    qor::SyncOptions allow;
    allow.allow_mass_delete = true;
    for (int step = 1; step <= steps; ++step) {
        SCOPED_TRACE(fmt::format("step {}", step));
        const int action = pick(10);
        if (action < 6) {
            edit_device();
        } else if (action < 7) {
            edit_cloud();
        } else {
            sync_some();
        }
        if (step % 50 != 0) {
            continue;
        }
        for (const char* name : {"a", "b", "a", "b"}) {
            device(name).sync(allow);
        }
        ASSERT_EQ(device("a").contents(), device("b").contents());
        ASSERT_THAT(told(device("a").sync()), testing::IsEmpty());
        ASSERT_THAT(told(device("b").sync()), testing::IsEmpty());
        std::size_t events = 0;
        for (const qor::CloudDocument& document : qor::need(cloud().documents())) {
            events += document.parent_key.empty() ? 1 : 0;
        }
        ASSERT_EQ(device("a").contents().size(), events);
        std::set<std::string> lost = untouched_;
        for (const std::string& line : device("a").contents()) {
            lost.erase(line.substr(0, line.find(" 176")));
        }
        ASSERT_THAT(lost, testing::IsEmpty());
    }
    fmt::print("{} events in the end, {} syncs were killed\n", device("a").contents().size(),
               kills_);
    EXPECT_GT(kills_, 0);
}

}  // namespace
}  // namespace bed
