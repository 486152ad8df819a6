// SPDX-License-Identifier: Apache-2.0
//
// The adapter as a host drives it: the built library, loaded at run time, over the real calendar.
#include <glib.h>

#include <algorithm>
#include <cstdlib>
#include <nlohmann/json.hpp>

#include "tests/support/adapter.h"
#include "tests/support/device_test.h"

namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using Json = nlohmann::ordered_json;

constexpr char kGet[] = "qor_adapter_data_sync_get_value";
constexpr char kInsert[] = "qor_adapter_data_sync_insert_value";
constexpr char kUpdate[] = "qor_adapter_data_sync_update_value";
constexpr char kDelete[] = "qor_adapter_data_sync_delete_value";
constexpr char kSvcInsert[] = "_qor_calendar_event_svc_insert";
constexpr char kSvcUpdate[] = "_qor_calendar_event_svc_update";
constexpr char kSvcDelete[] = "_qor_calendar_event_svc_delete";
constexpr char kRetry[] = "__qor_calendar_event_svc_insert_change";
constexpr char kRetryExdate[] = "__qor_calendar_event_svc_insert_exdate";

// 2026-01-05 09:00 UTC, and the same hour of the next days.
constexpr int64_t kStart = 1767603600000;
constexpr int64_t kDay = 86400000;

std::string event(const std::string& title, const Json& more = Json::object()) {
    Json members = {{"title", title},
                    {"dtstart", std::to_string(kStart)},
                    {"dtend", std::to_string(kStart + 3600000)},
                    {"eventTimezone", "Etc/GMT"}};
    members.update(more);
    return Json{{"EVENT", members}}.dump();
}

std::string weekly(const std::string& title) {
    return event(title, {{"rrule", "FREQ=DAILY"}});
}

std::string occurrence(const std::string& title, const std::string& parent_key, int64_t instant,
                       bool cancelled) {
    Json more = {{"original_sync_id", parent_key},
                 {"originalInstanceTime", std::to_string(instant)}};
    if (cancelled) {
        more["eventStatus"] = "2";
    }
    return event(title, more);
}

class ValuesTest : public DeviceTest {
  protected:
    ValuesTest() : adapter_(kFaultyLibrary) {
        faults()->clear();
        faults::take_log(faults());
        start();
    }
    ~ValuesTest() override {
        faults()->clear();
        if (retry_timer() != nullptr) {
            run_retry();
        }
        adapter_.data_sync_deinitialize(0);
    }

    void start() {
        EXPECT_EQ(adapter_.data_sync_initialize(3, 0), 0);
        EXPECT_EQ(adapter_.data_sync_set_data_changed_cb(count_call, &calls_), 0);
        lines();
        // Subscribed after the adapter, so told after it.
        EXPECT_EQ(calendar_connect(), 0);
        EXPECT_EQ(calendar_db_add_changed_cb(_calendar_event._uri, note_version, &seen_version_),
                  0);
        book_ = newest_book();
    }

    const FaultControl* faults() const { return adapter_.faults(); }
    std::vector<LogLine> lines() const { return faults::take_log(faults()); }

    std::string insert(const std::string& document) {
        char* id = nullptr;
        EXPECT_EQ(adapter_.data_sync_insert_value(nullptr, document.c_str(), &id), 0);
        std::string text = id != nullptr ? id : "(none)";
        free(id);
        return text;
    }
    // Inserts an item that the host then knows by a cloud key.
    std::string insert(const std::string& document, const std::string& cloud_key) {
        std::string id = insert(document);
        add_cloud_key(std::stoi(id), cloud_key);
        return id;
    }
    Json get(const std::string& id) {
        char* text = nullptr;
        EXPECT_EQ(adapter_.data_sync_get_value(id.c_str(), "log", &text), 0) << id;
        Json document = text != nullptr ? Json::parse(text) : Json();
        free(text);
        return document;
    }
    int update(const std::string& id, const std::string& document) {
        return adapter_.data_sync_update_value(nullptr, id.c_str(), document.c_str());
    }

    static int event_of(const std::string& id) {
        return std::stoi(query(kAdapterFile,
                               "SELECT calsvc_id FROM qor_event_data_table WHERE "
                               "adapter_id=" +
                                   id));
    }
    static std::string row_of(const std::string& id) {
        return query(kAdapterFile,
                     "SELECT calsvc_id>0, calsvc_ori_id, exception_status, invalid, "
                     "value IS NULL, exdate FROM qor_event_data_table WHERE "
                     "adapter_id=" +
                         id);
    }
    static std::string versions() {
        return query(kAdapterFile, "SELECT id, version FROM qor_event_table ORDER BY rowid");
    }

