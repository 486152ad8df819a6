// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>
#include <nlohmann/json.hpp>

#include "host/document/synced_document.h"

namespace qor {
namespace {

std::string event(const std::string& members) {
    return R"({"EVENT":{)" + members + "}}";
}

TEST(SyncedDocumentTest, RefusesWhatIsNoEventDocument) {
    const std::string deep = event("\"x\":" + std::string(100, '[') + std::string(100, ']'));
    const std::string million(1000000, '[');
    const std::string refused[] = {"",
                                   "null",
                                   "[]",
                                   "{}",
                                   R"({"EVENT":[]})",
                                   R"({"EVENT":{)",
                                   deep,
                                   million,
                                   "{\"EVENT\":{\"title\":\"\xff\"}}"};
    for (const std::string& text : refused) {
        EXPECT_FALSE(SyncedDocument::parse(text)) << text.substr(0, 40);
    }
    EXPECT_TRUE(SyncedDocument::parse(event(R"("title":"[[[[\"[[[[")")));
}

struct AgreeCase {
    const char* name;
    const char* one;
    const char* other;
    bool agree;
};

TEST(SyncedDocumentTest, ComparesWhatADeviceShows) {
    const AgreeCase cases[] = {
        {"order", R"("title":"a","dtstart":"0")", R"("dtstart":"0","title":"a")", true},
        {"empty is absent", R"("title":"")", "", true},
        {"title", R"("title":"a")", R"("title":"b")", false},
        {"unknown members", R"("colour":"red")", "", true},
        {"part of a second", R"("dtstart":"1999")", R"("dtstart":"1000")", true},
        {"all day keeps the date", R"("dtstart":"90000000","allDay":"1")",
         R"("dtstart":"86400000","allDay":"1")", true},
        {"all day", R"("allDay":"1")", "", false},
        {"before 1970", R"("dtstart":"-1000","allDay":"1")", R"("dtstart":"0","allDay":"1")",
         false},
        {"zone", R"("eventTimezone":"Asia/Tokyo")", "", false},
        {"rule prefix, order, interval", R"("rrule":"RRULE:FREQ=DAILY;COUNT=3")",
         R"("rrule":"COUNT=3;FREQ=DAILY;INTERVAL=1")", true},
        {"count", R"("rrule":"FREQ=DAILY;COUNT=3")", R"("rrule":"FREQ=DAILY;COUNT=4")", false},
        {"no rule", R"("rrule":"COUNT=3")", "", true},
        {"all-day until", R"("allDay":"1","rrule":"FREQ=DAILY;UNTIL=20260101")",
         R"("allDay":"1","rrule":"FREQ=DAILY;UNTIL=20260101T000000Z")", true},
        {"coordinates", R"("latitude":"0500000","longitude":"1000000000")",
         R"("latitude":"500000")", true},
        {"duration tells no end", R"("dtstart":"0","duration":"PT1H")",
         R"("dtstart":"0","dtend":"3600000")", true},
        {"cancelled: only parent and instant",
         R"("original_sync_id":"p","eventStatus":"2","originalInstanceTime":"5000","title":"a")",
         R"("original_sync_id":"p","eventStatus":"2","originalInstanceTime":"5000","title":"b")",
         true},
        {"cancelled: instant",
         R"("original_sync_id":"p","eventStatus":"2","originalInstanceTime":"5000")",
         R"("original_sync_id":"p","eventStatus":"2","originalInstanceTime":"6000")", false},
        {"changed occurrence as the device tells it",
         R"("original_sync_id":"p","originalInstanceTime":"5000","title":"a")", R"("title":"a")",
         true},
    };
    for (const AgreeCase& c : cases) {
        SCOPED_TRACE(c.name);
        const auto one = SyncedDocument::parse(event(c.one));
        const auto other = SyncedDocument::parse(event(c.other));
        ASSERT_TRUE(one && other);
        EXPECT_EQ(documents_agree(*one, *other), c.agree);
        EXPECT_EQ(documents_agree(*other, *one), c.agree);
    }
}

TEST(SyncedDocumentTest, CarriesADevicesChangeIntoTheCloudsDocument) {
    const auto cloud = SyncedDocument::parse(
        R"({"EVENT":{"title":"a","duration":"PT1H","dtstart":"0","colour":"red",)"
        R"("original_sync_id":"p"},"REMINDERS":[{"minutes":"5","sound":"bell"}],"extra":{}})");
    const auto before = SyncedDocument::parse(
        R"({"EVENT":{"title":"a","dtstart":"0","dtend":"3600000"},"REMINDERS":[{"minutes":"5"}]})");
    auto now = *before;
    now.set("title", "b");
    EXPECT_EQ(
        merge_changes(*cloud, *before, now).text(),
        R"({"EVENT":{"title":"b","duration":"PT1H","dtstart":"0","colour":"red",)"
        R"("original_sync_id":"p"},"REMINDERS":[{"minutes":"5","sound":"bell"}],"extra":{}})");
    now.set("dtend", "7200000");
    now.root()["REMINDERS"] = nlohmann::ordered_json::array();
    EXPECT_EQ(merge_changes(*cloud, *before, now).text(),
              R"({"EVENT":{"title":"b","dtstart":"0","colour":"red","original_sync_id":"p",)"
              R"("dtend":"7200000"},"REMINDERS":[],"extra":{}})");
}

TEST(SyncedDocumentTest, PutsTheInstantBehindWhatTellsItsKind) {
    const auto document = SyncedDocument::parse(event(
        R"("originalInstanceTime":"0","original_sync_id":"p","eventStatus":"2","allDay":"1")"));
    EXPECT_EQ(for_device(*document),
              event(R"("eventStatus":"2","allDay":"1","original_sync_id":"p",)"
                    R"("originalInstanceTime":"0")"));
}

TEST(SyncedDocumentTest, NamesItemsForPeople) {
    EXPECT_EQ(SyncedDocument::parse(event(R"("title":"x","dtstart":"1767625200000")"))->label(),
              "x (2026-01-05 15:00 UTC)");
    EXPECT_EQ(SyncedDocument::parse(event(R"("dtstart":"1767571200000","allDay":"1")"))->label(),
              "(no title) (2026-01-05)");
    EXPECT_EQ(
        SyncedDocument::parse(event(R"("title":"x","dtstart":"9223372036854775807")"))->label(),
        "x");
}

}  // namespace
}  // namespace qor
