// SPDX-License-Identifier: Apache-2.0
#include "data-sync/calendar/qor_adapter_data_sync_calendar_parser_event.h"

#include <algorithm>
#include <chrono>
#include <string>
#include <vector>

#include "tests/support/device_test.h"
#include "tests/support/event_text.h"
#include "tests/support/heap.h"
#include "tests/support/json.h"

namespace {

constexpr char kParse[] = "_qor_calendar_parse_event_from_json";
constexpr char kSetValue[] = "__qor_calendar_parser_event_set_value";
constexpr char kReminder[] = "_qor_calendar_parse_reminder_from_json";
constexpr char kReminderFail[] = "_qor_calendar_parse_reminder_from_json fail";
constexpr int kParentId = 5;

// A document read into a fresh row, as the value operations do it.
struct Parsed {
    calendar_adapter_row row{};
    int result = 0;

    explicit Parsed(const std::string& text, const char* failing = nullptr, int nth = 0) {
        EXPECT_EQ(calendar_record_create(_calendar_event._uri, &row.record), 0);
        if (failing != nullptr) {
            faults::fail(failing, nth);
        }
        result = _qor_calendar_parse_event_from_json(text.c_str(), 0, text.size(), 0, &row);
    }
    ~Parsed() { _qor_calendar_free_adapter_row(&row); }
    Parsed(const Parsed&) = delete;
    Parsed& operator=(const Parsed&) = delete;
};

std::string event(const std::string& members) {
    return "{\"EVENT\":{" + members + "}}";
}

std::string joined(const std::vector<std::string>& members) {
    std::string all;
    for (const std::string& member : members) {
        all += (all.empty() ? "" : ",") + member;
    }
    return all;
}

// The device knows the event 5 by the cloud key "parent", and an item without event by "pending".
class EventDocumentTest : public DeviceTest {
  protected:
    EventDocumentTest() {
        add_cloud_key(1, "parent");
        add_cloud_key(2, "pending");
        add_cloud_key(99, "no row");
        EXPECT_EQ(_qor_calendar_db_open(), 0);
        for (const int svc_id : {kParentId, 0}) {
            calendar_adapter_row row{};
            row.calsvc_id = svc_id;
            EXPECT_EQ(_qor_calendar_db_insert_adapter(&row), 0);
        }
        log();
    }
    ~EventDocumentTest() override { _qor_calendar_db_close(); }
};

TEST_F(EventDocumentTest, EachMemberIsStored) {
    const struct {
        const char* members;
        const char* stored;
    } cases[] = {
        {"", ""},
        {R"("title":"Tea, \u00e9t\u00e9 \ud83c\udf75")", "summary=Tea, été 🍵; "},
        {R"("title":"")", "summary=; "},
        {R"("eventLocation":"Here","description":"a\nb")", "location=Here; description=a\nb; "},
        {R"("eventStatus":"2")", "status=2; "},
        {R"("eventStatus":"2x")", "status=2; "},
        {R"("eventStatus":"1")", ""},
        {R"("eventStatus":"4294967298")", ""},
        {R"("dtstart":"1394875800999")", "start=1394875800; has_start=1; "},
        {R"("dtend":"-1500")", "end=-1; "},
        {R"("dtstart":"9223372036854775807","dtend":"-9223372036854775808")",
         "start=9223372036854776; end=-9223372036854776; has_start=1; "},
        {R"("eventTimezone":"Asia/Seoul")", "start_tzid=Asia/Seoul; end_tzid=Asia/Seoul; "},
        {R"("duration":"PT1H","duration":"PT2H")",
         "has_pending_duration=1; pending_duration=PT2H; "},
        {R"("allDay":"1")", "start=1970-1-1; end=1970-1-1; is_allday=1; "},
        {R"("allDay":"0","allDay":"2","hasAlarm":"1","lastDate":"1","hasAttendeeData":"1")", ""},
        {R"("accessLevel":"0")", ""},
        {R"("accessLevel":"1")", ""},
        {R"("rrule":"FREQ=WEEKLY;BYDAY=MO,WE;COUNT=4")", "freq=2; range=1; count=4; byday=MO,WE; "},
        {R"("original_sync_id":"parent")", "original_event_id=5; parent=5; status=1; "},
        {R"("original_sync_id":"unknown")", "parent_key=unknown; status=1; invalid=1; "},
        {R"("original_sync_id":"pending")", "parent_key=pending; status=1; invalid=1; "},
        {R"("original_sync_id":"no row")", "parent_key=no row; status=1; invalid=1; "},
        {R"("original_sync_id":"it's")", "parent_key=it's; status=1; invalid=1; "},
        {R"("original_sync_id":"")", ""},
        {R"("originalInstanceTime":"1394875800000")",
         "recurrence_id=20140315T093000Z; status=1; exdate=20140315T093000Z; "},
        {R"("organizer":"A. Person")", "organizer_name=A. Person; organizer_email=A. Person; "},
        {R"("longitude":"-122419416","latitude":"37566535")",
         "longitude=-122.419416; latitude=37.566535; "},
        {R"("Title":"x","titles":"x","error":{"code":"1"})", ""},
        // A value that is no string is absent; also a null after a string.
        {R"("title":7,"location":true,"description":null,"dtstart":1000,"allDay":1)", ""},
        {R"("title":"x","rrule":null,"dtend":["1"],"organizer":{"a":"b"})", "summary=x; "},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.members);
        const Parsed parsed(event(c.members));
        EXPECT_EQ(parsed.result, 0);
        EXPECT_EQ(row_text(parsed.row), c.stored);
        EXPECT_TRUE(log().empty());
    }
    calendar_adapter_row row{};
    for (const int key : {-1, 10, 14, 15, 19}) {
        EXPECT_EQ(__qor_calendar_parser_event_set_value(&row, key, "1"), 0);
    }
    // "accessLevel" makes a record public that was not.
    const Record secret = new_record(_calendar_event._uri);
    row.record = secret.get();
    for (const char* const level : {"1", "", "0"}) {
        ASSERT_EQ(calendar_record_set_int(secret.get(), _calendar_event.sensitivity, 2), 0);
        EXPECT_EQ(__qor_calendar_parser_event_set_value(&row, 9, level), 0);
        EXPECT_EQ(number(secret, _calendar_event.sensitivity), *level == '1' ? 2 : 0) << level;
    }
}

TEST_F(EventDocumentTest, TheOrderOfMembersMattersOnlyWhereItMust) {
    const std::string instance = R"("originalInstanceTime":"1394841600000")";
    const std::string all_day = R"("allDay":"1")";
    const std::string end = R"("dtend":"9000000")";
    const struct {
        std::vector<std::string> members;
        // Of the stored text, given the order of the members.
        std::string (*stored)(const std::string& order);
    } cases[] = {
        {{all_day, R"("dtstart":"1394875800000")", R"("dtend":"1394962200000")"},
         [](const std::string&) -> std::string {
             return "start=2014-3-15; end=2014-3-16; is_allday=1; has_start=1; ";
         }},
        {{R"("duration":"PT1H")", R"("dtstart":"1000000")", end},
         [](const std::string& order) {
             const bool end_is_last = order.find("dtend") > order.find("duration") &&
                                      order.find("dtend") > order.find("dtstart");
             return std::string("start=1000; end=") + (end_is_last ? "9000" : "4600") +
                    "; has_start=1; ";
         }},
        {{all_day, R"("duration":"P2D")", R"("dtstart":"1393459200000")"},
         [](const std::string&) {
             return std::string("start=2014-2-27; end=2014-3-1; is_allday=1; has_start=1; ");
         }},
        {{all_day, instance},
         [](const std::string& order) {
             const std::string id = order.find("allDay") == 1 ? "20140315" : "20140315T000000Z";
             return "start=1970-1-1; end=1970-1-1; recurrence_id=" + id +
                    "; status=1; exdate=" + id + "; is_allday=1; ";
         }},
        {{R"("eventStatus":"2")", R"("original_sync_id":"parent")", instance},
         [](const std::string&) -> std::string {
             return "original_event_id=5; recurrence_id=20140315T000000Z; parent=5; status=2; "
                    "exdate=20140315T000000Z; ";
         }},
    };
    for (auto c : cases) {
        std::sort(c.members.begin(), c.members.end());
        do {
            const std::string order = joined(c.members);
            SCOPED_TRACE(order);
            const Parsed parsed(event(order));
            EXPECT_EQ(parsed.result, 0);
            EXPECT_EQ(row_text(parsed.row), c.stored(order));
        } while (std::next_permutation(c.members.begin(), c.members.end()));
    }
}

TEST_F(EventDocumentTest, WholeDocumentsAreRead) {
    const struct {
        const char* name;
        std::string text;
        int result;
        const char* stored;
        std::vector<LogLine> logged = {};
    } cases[] = {
        {"weekly with two reminders",
         R"({"EVENT":{"title":"Stand-up","dtstart":"1394875800000","dtend":"1394877600000",
             "eventTimezone":"Etc/GMT","rrule":"FREQ=WEEKLY;UNTIL=20141231T000000Z"},
             "REMINDERS":[{"method":"1","minutes":"10"},{"minutes":"60"}],"unknown":[1]})",
         0,
         "summary=Stand-up; start=1394875800; end=1394877600; start_tzid=Etc/GMT; "
         "end_tzid=Etc/GMT; freq=2; range=0; until=1419984000; alarm=10*60; alarm=60*60; "
         "has_start=1; "},
        {"reminders first", R"({"REMINDERS":[{"minutes":"1"}],"EVENT":{"title":"x"}})", 0,
         "summary=x; alarm=1*60; "},
        {"empty members", R"({"EVENT":{},"REMINDERS":[]})", 0, ""},
        {"error object first", R"({"error":{"code":"1"},"EVENT":{"title":"x"}})", -1, ""},
        {"error array last", R"({"EVENT":{"title":"x"},"error":[]})", -1, "summary=x; "},
        {"error text", R"({"error":"no","EVENT":{"title":"x"}})", 0, "summary=x; "},
        {"error number and null", R"({"error":1,"EVENT":{"title":"x"}})", 0, "summary=x; "},
        {"error null", R"({"error":null})", 0, ""},
        {"error in a reminder",
         R"({"REMINDERS":[{"minutes":"1"},{"error":"x"}]})",
         -1,
         "alarm=1*60; ",
         {critical(kParse, kReminderFail)}},
        {"a rule that is none",
         event(R"("title":"x","rrule":"freq=daily","dtend":"1")"),
         -1,
         "summary=x; ",
         {critical(kSetValue, "set fail"), critical(kParse, "set fail")}},
        {"scalar elements", R"({"REMINDERS":[1,"x",null,true,[],{"minutes":"2"}]})", 0,
         "alarm=0*0; alarm=0*0; alarm=0*0; alarm=0*0; alarm=0*0; alarm=2*60; "},
        {"reminders in an object", R"({"REMINDERS":{"a":{"minutes":"3"},"minutes":"4"}})", 0,
         "alarm=3*60; alarm=0*0; "},
        {"event in an array", R"({"EVENT":["title",{"title":"x"}]})", 0, ""},
        {"scalar members", R"({"EVENT":"title","REMINDERS":7})", 0, ""},
        {"null members", R"({"a":"x","EVENT":null,"REMINDERS":null})", 0, ""},
        {"a root array", R"([{"EVENT":{"title":"x"}},{"error":{}}])", 0, ""},
        {"a root text", R"("EVENT")", 0, ""},
        {"a root number", "42", 0, ""},
        {"a root truth value", "true", 0, ""},
        {"a root null", "null", 0, ""},
        {"no JSON", "EVENT", 0, ""},
        {"half a document", R"({"EVENT":{"title":"x"})", 0, ""},
        {"invalid UTF-8", event("\"title\":\"\xc3\x28\""), 0, ""},
        {"a million levels", "{\"EVENT\":" + std::string(1000000, '['), 0, ""},
        {"a million levels in reminders",
         "{\"REMINDERS\":" + std::string(1000000, '[') + std::string(1000000, ']') + "}", 0, ""},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.name);
        PrintCapture printed;  // a root without children is told of
        const Parsed parsed(c.text);
        EXPECT_EQ(parsed.result, c.result);
        EXPECT_EQ(row_text(parsed.row), c.stored);
        EXPECT_EQ(log(), c.logged);
    }
}