    // Runs the main loop until every change so far has been notified: whether the host was told.
    bool told_of_changes() {
        const int before = calls_;
        EXPECT_TRUE(run_until([this] { return seen_version_ >= current_version(); }));
        return calls_ != before;
    }

    std::vector<std::string> dirty() { return ids(adapter_.data_sync_get_dirty_ids_p); }
    std::vector<std::string> deleted() { return ids(adapter_.data_sync_get_deleted_ids_p); }
    static std::vector<std::string> ids(int (*query_ids)(char***, int*)) {
        char** texts = nullptr;
        int count = 0;
        EXPECT_LE(query_ids(&texts, &count), 1);
        std::vector<std::string> result;
        for (int i = 0; i < count; ++i) {
            result.emplace_back(texts[i]);
            free(texts[i]);
        }
        free(texts);
        return result;
    }

    // The pending retry: the only source of the default context without user data.
    static GSource* retry_timer() {
        return g_main_context_find_source_by_user_data(nullptr, nullptr);
    }
    // Makes the retry due and runs it.
    static void run_retry() {
        GSource* timer = retry_timer();
        ASSERT_NE(timer, nullptr);
        g_source_set_ready_time(timer, 0);
        EXPECT_TRUE(run_until([] { return retry_timer() == nullptr; }));
    }

    static void count_call(void* calls) { ++*static_cast<int*>(calls); }
    static void note_version(const char* /*view_uri*/, void* version) {
        *static_cast<int*>(version) = current_version();
    }

    LoadedAdapter adapter_;
    int book_ = 0;
    int calls_ = 0;
    int seen_version_ = 0;  // the calendar's version at the latest notification
};

TEST_F(ValuesTest, WhatTheHostInsertsIsReadBackAndNeverEchoed) {
    const std::string id = insert(event("Lunch"));
    EXPECT_EQ(id, "1");
    EXPECT_EQ(get(id)["EVENT"]["title"], "Lunch");
    EXPECT_EQ(row_of(id), "1|0|0|0|1|(null)");
    EXPECT_EQ(update(id, event("Late lunch")), 0);
    EXPECT_EQ(get(id)["EVENT"]["title"], "Late lunch");
    EXPECT_EQ(adapter_.data_sync_delete_value(insert(event("Gone")).c_str()), 0);
    EXPECT_FALSE(told_of_changes());
    EXPECT_THAT(dirty(), IsEmpty());
    EXPECT_THAT(lines(), IsEmpty());
}

TEST_F(ValuesTest, AUsersEditComesBackWithJustThatEdit) {
    const std::string id = insert(event("Lunch"));
    const Json before = get(id);
    ASSERT_FALSE(told_of_changes());
    set_text(event_of(id), _calendar_event.location, "Harbour");
    EXPECT_TRUE(told_of_changes());
    EXPECT_THAT(dirty(), ElementsAre(id));
    Json after = get(id);
    EXPECT_EQ(after["EVENT"]["eventLocation"], "Harbour");
    after["EVENT"].erase("eventLocation");
    EXPECT_EQ(after, before);
    ASSERT_EQ(calendar_db_delete_record(_calendar_event._uri, event_of(id)), 0);
    EXPECT_TRUE(told_of_changes());
    EXPECT_THAT(deleted(), ElementsAre(id));
    EXPECT_EQ(adapter_.data_sync_clear_deleted_ids(), 0);
    EXPECT_THAT(deleted(), IsEmpty());
}

