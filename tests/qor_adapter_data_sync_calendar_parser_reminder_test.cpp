// SPDX-License-Identifier: Apache-2.0
#include "data-sync/calendar/qor_adapter_data_sync_calendar_parser_reminder.h"

#include <climits>
#include <string>
#include <vector>

#include "tests/support/device_test.h"
#include "tests/support/event_text.h"
#include "tests/support/json.h"

namespace {

constexpr char kReader[] = "_qor_calendar_parse_reminder_from_json";
constexpr char kWriter[] = "_qor_calendar_parse_make_reminder_to_json";

class ReminderTest : public DeviceTest {
  protected:
    static std::string text(const Record& alarm) {
        return property_text(alarm.get(), _calendar_alarm.tick) + '*' +
               property_text(alarm.get(), _calendar_alarm.tick_unit);
    }
    // The object as JSON.
    static std::string text(const Object& object) {
        const Node node(json_node_new(JSON_NODE_OBJECT));
        json_node_set_object(node.get(), object.get());
        const GText json(json_to_string(node.get(), FALSE));
        return json.get();
    }
};

TEST_F(ReminderTest, AnElementGivesMinutes) {
    const struct {
        const char* element;
        const char* alarm = "0*0";
        int result = 0;
    } cases[] = {
        {R"({"method":"1","minutes":"15"})", "15*60"},
        {R"({"minutes":"0"})", "0*60"},
        {R"({"minutes":"abc"})", "0*60"},
        {R"({"minutes":""})", "0*60"},
        {R"({"minutes":"-5 before"})", "-5*60"},
        {R"({"minutes":"7","other":[1],"method":null})", "7*60"},
        {R"({"minutes":"99999999999999999999"})", "2147483647*60"},
        {R"({"minutes":"-99999999999"})", "-2147483648*60"},
        {R"({"minutes":15})"},  // no string: absent
        {R"({"method":"1","minutes":null})"},
        {R"({"minutes":["15"]})"},
        {R"({"Minutes":"15"})"},
        {R"({})"},
        {R"(["minutes","15"])"},
        {R"("minutes")"},
        {"15"},
        {"null"},
        {R"({"error":"text","minutes":"15"})", "0*0", -1},
        {R"({"minutes":"15","error":1})", "15*60", -1},
        {R"({"minutes":"15","error":null})", "15*60", -1},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.element);
        JsonDocument element(c.element);
        const Record alarm = new_record(_calendar_alarm._uri);
        PrintCapture printed;  // a value has no members
        EXPECT_EQ(_qor_calendar_parse_reminder_from_json(&element.root, alarm.get()), c.result);
        EXPECT_EQ(text(alarm), c.alarm);
        EXPECT_TRUE(log().empty());
    }
}

TEST_F(ReminderTest, AnAlarmOfAnyUnitIsWrittenInMinutes) {
    const struct {
        int tick;
        int unit;
        const char* object;
        const char* message = nullptr;
    } cases[] = {
        {15, 60, R"({"method":"1","minutes":"15"})"},
        {2, 3600, R"({"method":"1","minutes":"120"})"},
        {1, 86400, R"({"method":"1","minutes":"1440"})"},
        {1, 90, R"({"method":"1","minutes":"1"})"},
        {-1, 90, R"({"method":"1","minutes":"-1"})"},
        {0, 0, R"({"method":"1","minutes":"0"})"},
        {INT_MAX, 60, R"({"method":"1","minutes":"-1"})"},  // 32 bits wrap around
        {7, -1, R"({"method":"1"})", "alarm none"},
        {7, 1, R"({"method":"1"})", "tick unit is specific"},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(testing::Message() << c.tick << " * " << c.unit);
        const Record alarm = new_record(_calendar_alarm._uri);
        ASSERT_EQ(calendar_record_set_int(alarm.get(), _calendar_alarm.tick, c.tick), 0);
        ASSERT_EQ(calendar_record_set_int(alarm.get(), _calendar_alarm.tick_unit, c.unit), 0);
        const Object object(json_object_new());
        EXPECT_EQ(_qor_calendar_parse_make_reminder_to_json(alarm.get(), object.get()),
                  c.message == nullptr ? 0 : -1);
        EXPECT_EQ(text(object), c.object);
        std::vector<LogLine> logged;
        if (c.message != nullptr) {
            logged.push_back(critical(kWriter, c.message));
        }
        EXPECT_EQ(log(), logged);
        EXPECT_EQ(_qor_calendar_parse_make_reminder_to_json(alarm.get(), nullptr), -1);
        EXPECT_TRUE(log().empty());
    }
}

TEST_F(ReminderTest, AFailedCallOfTheServiceEndsIt) {
    const char* const alarm_after[] = {"0*0", "15*0"};
    for (int nth = 1; nth <= 2; ++nth) {
        JsonDocument element(R"({"minutes":"15"})");
        const Record alarm = new_record(_calendar_alarm._uri);
        faults::fail("calendar_record_set_int", nth);
        EXPECT_EQ(_qor_calendar_parse_reminder_from_json(&element.root, alarm.get()), -1);
        faults::clear();
        EXPECT_EQ(log(), std::vector{critical(kReader, "set fail")});
        EXPECT_EQ(text(alarm), alarm_after[nth - 1]);

        const Object object(json_object_new());
        faults::fail("calendar_record_get_int", nth);
        EXPECT_EQ(_qor_calendar_parse_make_reminder_to_json(alarm.get(), object.get()), -1);
        faults::clear();
        EXPECT_EQ(log(), std::vector{critical(kWriter, "get fail")});
        EXPECT_EQ(text(object), R"({"method":"1"})");
    }
}

}  // namespace