TEST_F(EventDocumentTest, LargeDocumentsAreReadInTime) {
    std::string members;
    std::string reminders;
    for (int i = 0; i < (kIsSanitized ? 4000 : 40000); ++i) {
        members += "\"" + std::to_string(i) + "\":\"\",";
        reminders += i == 0 ? "1" : ",1";
    }
    const std::string title(5000000, 'x');
    const std::string texts[] = {
        event(members + "\"title\":\"" + title + "\""),
        "{" + members + "\"EVENT\":{\"title\":\"" + title + "\"}}",
        "{\"EVENT\":{\"title\":\"" + title + "\"},\"REMINDERS\":[{" + members + "\"a\":[" +
            reminders + "]}]}",
    };
    const std::chrono::seconds limit(kIsSanitized ? 60 : 2);
    for (const std::string& text : texts) {
        const auto start = std::chrono::steady_clock::now();
        const Parsed parsed(text);
        EXPECT_LT(std::chrono::steady_clock::now() - start, limit);
        EXPECT_EQ(parsed.result, 0);
        EXPECT_EQ(property_text(parsed.row.record, _calendar_event.summary), title);
    }
}

TEST_F(EventDocumentTest, UnusableArgumentsAreRefused) {
    const std::string text = event(R"("title":"x")");
    const Record record = new_record(_calendar_event._uri);
    calendar_adapter_row row{};
    row.record = record.get();
    calendar_adapter_row empty{};
    const struct {
        calendar_adapter_row* row;
        const char* text;
        size_t length;
        int flags;
        int result;
    } cases[] = {
        {&row, nullptr, text.size(), 0, 4},
        {&empty, text.c_str(), text.size(), 0, 4},
        {nullptr, text.c_str(), text.size(), 0, 4},
        {&row, text.c_str(), 0, 0, 4},
        {&row, text.c_str(), 0, 1, 0},
        {&row, text.c_str(), SIZE_MAX, 0, 0},
    };
    for (const auto& c : cases) {
        PrintCapture printed;
        EXPECT_EQ(_qor_calendar_parse_event_from_json(c.text, 0, c.length, c.flags, c.row),
                  c.result);
        EXPECT_EQ(event_text(record.get()), "");
        EXPECT_EQ(log(),
                  c.result == 0 ? std::vector<LogLine>{} : std::vector{critical(kParse, "error")});
    }
}