TEST_F(ValuesTest, ArgumentsAreCheckedBeforeTheState) {
    adapter_.data_sync_deinitialize(0);
    lines();
    char* text = nullptr;
    EXPECT_EQ(adapter_.data_sync_get_value(nullptr, "x", &text), 6);
    EXPECT_EQ(adapter_.data_sync_get_value("1", "x", nullptr), 6);
    EXPECT_EQ(adapter_.data_sync_get_value("1", "x", &text), 6);
    EXPECT_EQ(adapter_.data_sync_insert_value(nullptr, nullptr, &text), 6);
    EXPECT_EQ(adapter_.data_sync_insert_value(nullptr, "{}", nullptr), 6);
    EXPECT_EQ(adapter_.data_sync_update_value(nullptr, nullptr, "{}"), 6);
    EXPECT_EQ(adapter_.data_sync_update_value(nullptr, "1", nullptr), 6);
    EXPECT_EQ(adapter_.data_sync_update_value(nullptr, "1", "{}"), 6);
    EXPECT_EQ(adapter_.data_sync_delete_value(nullptr), 6);
    EXPECT_EQ(adapter_.data_sync_delete_value("1"), 6);
    EXPECT_EQ(text, nullptr);
    const LogLine expected[] = {
        critical(kGet, "value is null"),    critical(kGet, "value is null"),
        warning(kGet, "not initialize"),    critical(kInsert, "value is null"),
        warning(kInsert, "not initialize"), critical(kUpdate, "value is null"),
        critical(kUpdate, "value is null"), warning(kUpdate, "not initialize"),
        critical(kDelete, "value is null"), warning(kDelete, "not initialize")};
    EXPECT_THAT(lines(), ::testing::ElementsAreArray(expected));
}

TEST_F(ValuesTest, IdTextsAreReadAsFarAsTheyAreNumbers) {
    const std::string id = insert(event("Lunch"));
    for (const char* text : {"1abc", " 1", "+1", "01"}) {
        EXPECT_EQ(get(text)["EVENT"]["title"], "Lunch") << text;
    }
    char* document = nullptr;
    for (const char* text :
         {"abc", "", "-1", "4294967297", "99999999999999999999", "-99999999999999999999", "2"}) {
        EXPECT_EQ(adapter_.data_sync_get_value(text, "x", &document), 6) << text;
        EXPECT_THAT(lines(), ElementsAre(critical(kGet, "db_get_adapter fail")));
        EXPECT_EQ(adapter_.data_sync_delete_value(text), 6) << text;
        EXPECT_THAT(lines(), ElementsAre(critical(kSvcDelete, "db_get_adapter fail"),
                                         critical(kDelete, "delete fail")));
        EXPECT_EQ(update(text, event("x")), 6) << text;
        EXPECT_THAT(lines(), ElementsAre(critical(kSvcUpdate, "db_get_adapter fail"),
                                         critical(kUpdate, "db_update fail")));
    }
    EXPECT_EQ(row_of(id), "1|0|0|0|1|(null)");
}

TEST_F(ValuesTest, ADocumentThatFailsIsRefusedByInsertAndAppliedByUpdate) {
    const std::string id = insert(event("Lunch"));
    const std::string broken = R"({"EVENT":{"title":"Half"},"error":{"code":"1"}})";
    char* new_id = nullptr;
    EXPECT_EQ(adapter_.data_sync_insert_value(nullptr, broken.c_str(), &new_id), 6);
    EXPECT_EQ(new_id, nullptr);
    EXPECT_THAT(lines(), ElementsAre(critical(kInsert, "parse_event_from_json fail")));
    EXPECT_EQ(adapter_.data_sync_insert_value(nullptr, "", &new_id), 6);
    lines();
    EXPECT_EQ(update(id, broken), 0);  // Deliberate: with what was read before the failure.
    EXPECT_EQ(get(id)["EVENT"]["title"], "Half");
    // A host without a place for the number gets none.
    EXPECT_EQ(adapter_.data_sync_insert_value(nullptr, event("Dinner").c_str(), nullptr), 0);
    EXPECT_EQ(get("2")["EVENT"]["title"], "Dinner");
}

