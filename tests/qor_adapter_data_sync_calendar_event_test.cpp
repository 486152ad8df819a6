// SPDX-License-Identifier: Apache-2.0
#include "data-sync/qor_adapter_data_sync_calendar_event.h"

#include <cstdlib>
#include <cstring>

#include "data-sync/qor_adapter_data_sync_calendar_event_state.h"
#include "tests/support/device_test.h"

namespace {

using ::testing::ElementsAre;

constexpr char kInit[] = "qor_adapter_data_sync_initialize";
constexpr char kDeinit[] = "qor_adapter_data_sync_deinitialize";
constexpr char kUserName[] = "__qor_calendar_event_get_account_user_name";

class LifecycleTest : public DeviceTest {
  protected:
    ~LifecycleTest() override {
        faults::clear();
        if (calendar_adapter != nullptr) {
            qor_adapter_data_sync_deinitialize(0);
        }
        _qor_calendar_db_close();
    }

    static int map_rows() {
        return std::stoi(query(kAdapterFile, "SELECT count(*) FROM qor_event_data_table"));
    }
    static void add_map_row() {
        calendar_adapter_row row = {};
        row.calsvc_id = 5;
        ASSERT_EQ(_qor_calendar_db_insert_adapter(&row), 0);
    }
};

TEST_F(LifecycleTest, TheIdentityIsFixedAndNeedsNoInitialisation) {
    const struct {
        int (*get)(char**);
        const char* text;
    } cases[] = {{qor_adapter_get_cid, "p3RwQZ7mNa"},
                 {qor_adapter_get_type, "DATASYNC"},
                 {qor_adapter_get_name, "CALENDAR"}};
    for (const auto& c : cases) {
        char* text = nullptr;
        EXPECT_EQ(c.get(&text), 0);
        EXPECT_STREQ(MallocText(text).get(), c.text);
        faults::fail("strdup");
        text = strdup("old");
        faults::fail("strdup");
        free(text);
        EXPECT_EQ(c.get(&text), 0);
        EXPECT_EQ(text, nullptr);
        EXPECT_EQ(c.get(nullptr), 0);
    }
}

TEST_F(LifecycleTest, TheEntriesThatDoNothingSucceedInAnyState) {
    for (int (*const entry)() noexcept :
         {qor_adapter_data_sync_get_dependency, qor_adapter_data_sync_is_ors_supported,
          qor_adapter_data_sync_get_deleted_folder, qor_adapter_data_sync_set_metadata,
          qor_adapter_data_sync_completed, qor_adapter_data_sync_done,
          qor_adapter_data_sync_clear_dirty_ids}) {
        EXPECT_EQ(entry(), 0);
    }
    void* files = this;
    EXPECT_EQ(qor_adapter_data_sync_get_files_for_upsync(
                  nullptr, nullptr, nullptr, nullptr, nullptr, nullptr, nullptr, nullptr, &files),
              0);
    EXPECT_EQ(files, nullptr);
    files = this;
    EXPECT_EQ(qor_adapter_data_sync_get_files_for_downsync(nullptr, nullptr, nullptr, nullptr,
                                                           nullptr, &files),
              0);
    EXPECT_EQ(files, nullptr);
    EXPECT_EQ(qor_adapter_data_sync_get_files_for_downsync(nullptr, nullptr, nullptr, nullptr,
                                                           nullptr, nullptr),
              0);
}

TEST_F(LifecycleTest, TheFirstInitialiseMakesTheBookOfTheLastAccount) {
    ASSERT_EQ(account_connect(), 0);
    int account = 0;
    ASSERT_EQ(account_insert("first@example.org", &account), 0);
    ASSERT_EQ(account_insert("last@example.org", &account), 0);
    account_disconnect();
    ASSERT_EQ(qor_adapter_data_sync_initialize(account, 1), 0);
    const Record book = read(calendar_adapter->calendar_id, _calendar_book._uri);
    ASSERT_TRUE(book);
    EXPECT_EQ(text(book, _calendar_book.name), "Korvane Calendar");
    EXPECT_EQ(text(book, _calendar_book.description), "last@example.org");
    EXPECT_EQ(number(book, _calendar_book.account_id), account);
    EXPECT_EQ(number(book, _calendar_book.store_type), 1);
    // A fresh database has no baseline: the calendar service's version is it, and is not stored
    // yet.
    EXPECT_EQ(calendar_adapter->version, current_version());
    EXPECT_EQ(query(kAdapterFile, "SELECT version FROM version_table"), "0");
    EXPECT_THAT(log(), ElementsAre(warning(kInit, "is_signin=1"),
                                   warning(kInit, std::to_string(current_version()))));
}

TEST_F(LifecycleTest, WithoutAccountsTheBookHasNoDescription) {
    ASSERT_EQ(qor_adapter_data_sync_initialize(3, 0), 0);
    const Record book = read(calendar_adapter->calendar_id, _calendar_book._uri);
    EXPECT_EQ(text(book, _calendar_book.description), "(null)");
}

TEST_F(LifecycleTest, TheFirstBookOfTheAccountIsUsedAndTheMapKept) {
    ASSERT_EQ(calendar_connect(), 0);
    add_book(4);
    const int book = add_book(3);
    add_book(3);
    ASSERT_EQ(_qor_calendar_db_open(), 0);
    add_map_row();
    ASSERT_EQ(_qor_calendar_db_update_calendar_version(2), 0);
    ASSERT_EQ(qor_adapter_data_sync_initialize(3, 0), 0);
    EXPECT_EQ(calendar_adapter->calendar_id, book);
    EXPECT_EQ(calendar_adapter->version, 2);  // a stored baseline above 0 is kept
    EXPECT_EQ(map_rows(), 1);
}

TEST_F(LifecycleTest, ANewBookStartsWithoutMapRows) {
    ASSERT_EQ(_qor_calendar_db_open(), 0);
    add_map_row();
    ASSERT_EQ(qor_adapter_data_sync_initialize(3, 0), 0);
    EXPECT_EQ(map_rows(), 0);
}

TEST_F(LifecycleTest, ASecondInitialiseKeepsTheBookAndReadsTheBaselineAgain) {
    ASSERT_EQ(qor_adapter_data_sync_initialize(3, 0), 0);
    const int book = calendar_adapter->calendar_id;
    ASSERT_EQ(_qor_calendar_db_update_calendar_version(40), 0);
    log();
    EXPECT_EQ(qor_adapter_data_sync_initialize(4, 0), 0);
    EXPECT_EQ(calendar_adapter->calendar_id, book);
    EXPECT_EQ(calendar_adapter->account_id, 4);
    EXPECT_EQ(calendar_adapter->version, 40);
    EXPECT_THAT(log(), ElementsAre(warning(kInit, "is_signin=0"), critical(kInit, "already exist"),
                                   warning(kInit, "40")));
}

TEST_F(LifecycleTest, SigningOutDeletesTheBookAndEmptiesTheMap) {
    for (const int is_signout : {0, 2, -1, 1}) {
        SCOPED_TRACE(is_signout);
        ASSERT_EQ(qor_adapter_data_sync_initialize(3, 0), 0);
        const int book = calendar_adapter->calendar_id;
        add_map_row();
        log();
        EXPECT_EQ(qor_adapter_data_sync_deinitialize(is_signout), 0);
        EXPECT_THAT(log(),
                    ElementsAre(warning(kDeinit, "is_signout=" + std::to_string(is_signout))));
        EXPECT_EQ(calendar_adapter, nullptr);
        EXPECT_EQ(map_rows() == 0, is_signout == 1);
        ASSERT_EQ(calendar_connect(), 0);
        EXPECT_EQ(read(book, _calendar_book._uri) == nullptr, is_signout == 1);
    }
}

TEST_F(LifecycleTest, SigningOutSucceedsWhenTheBookIsGone) {
    ASSERT_EQ(qor_adapter_data_sync_initialize(3, 0), 0);
    const int book = calendar_adapter->calendar_id;
    ASSERT_EQ(calendar_db_delete_record(_calendar_book._uri, book), 0);
    log();
    EXPECT_EQ(qor_adapter_data_sync_deinitialize(1), 0);
    EXPECT_THAT(log(), ElementsAre(warning(kDeinit, "is_signout=1"),
                                   critical(kDeinit, "calendar delete fail(calendar_id=" +
                                                         std::to_string(book) + ")")));
}

TEST_F(LifecycleTest, DeinitialiseWithoutInitialiseIsFive) {
    EXPECT_EQ(qor_adapter_data_sync_deinitialize(1), 5);
    EXPECT_THAT(log(),
                ElementsAre(warning(kDeinit, "is_signout=1"),
                            critical(kDeinit,
                                     "Since qor_adapter_data_sync_initialize() failed before, it "
                                     "couldn't be deinitialized")));
}

struct InitializeFailure {
    const char* function;
    int nth;
    std::vector<LogLine> lines;
};

TEST_F(LifecycleTest, EveryFailureOfInitialiseLeavesItNotInitialised) {
    const LogLine records = critical(kInit, "get_records_with_query fail");
    const LogLine no_name = critical(kInit, "get_account_user_name fail");
    const InitializeFailure making_a_book[] = {
        {"calloc", 1, {critical(kInit, "calloc fail")}},
        {"db_util_open", 2, {critical(kInit, "_qor_calendar_db_open fail")}},
        {"calendar_connect", 1, {critical(kInit, "calendar_connect fail")}},
        {"calendar_query_create", 1, {critical(kInit, "query create fail")}},
        {"calendar_filter_create", 1, {critical(kInit, "filter_create fail")}},
        {"calendar_filter_add_int", 1, {critical(kInit, "filter fail")}},
        {"calendar_filter_add_operator", 1, {critical(kInit, "filter fail")}},
        {"calendar_filter_add_int", 2, {critical(kInit, "filter fail")}},
        {"calendar_query_set_filter", 1, {critical(kInit, "query fail")}},
        {"calendar_db_get_records_with_query", 1, {records}},
        {"calendar_list_get_count", 1, {records}},
        {"calendar_record_create", 1, {records}},
        {"calendar_record_set_int", 1, {records}},
        {"calendar_record_set_int", 2, {records}},
        {"calendar_record_set_str", 1, {records}},
        {"account_connect", 1, {critical(kUserName, "account_connect fail"), no_name}},
        {"account_foreach_account_from_db",
         1,
         {critical(kUserName, "account_foreach_account_from_db fail"), no_name}},
        {"calendar_record_set_str", 2, {records}},
        {"calendar_db_insert_record", 1, {records}},
        {"calendar_db_get_current_version", 1, {critical(kInit, "get_current_version fail")}},
    };
    const InitializeFailure finding_a_book[] = {
        {"calendar_list_first", 1, {records}},
        {"calendar_list_get_current_record_p", 1, {records}},
        {"calendar_record_get_int", 1, {records}},
    };
    const auto expect = [](const InitializeFailure& failure) {
        SCOPED_TRACE(std::string(failure.function) + " " + std::to_string(failure.nth));
        _qor_calendar_db_close();
        std::filesystem::remove(kAdapterFile);
        std::filesystem::remove(QOR_DEVICE_ROOT "/opt/usr/dbspace/.calendar-service.db");
        faults::fail(failure.function, failure.nth);
        EXPECT_EQ(qor_adapter_data_sync_initialize(3, 0), 6);
        EXPECT_TRUE(faults::fired());
        faults::clear();
        EXPECT_EQ(calendar_adapter, nullptr);
        std::vector<LogLine> lines = log();
        ASSERT_FALSE(lines.empty());
        EXPECT_EQ(lines[0], warning(kInit, "is_signin=0"));
        lines.erase(lines.begin());
        EXPECT_EQ(lines, failure.lines);
        static_cast<void>(calendar_disconnect());
    };
    for (const InitializeFailure& failure : making_a_book) {
        expect(failure);
    }
    ASSERT_EQ(calendar_connect(), 0);
    add_book(3);
    for (const InitializeFailure& failure : finding_a_book) {
        SCOPED_TRACE(failure.function);
        faults::fail(failure.function, failure.nth);
        EXPECT_EQ(qor_adapter_data_sync_initialize(3, 0), 6);
        EXPECT_TRUE(faults::fired());
        faults::clear();
        EXPECT_EQ(log()[1], failure.lines[0]);
    }
    EXPECT_EQ(qor_adapter_data_sync_initialize(3, 0), 0);
    faults::fail("calendar_connect");
    EXPECT_EQ(qor_adapter_data_sync_initialize(3, 0), 6);  // a repeated one that fails ends it too
    EXPECT_EQ(qor_adapter_data_sync_clear_deleted_ids(), 6);
}

TEST_F(LifecycleTest, AnAccountServiceThatEndsBadlyCostsTheNameAtMost) {
    ASSERT_EQ(account_connect(), 0);
    int account = 0;
    ASSERT_EQ(account_insert("one@example.org", &account), 0);
    ASSERT_EQ(account_insert("two@example.org", &account), 0);
    account_disconnect();
    char* name = nullptr;
    faults::fail("account_disconnect");
    EXPECT_EQ(__qor_calendar_event_get_account_user_name(&name), 0);
    EXPECT_STREQ(MallocText(name).get(), "two@example.org");
    EXPECT_THAT(log(), ElementsAre(critical(kUserName, "account_connect fail")));
    faults::fail("account_get_user_name", 2);  // ends the enumeration, which succeeds
    EXPECT_EQ(__qor_calendar_event_get_account_user_name(&name), 0);
    EXPECT_STREQ(MallocText(name).get(), "one@example.org");
    EXPECT_THAT(log(), ElementsAre(critical("__qor_calendar_event_get_account_cb",
                                            "account_get_user_name failed")));
}

TEST_F(LifecycleTest, AMissingDataFolderFailsWithItsMessages) {
    std::filesystem::remove_all(kAdapterFolder);
    EXPECT_EQ(qor_adapter_data_sync_initialize(3, 0), 6);
    EXPECT_THAT(log(),
                ElementsAre(warning(kInit, "is_signin=0"),
                            critical("__qor_calendar_db_remake", "db_util_open() Failed(14)"),
                            critical(kInit, "_qor_calendar_db_open fail")));
}

}  // namespace