TEST_F(EventDocumentTest, AFailedCallIsReportedAndKeepsWhatWasStored) {
    const std::string instance = R"("originalInstanceTime":"0")";
    const std::string waiting = R"("duration":"PT1H","dtstart":"1000")";
    const std::string alarm = R"({"REMINDERS":[{"minutes":"1"}],"EVENT":{"title":"x"}})";
    const std::vector<LogLine> set = {critical(kSetValue, "set fail"),
                                      critical(kParse, "set fail")};
    const std::vector<LogLine> get = {critical(kSetValue, "get fail"),
                                      critical(kParse, "set fail")};
    const std::vector<LogLine> no_alarm = {critical(kParse, kReminderFail)};
    const struct {
        const char* function;
        int nth;
        std::string text;
        std::vector<LogLine> logged;  // of this module: without, the reading succeeds
        const char* stored = "";
    } cases[] = {
        {"calendar_record_set_str", 1, event(R"("title":"x")"), set},
        {"calendar_record_set_str", 2, event(R"("title":"x","description":"y")"), set,
         "summary=x; "},
        {"calendar_record_set_str", 2, event(R"("eventTimezone":"Asia/Seoul")"), set,
         "start_tzid=Asia/Seoul; "},
        {"calendar_record_set_str", 2, event(R"("organizer":"x")"), set, "organizer_email=x; "},
        {"calendar_record_get_caltime", 1, event(R"("dtstart":"1000")"), get},
        {"calendar_record_set_caltime", 1, event(R"("dtstart":"1000")"), set},
        {"calendar_record_get_caltime", 1, event(R"("dtend":"1000")"), set},
        {"calendar_record_set_caltime", 1, event(R"("dtend":"1000")"), set},
        {"calendar_record_get_caltime", 2, event(waiting), set, "start=1; has_start=1; "},
        {"calendar_record_set_caltime", 2, event(waiting), {}, "start=1; has_start=1; "},
        {"calendar_record_get_caltime", 2, event(R"("dtstart":"0","duration":"P1D")"), set,
         "has_start=1; "},
        {"strdup", 1, event(R"("duration":"PT1H")"), set},
        {"calendar_record_get_caltime", 1, event(R"("allDay":"1")"), get, "is_allday=1; "},
        {"calendar_record_set_caltime", 1, event(R"("allDay":"1")"), set, "is_allday=1; "},
        {"ucal_open", 1, event(R"("allDay":"1")"), set, "is_allday=1; "},
        {"calendar_record_get_caltime", 2, event(R"("allDay":"1")"), get,
         "start=1970-1-1; is_allday=1; "},
        {"calendar_record_set_caltime", 2, event(R"("allDay":"1")"), set,
         "start=1970-1-1; is_allday=1; "},
        {"calendar_record_set_int", 1, event(R"("accessLevel":"0")"), set},
        {"calendar_record_get_uri_p", 1, event(R"("rrule":"FREQ=DAILY")"), set},
        {"calendar_record_set_int", 2, event(R"("rrule":"FREQ=DAILY")"), set},
        {"calendar_record_set_double", 1, event(R"("longitude":"1")"), set},
        {"calendar_record_set_double", 1, event(R"("latitude":"1")"), set},
        {"calendar_record_set_int", 1, event(R"("original_sync_id":"parent")"), set},
        {"sqlite3_prepare_v2",
         1,
         event(R"("original_sync_id":"parent")"),
         {},
         "parent_key=parent; status=1; invalid=1; "},
        {"sqlite3_prepare_v2",
         2,
         event(R"("original_sync_id":"parent")"),
         {},
         "parent_key=parent; status=1; invalid=1; "},
        {"strdup", 1, event(R"("original_sync_id":"unknown")"), set, "status=1; invalid=1; "},
        {"calendar_record_set_str", 1, event(instance), set, "exdate=19700101T000000Z; "},
        {"ucal_open", 1, event(instance), {}, ""},
        {"calendar_record_create", 1, alarm, {critical(kParse, "set fail")}},
        {"calendar_record_set_int",
         1,
         alarm,
         {critical(kReminder, "set fail"), critical(kParse, kReminderFail)}},
        {"calendar_record_add_child_record", 1, alarm, no_alarm},
        {"json_parser_new", 1, alarm, {}, ""},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(testing::Message() << c.function << ' ' << c.nth << ' ' << c.text);
        PrintCapture printed;
        const Parsed parsed(c.text, c.function, c.nth);
        EXPECT_TRUE(faults::fired());
        faults::clear();
        EXPECT_EQ(parsed.result, c.logged.empty() ? 0 : -1);
        EXPECT_EQ(row_text(parsed.row), c.stored);
        std::vector<LogLine> logged = log();
        std::erase_if(logged, [](const LogLine& line) {
            return line.function != kParse && line.function != kSetValue &&
                   line.function != kReminder;
        });
        EXPECT_EQ(logged, c.logged);
    }
}