TEST_F(ValuesTest, OccurrencesAfterTheirParentAreAppliedAtOnce) {
    const std::string parent = insert(weekly("Stand-up"), "parent-key");
    const int parent_event = event_of(parent);
    const std::string p = std::to_string(parent_event);
    const std::string cancelled = insert(occurrence("x", "parent-key", kStart + kDay, true));
    EXPECT_EQ(row_of(cancelled), "0|" + p + "|2|0|1|20260106T090000Z");
    const std::string again = insert(occurrence("x", "parent-key", kStart + 2 * kDay, true));
    insert(occurrence("x", "parent-key", kStart + 2 * kDay, true));
    // A comma and a blank, and no duplicate test.
    EXPECT_EQ(text(read(parent_event), _calendar_event.exdate),
              "20260106T090000Z, 20260107T090000Z, 20260107T090000Z");
    const std::string changed = insert(occurrence("Moved", "parent-key", kStart + 3 * kDay, false));
    EXPECT_EQ(row_of(changed), "1|" + p + "|1|0|1|20260108T090000Z");
    EXPECT_EQ(number(read(event_of(changed)), _calendar_event.original_event_id), parent_event);
    // The write of the occurrence is noted for the parent too.
    const std::string noted = versions();
    const std::string version = std::to_string(current_version());
    EXPECT_TRUE(noted.ends_with(std::to_string(event_of(changed)) + "|" + version + "\n" + p + "|" +
                                version))
        << noted;

    Json document = get(cancelled);
    EXPECT_EQ(document["EVENT"]["eventStatus"], "2");
    EXPECT_EQ(document["EVENT"]["original_sync_id"], "parent-key");
    EXPECT_EQ(document["EVENT"]["originalInstanceTime"], std::to_string(kStart + kDay));
    EXPECT_FALSE(document["EVENT"].contains("rrule"));
    EXPECT_EQ(get(changed)["EVENT"]["eventStatus"], "0");
    EXPECT_EQ(update(cancelled, event("x")), 6);  // a cancelled occurrence has no event
    EXPECT_THAT(lines(), ElementsAre(critical(kUpdate, "db_update fail")));
    EXPECT_EQ(adapter_.data_sync_delete_value(cancelled.c_str()), 0);
    EXPECT_THAT(lines(), ElementsAre(critical(kSvcDelete, "svc_id is nothing")));
    EXPECT_EQ(row_of(cancelled), "");
    EXPECT_NE(row_of(again), "");
    EXPECT_EQ(adapter_.data_sync_delete_value(parent.c_str()), 0);
    EXPECT_EQ(query(kAdapterFile, "SELECT count(*) FROM qor_event_data_table"), "0");
    // The service deleted the occurrence with its parent, and only the parent is noted as own: the
    // host is told of a deletion that names no item.
    EXPECT_TRUE(told_of_changes());
    EXPECT_THAT(dirty(), IsEmpty());
    EXPECT_THAT(deleted(), ElementsAre("-1"));
}

TEST_F(ValuesTest, OccurrencesBeforeTheirParentWaitForTheRetry) {
    const std::string changed = insert(occurrence("Moved", "parent-key", kStart + kDay, false));
    const std::string cancelled = insert(occurrence("x", "parent-key", kStart + 2 * kDay, true));
    EXPECT_EQ(row_of(changed), "0|0|1|1|0|20260106T090000Z");
    EXPECT_EQ(row_of(cancelled), "0|0|2|1|0|20260107T090000Z");
    EXPECT_EQ(retry_timer(), nullptr);  // what waits does not arm it
    const std::string parent = insert(weekly("Stand-up"));
    GSource* const first = retry_timer();
    ASSERT_NE(first, nullptr);
    const gint64 due = g_source_get_ready_time(first) - g_get_monotonic_time();
    EXPECT_GT(due, gint64{58} * G_USEC_PER_SEC);
    EXPECT_LE(due, gint64{61} * G_USEC_PER_SEC);
    lines();
    run_retry();  // the host does not know the parent's key yet
    EXPECT_THAT(lines(), ElementsAre(critical(kRetryExdate, "get svc_id fail!")));
    add_cloud_key(std::stoi(parent), "parent-key");
    insert(event("Another"));
    const guint armed = g_source_get_id(retry_timer());
    insert(event("And another"));
    EXPECT_NE(g_source_get_id(retry_timer()), armed);  // each insert arms it anew
    const std::string before = versions();
    run_retry();
    EXPECT_THAT(lines(), IsEmpty());
    const int parent_event = event_of(parent);
    const std::string p = std::to_string(parent_event);
    EXPECT_EQ(row_of(changed), "1|" + p + "|1|0|0|20260106T090000Z");
    EXPECT_EQ(row_of(cancelled), "0|" + p + "|2|0|0|20260107T090000Z");
    EXPECT_EQ(text(read(parent_event), _calendar_event.exdate), "20260107T090000Z");
    EXPECT_EQ(number(read(event_of(changed)), _calendar_event.original_event_id), parent_event);
    // Noted for the occurrence alone, unlike an insert, and for the parent's list.
    const int version = current_version();
    EXPECT_EQ(versions(), before + "\n" + std::to_string(event_of(changed)) + "|" +
                              std::to_string(version - 1) + "\n" + p + "|" +
                              std::to_string(version));
}

TEST_F(ValuesTest, TheRetryAddsWithoutABlankAndClearsAListThatHasTheEntry) {
    const std::string parent = insert(weekly("Stand-up"));
    const int parent_event = event_of(parent);
    add_cloud_key(std::stoi(parent), "parent-key");
    const auto retry_with = [&](const char* old_list, int64_t instant) {
        set_text(parent_event, _calendar_event.exdate, old_list);
        run_sql(kHostFile, "DELETE FROM datasync_table");
        const std::string id = insert(occurrence("x", "parent-key", instant, true));
        add_cloud_key(std::stoi(parent), "parent-key");
        insert(event("arms the timer"));
        run_retry();
        return text(read(parent_event), _calendar_event.exdate);
    };
    EXPECT_EQ(retry_with(nullptr, kStart), "20260105T090000Z");
    EXPECT_EQ(retry_with("", kStart), "20260105T090000Z");
    EXPECT_EQ(retry_with("20260105T090000Z", kStart + kDay), "20260105T090000Z,20260106T090000Z");
    EXPECT_EQ(retry_with("20260105T090000Z,20260106T090000Z", kStart + kDay), "");
    EXPECT_EQ(retry_with("x20260105T090000Zx", kStart), "");  // a substring counts as listed
    const std::string full(2040, '9');
    lines();
    EXPECT_EQ(retry_with(full.c_str(), kStart), full);  // never cut
    EXPECT_THAT(lines(), ElementsAre(critical(kRetryExdate, "fail")));
}

TEST_F(ValuesTest, ARetryThatFailsSaysSoAndIsMadeAgain) {
    const std::string id = insert(occurrence("Moved", "parent-key", kStart + kDay, false));
    insert(weekly("Stand-up"), "parent-key");
    const struct {
        const char* function;
        const char* message;
    } cases[] = {{"calendar_record_create", "record_create fail"},
                 {"calendar_record_set_str", "parse_event_from_json fail"},
                 {"calendar_db_insert_record", "db_insert fail"}};
    for (const auto& c : cases) {
        insert(event("arms the timer"));
        lines();
        faults()->fail(c.function, 1);
        run_retry();
        faults()->clear();
        EXPECT_THAT(lines(), ::testing::Contains(critical(kRetry, c.message)));
        EXPECT_EQ(row_of(id), "0|0|1|1|0|20260106T090000Z");
    }
    insert(event("arms the timer"));
    run_retry();
    EXPECT_EQ(get(id)["EVENT"]["title"], "Moved");
}

TEST_F(ValuesTest, AListThatIsFullIsNeverCut) {
    const std::string parent = insert(weekly("Stand-up"), "parent-key");
    const int parent_event = event_of(parent);
    const std::string list(2047 - 18, '9');
    set_text(parent_event, _calendar_event.exdate, list.c_str());
    lines();
    insert(occurrence("x", "parent-key", kStart, true));
    EXPECT_EQ(text(read(parent_event), _calendar_event.exdate), list + ", 20260105T090000Z");
    EXPECT_THAT(lines(), IsEmpty());
    const std::string id = insert(occurrence("x", "parent-key", kStart + kDay, true));
    EXPECT_EQ(text(read(parent_event), _calendar_event.exdate), list + ", 20260105T090000Z");
    EXPECT_EQ(row_of(id).substr(0, 1), "0");
    EXPECT_THAT(lines(), ElementsAre(critical(kSvcInsert, "fail")));
}