// Once everything is warm, a document that has been read and released leaves the heap as it was.
TEST_F(EventDocumentTest, OnlyAMemberThatIsNotStoredKeepsItsDocument) {
    constexpr std::ptrdiff_t kSmallestTree = 300;  // bytes; the member's text is far less
    const std::string whole = R"({"EVENT":{"title":"x","duration":"P1D","original_sync_id":"k",
        "originalInstanceTime":"0"},"REMINDERS":[{"minutes":"5"},"x"],"x":"y"})";
    const struct {
        std::string text;
        const char* failing = "";
        bool is_kept = false;
    } cases[] = {
        {whole},
        {R"({"x":"y","error":{}})"},
        {R"({"REMINDERS":[{"minutes":"5"},{"error":"x"}]})"},
        {R"("text")"},
        {R"("EVENT":)"},
        {whole, "calendar_record_create"},
        {whole, "calendar_record_add_child_record"},
        {whole, "calendar_record_set_int"},
        {whole, "calendar_record_set_str", true},
        {event(R"("title":"x","rrule":"no rule")"), "", true},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.text + c.failing);
        const auto read = [&c] {
            PrintCapture printed;
            { const Parsed parsed(c.text, *c.failing != '\0' ? c.failing : nullptr, 1); }
            faults::clear();
            faults::take_log();
        };
        const std::ptrdiff_t growth = heap_growth(read);
        EXPECT_TRUE(c.is_kept ? growth > kSmallestTree : growth == 0) << growth;
    }
}

}  // namespace