TEST_F(ValuesTest, AnOccurrenceWhoseParentIsGoneKeepsItsNumberOnly) {
    const std::string parent = insert(weekly("Stand-up"), "parent-key");
    const int parent_event = event_of(parent);
    ASSERT_EQ(calendar_db_delete_record(_calendar_event._uri, parent_event), 0);
    lines();
    const std::string cancelled = insert(occurrence("x", "parent-key", kStart, true));
    EXPECT_THAT(lines(), ElementsAre(critical(kSvcInsert, "calendar_db_get_record fail. id=[" +
                                                              std::to_string(parent_event) + "]")));
    EXPECT_EQ(row_of(cancelled).substr(0, 2), "0|");
    const std::string changed = insert(occurrence("x", "parent-key", kStart, false));
    EXPECT_THAT(lines(), IsEmpty());
    EXPECT_EQ(row_of(changed).substr(0, 2), "0|");
    EXPECT_EQ(update(changed, event("x")), 6);
    // Neither can be applied later: they kept no document.
    insert(event("arms the timer"));
    lines();
    run_retry();
    EXPECT_THAT(lines(), ElementsAre(critical(kRetryExdate, "value is null")));
    run_sql(kAdapterFile,
            "UPDATE qor_event_data_table SET ori_cloud_key='parent-key' WHERE "
            "adapter_id=" +
                changed);
    insert(event("arms the timer"));
    run_retry();
    EXPECT_THAT(lines(), ElementsAre(critical(kRetryExdate, "value is null"),
                                     critical(kRetry, "value is null")));
    run_sql(kAdapterFile, "UPDATE qor_event_data_table SET calsvc_id=0 WHERE adapter_id=" + parent);
    insert(event("arms the timer"));
    run_retry();
    EXPECT_THAT(lines(), ElementsAre(critical(kRetryExdate, "value is null"),
                                     critical(kRetry, "ori_svc_id <= 0")));
}

TEST_F(ValuesTest, ACancelledOccurrenceWithoutItsInstantTakesTheFailurePath) {
    const std::string parent = insert(weekly("Stand-up"), "parent-key");
    const std::string id =
        insert(event("x", {{"original_sync_id", "parent-key"}, {"eventStatus", "2"}}));
    EXPECT_THAT(lines(),
                ElementsAre(critical(kSvcInsert, "calendar_db_get_record fail. id=[" +
                                                     std::to_string(event_of(parent)) + "]")));
    EXPECT_EQ(text(read(event_of(parent)), _calendar_event.exdate), "(null)");
    EXPECT_EQ(row_of(id), "0|" + std::to_string(event_of(parent)) + "|2|1|1|(null)");
}

TEST_F(ValuesTest, AnItemThatStandsForNothingAnswersWithTheLogCallsResult) {
    const std::string id = insert(occurrence("x", "no-such-key", kStart, false));
    char* document = nullptr;
    const int result = adapter_.data_sync_get_value(id.c_str(), "second", &document);
    EXPECT_GT(result, 6);
    EXPECT_EQ(document, nullptr);
    EXPECT_THAT(lines(), ElementsAre(critical(kGet, "fail(0,0," + id + ",second)")));
    EXPECT_GT(adapter_.data_sync_get_value(id.c_str(), nullptr, &document), 6);
}

TEST_F(ValuesTest, AFailedWriteStillGivesANumberAndAFailedRowGivesZero) {
    faults()->fail("calendar_db_insert_record", 1);
    const std::string failed = insert(event("Lunch"));
    EXPECT_EQ(row_of(failed), "0|0|0|1|1|(null)");
    EXPECT_EQ(retry_timer(), nullptr);
    faults()->fail("sqlite3_bind_text", 1);
    EXPECT_EQ(insert(event("Lunch")), "0");
    EXPECT_THAT(lines(), ElementsAre(critical("_qor_calendar_db_insert_adapter", "insert db fail"),
                                     critical(kSvcInsert, "adapter db fail")));
    const std::string id = insert(event("Lunch"));
    faults()->fail("calendar_db_replace_record", 1);
    EXPECT_EQ(update(id, event("Late")), 6);
    faults()->fail("calendar_db_delete_record", 1);
    EXPECT_EQ(adapter_.data_sync_delete_value(id.c_str()), 6);
    EXPECT_THAT(
        lines(),
        ElementsAre(critical(kSvcUpdate, "replace fail"), critical(kUpdate, "db_update fail"),
                    critical(kSvcDelete, "replace fail"), critical(kDelete, "delete fail")));
    EXPECT_EQ(get(id)["EVENT"]["title"], "Lunch");
}

TEST_F(ValuesTest, SigningOutAndInAgainStartsWithAnEmptyBook) {
    insert(weekly("Stand-up"), "parent-key");
    EXPECT_EQ(adapter_.data_sync_unset_data_changed_cb(), 0);
    EXPECT_EQ(adapter_.data_sync_deinitialize(1), 0);
    const int old_book = book_;
    start();
    EXPECT_NE(book_, old_book);
    EXPECT_FALSE(told_of_changes());
    EXPECT_EQ(insert(event("Lunch")), "2");  // numbers are not used again
}

}  // namespace
