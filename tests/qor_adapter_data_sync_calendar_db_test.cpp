// SPDX-License-Identifier: Apache-2.0
#include "data-sync/calendar/qor_adapter_data_sync_calendar_db.h"

#include <sqlite3.h>
#include <sys/resource.h>
#include <sys/stat.h>

#include <csignal>
#include <cstdlib>
#include <fstream>

#include "tests/support/device_test.h"

namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;

constexpr char kSchema[] =
    "qor_event_table|CREATE TABLE qor_event_table( id INTEGER, version INTEGER)\n"
    "qor_todo_table|CREATE TABLE qor_todo_table( id INTEGER, version INTEGER)\n"
    "qor_event_data_table|CREATE TABLE qor_event_data_table( adapter_id INTEGER PRIMARY KEY "
    "AUTOINCREMENT, calsvc_id INTEGER, calsvc_ori_id INTEGER, ori_cloud_key TEXT, exception_status "
    "INTEGER, invalid INTEGER, value TEXT, calendar_id INTEGER,exdate TEXT )\n"
    "version_table|CREATE TABLE version_table( version INTEGER)";

mode_t mode_of(const std::string& path) {
    struct stat status = {};
    return stat(path.c_str(), &status) == 0 ? status.st_mode & 07777U : 0;
}

class MappingStoreTest : public DeviceTest {
  protected:
    ~MappingStoreTest() override { _qor_calendar_db_close(); }

    static std::string adapter(const std::string& sql) { return query(kAdapterFile, sql); }

    // Makes a row; texts are borrowed. Returns its item number.
    static int32_t add_row(int32_t svc_id, int32_t parent, int32_t status, const char* exdate,
                           int32_t invalid = 0) {
        calendar_adapter_row row = {};
        row.calsvc_id = svc_id;
        row.calsvc_ori_id = parent;
        row.exception_status = status;
        row.invalid = invalid;
        row.exdate = const_cast<char*>(exdate);
        EXPECT_EQ(_qor_calendar_db_insert_adapter(&row), 0);
        return row.adapter_id;
    }

    // The item numbers of a list of rows, which is released.
    static std::vector<int32_t> ids_of(GList* rows) {
        std::vector<int32_t> ids;
        for (GList* entry = rows; entry != nullptr; entry = entry->next) {
            auto* row = static_cast<calendar_adapter_row*>(entry->data);
            ids.push_back(row->adapter_id);
            _qor_calendar_free_adapter_row(row);
            free(row);
        }
        g_list_free(rows);
        return ids;
    }
};

TEST_F(MappingStoreTest, AFreshFileHasTheSchemaAndItsModeUnderAnyUmask) {
    const mode_t old_mask = umask(0077);
    __qor_calendar_db_remake();
    EXPECT_EQ(mode_of(kAdapterFile), 0660U);
    EXPECT_EQ(mode_of(std::string(kAdapterFile) + "-journal"), 0660U);
    std::filesystem::remove(kAdapterFile);
    EXPECT_EQ(_qor_calendar_db_open(), 0);
    umask(old_mask);
    EXPECT_EQ(mode_of(kAdapterFile), 0660U);
    EXPECT_EQ(adapter("SELECT name, sql FROM sqlite_master WHERE name NOT LIKE 'sqlite_%'"),
              kSchema);
    EXPECT_EQ(adapter("SELECT version FROM version_table"), "0");
    EXPECT_THAT(log(), IsEmpty());
}

TEST_F(MappingStoreTest, AnOldFileGainsTheVersionTableAndASeedOnlyWhenItHasNone) {
    run_sql(kAdapterFile, "CREATE TABLE qor_event_data_table(adapter_id INTEGER)");
    EXPECT_EQ(_qor_calendar_db_open(), 0);
    EXPECT_EQ(adapter("SELECT name FROM sqlite_master"), "qor_event_data_table\nversion_table");
    EXPECT_EQ(adapter("SELECT version FROM version_table"), "0");
    EXPECT_EQ(_qor_calendar_db_update_calendar_version(7), 0);
    EXPECT_EQ(_qor_calendar_db_close(), 0);
    EXPECT_EQ(_qor_calendar_db_open(), 0);
    EXPECT_EQ(adapter("SELECT version FROM version_table"), "7");
}

TEST_F(MappingStoreTest, AMissingHostDatabaseLeavesTheAdapterDatabaseOpen) {
    std::filesystem::remove_all(QOR_DEVICE_ROOT "/opt/usr/dbspace");
    EXPECT_EQ(_qor_calendar_db_open(), 0);
    EXPECT_THAT(log(), ElementsAre(critical("_qor_calendar_db_open", "cloud db open failed")));
    EXPECT_EQ(_qor_calendar_db_get_cloud_key_from_server(1), nullptr);
    EXPECT_EQ(_qor_calendar_db_get_adapter_id_from_server("key"), nullptr);
    EXPECT_THAT(log(), IsEmpty());
}

TEST_F(MappingStoreTest, AMissingFolderIsTheOnlyThingThatKeepsItClosed) {
    std::filesystem::remove_all(kAdapterFolder);
    EXPECT_EQ(_qor_calendar_db_exec("SELECT 1"), -1);
    EXPECT_THAT(log(),
                ElementsAre(critical("__qor_calendar_db_remake", "db_util_open() Failed(14)"),
                            critical("__qor_calendar_db_check_open", "Database is not opended"),
                            critical("_qor_calendar_db_exec", "Database is not opended")));
    // Each operation says so under its own name, and the lookups answer as for a missing row.
    int32_t value = 77;
    calendar_adapter_row row = {};
    GList* rows = nullptr;
    const struct {
        const char* name;
        int result;
    } closed[] = {
        {"_qor_calendar_db_get_version", _qor_calendar_db_get_version(1, &value, QOR_EVENT_TABLE)},
        {"_qor_calendar_db_get_calendar_version", _qor_calendar_db_get_calendar_version(&value)},
        {"_qor_calendar_db_insert_adapter", _qor_calendar_db_insert_adapter(&row)},
        {"_qor_calendar_db_update_adapter", _qor_calendar_db_update_adapter(1, &row)},
        {"_qor_calendar_db_get_adapter", _qor_calendar_db_get_adapter(1, &row)},
        {"_qor_calendar_db_get_svc_id", _qor_calendar_db_get_svc_id(1, &value)},
        {"_qor_calendar_db_get_id_with_exdate", _qor_calendar_db_get_id_with_exdate(1, "x")},
        {"_qor_calendar_db_get_exdate_adapter_id_list",
         _qor_calendar_db_get_exdate_adapter_id_list(1, -1, &rows)},
        {"_qor_calendar_db_get_exception", _qor_calendar_db_get_exception(&rows)},
        {"_qor_calendar_db_get_cloud_key_from_server",
         _qor_calendar_db_get_cloud_key_from_server(1) == nullptr ? -1 : 0},
        {"_qor_calendar_db_get_adapter_id_from_server",
         _qor_calendar_db_get_adapter_id_from_server("x") == nullptr ? -1 : 0},
    };
    std::vector<LogLine> own_lines = log();
    std::erase_if(own_lines, [](const LogLine& line) { return line.function.starts_with("__"); });
    ASSERT_EQ(own_lines.size(), std::size(closed));
    for (size_t i = 0; i < std::size(closed); ++i) {
        EXPECT_EQ(own_lines[i], critical(closed[i].name, "Database is not opended"));
        EXPECT_EQ(closed[i].result, -1) << closed[i].name;
    }
    EXPECT_EQ(value, 77);
    EXPECT_EQ(_qor_calendar_db_get_id_from_adapter_db(1), -1);  // as it stands: not even tried
    EXPECT_THAT(log(), IsEmpty());
    std::filesystem::create_directories(kAdapterFolder);
    EXPECT_EQ(_qor_calendar_db_exec("SELECT 1"), 0);  // opened by the first use
}

TEST_F(MappingStoreTest, EachStepOfOpeningThatFailsHasItsMessageAndTheNextStepsGoOn) {
    const LogLine remake = critical("__qor_calendar_db_remake", "db_util_open() Failed(14)");
    const LogLine create =
        critical("__qor_calendar_db_remake", "remake calendar DB file is Failed : injected");
    const LogLine open_failed = critical("__qor_calendar_db_remake", "open Failed");
    const LogLine host = critical("_qor_calendar_db_open", "cloud db open failed");
    const LogLine table =
        critical("__qor_calendar_check_version_table", "make db table is Failed : injected");
    const LogLine seed =
        critical("__qor_calendar_check_version_table", "INSERT is Failed : injected");
    const LogLine no_count =
        critical("__qor_calendar_check_version_table", "sqlite3_step() failed(10, not an error).");
    const std::string all = "qor_event_table\nqor_todo_table\nqor_event_data_table\nversion_table";
    const struct {
        const char* function;
        int nth;
        int result;
        std::vector<LogLine> lines;
        std::string tables;
    } cases[] = {
        {"db_util_open", 1, 0, {remake}, "version_table"},
        {"sqlite3_exec", 1, 0, {create}, "qor_todo_table\nqor_event_data_table\nversion_table"},
        {"sqlite3_exec", 2, 0, {create}, "qor_event_table\nqor_event_data_table\nversion_table"},
        {"sqlite3_exec", 3, 0, {create}, "qor_event_table\nqor_todo_table\nversion_table"},
        {"open", 2, 0, {open_failed}, all},
        {"open", 3, 0, {open_failed}, all},
        {"db_util_open", 2, -1, {}, "qor_event_table\nqor_todo_table\nqor_event_data_table"},
        {"db_util_open", 3, 0, {host}, all},
        {"sqlite3_exec", 4, 0, {table}, "qor_event_table\nqor_todo_table\nqor_event_data_table"},
        {"sqlite3_prepare_v2", 1, 0, {}, all},
        {"sqlite3_step", 1, 0, {no_count}, all},
        {"sqlite3_exec", 5, 0, {seed}, all},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(std::string(c.function) + " " + std::to_string(c.nth));
        faults::fail(c.function, c.nth);
        EXPECT_EQ(_qor_calendar_db_open(), c.result);
        EXPECT_TRUE(faults::fired());
        faults::clear();
        EXPECT_EQ(log(), c.lines);
        EXPECT_EQ(adapter("SELECT name FROM sqlite_master WHERE name NOT LIKE 'sqlite_%'"),
                  c.tables);
        _qor_calendar_db_close();
        std::filesystem::remove(kAdapterFile);
    }
}

TEST_F(MappingStoreTest, AForeignFileIsRefusedWithMessagesAndLeftAsItIs) {
    const std::string text(5000, 'x');
    std::ofstream(kAdapterFile) << text;
    EXPECT_EQ(_qor_calendar_db_open(), 0);  // SQLite reads the file only when it is used
    EXPECT_THAT(log(), ElementsAre(critical("__qor_calendar_check_version_table",
                                            "make db table is Failed : file is not a database")));
    int32_t version = 5;
    EXPECT_EQ(_qor_calendar_db_get_calendar_version(&version), -1);
    calendar_adapter_row row = {};
    EXPECT_EQ(_qor_calendar_db_insert_adapter(&row), -1);
    const std::vector<LogLine> lines = log();
    ASSERT_EQ(lines.size(), 1U);
    EXPECT_EQ(lines[0].function, "_qor_calendar_db_insert_adapter");
    EXPECT_EQ(lines[0].text.rfind(") failed(file is not a database)."),
              lines[0].text.size() - strlen(") failed(file is not a database)."));
    std::ifstream file(kAdapterFile);
    EXPECT_EQ(std::string(std::istreambuf_iterator<char>(file), {}), text);
}

TEST_F(MappingStoreTest, ALockedDatabaseIsReportedAfterTheBusyTimeout) {
    ASSERT_EQ(_qor_calendar_db_open(), 0);
    sqlite3* other = nullptr;
    ASSERT_EQ(sqlite3_open(kAdapterFile, &other), SQLITE_OK);
    ASSERT_EQ(sqlite3_exec(other, "BEGIN EXCLUSIVE", nullptr, nullptr, nullptr), SQLITE_OK);
    int32_t version = 5;
    EXPECT_EQ(_qor_calendar_db_get_svc_id(1, &version), -1);
    EXPECT_EQ(version, 5);
    sqlite3_close(other);
    const std::vector<LogLine> lines = log();
    // Whether the text is compiled or stepped when the lock is met is up to SQLite.
    ASSERT_LE(lines.size(), 1U);
    if (!lines.empty()) {
        EXPECT_EQ(lines[0], critical("_qor_calendar_db_get_svc_id",
                                     "sqlite3_step() failed(5, database is locked)."));
    }
    EXPECT_EQ(_qor_calendar_db_insert_version(1, 1, QOR_EVENT_TABLE), 0);
}

TEST_F(MappingStoreTest, AFullDiskFailsTheWriteAndKeepsWhatWasCommitted) {
    ASSERT_EQ(_qor_calendar_db_open(), 0);
    const int32_t kept = add_row(5, 0, 0, nullptr);
    const auto old_handler = std::signal(SIGXFSZ, SIG_IGN);
    rlimit old_limit = {};
    getrlimit(RLIMIT_FSIZE, &old_limit);
    const rlimit full = {1, old_limit.rlim_max};
    setrlimit(RLIMIT_FSIZE, &full);
    calendar_adapter_row row = {};
    const int result = _qor_calendar_db_insert_adapter(&row);
    setrlimit(RLIMIT_FSIZE, &old_limit);
    std::signal(SIGXFSZ, old_handler);
    EXPECT_EQ(result, -1);
    EXPECT_THAT(log(), ElementsAre(critical("_qor_calendar_db_insert_adapter", "insert db fail")));
    EXPECT_EQ(adapter("SELECT adapter_id FROM qor_event_data_table"), std::to_string(kept));
    EXPECT_EQ(_qor_calendar_db_insert_adapter(&row), 0);
}

TEST_F(MappingStoreTest, ADeletedFileIsRemadeByOpeningWhileTheOpenOneStaysInUse) {
    ASSERT_EQ(_qor_calendar_db_open(), 0);
    const int32_t id = add_row(5, 0, 0, nullptr);
    std::filesystem::remove(kAdapterFile);
    EXPECT_EQ(_qor_calendar_db_open(), 0);
    EXPECT_EQ(adapter("SELECT count(*) FROM qor_event_data_table"), "0");
    EXPECT_EQ(_qor_calendar_db_get_id_from_adapter_db(5), id);
    _qor_calendar_db_close();
    EXPECT_EQ(_qor_calendar_db_get_id_from_adapter_db(5), -1);
}

TEST_F(MappingStoreTest, ExecRunsOneStatementAndTakesARowForSuccess) {
    ASSERT_EQ(_qor_calendar_db_open(), 0);
    EXPECT_EQ(_qor_calendar_db_exec("SELECT 1"), 0);
    EXPECT_EQ(_qor_calendar_db_exec("DELETE FROM qor_event_table; DELETE FROM version_table"), 0);
    EXPECT_EQ(adapter("SELECT count(*) FROM version_table"), "1");
    EXPECT_EQ(_qor_calendar_db_exec("INSERT INTO qor_event_data_table(adapter_id) VALUES(1)"), 0);
    EXPECT_EQ(_qor_calendar_db_exec("INSERT INTO qor_event_data_table(adapter_id) VALUES(1)"), -1);
    EXPECT_EQ(_qor_calendar_db_exec("no SQL"), -1);
    EXPECT_THAT(log(), IsEmpty());
}

TEST_F(MappingStoreTest, TheHighestVersionOfAnEventCountsAndPruningKeepsLaterOnes) {
    for (const int version : {3, 9, 5}) {
        EXPECT_EQ(_qor_calendar_db_insert_version(1, version, QOR_EVENT_TABLE), 0);
    }
    EXPECT_EQ(_qor_calendar_db_insert_version(2, 10, QOR_EVENT_TABLE), 0);
    int32_t version = -1;
    EXPECT_EQ(_qor_calendar_db_get_version(1, &version, QOR_EVENT_TABLE), 0);
    EXPECT_EQ(version, 9);
    EXPECT_EQ(_qor_calendar_db_delete_version(9, QOR_EVENT_TABLE), 0);
    version = -1;
    EXPECT_EQ(_qor_calendar_db_get_version(1, &version, QOR_EVENT_TABLE), -1);
    EXPECT_EQ(version, -1);
    EXPECT_EQ(_qor_calendar_db_get_version(2, &version, QOR_EVENT_TABLE), 0);
    EXPECT_EQ(version, 10);
    EXPECT_EQ(_qor_calendar_db_get_version(2, &version, "no_table"), -1);
    EXPECT_EQ(adapter("SELECT count(*) FROM qor_todo_table"), "0");
    EXPECT_THAT(log(), IsEmpty());
}

TEST_F(MappingStoreTest, ARowComesBackAsItWasStored) {
    calendar_adapter_row row = {};
    row.calsvc_id = 5;
    row.calsvc_ori_id = 6;
    row.ori_cloud_key = strdup("it's");
    row.exception_status = 1;
    row.invalid = 1;
    row.value = strdup("{\"EVENT\":{}}");
    row.calendar_id = 7;
    row.exdate = strdup("20140315");
    ASSERT_EQ(_qor_calendar_db_insert_adapter(&row), 0);
    const std::string all =
        "SELECT * FROM qor_event_data_table WHERE adapter_id=" + std::to_string(row.adapter_id);
    EXPECT_EQ(adapter(all), "1|5|6|it's|1|1|{\"EVENT\":{}}|7|20140315");
    OwnedRow back;
    ASSERT_EQ(_qor_calendar_db_get_adapter(row.adapter_id, &back), 0);
    EXPECT_EQ(_qor_calendar_db_update_adapter(99, &back), 0);  // the row names itself
    EXPECT_EQ(adapter(all), "1|5|6|it's|1|1|{\"EVENT\":{}}|7|20140315");
    _qor_calendar_free_adapter_row(&row);
    EXPECT_EQ(row.ori_cloud_key, nullptr);
    EXPECT_EQ(row.calsvc_id, 5);  // the texts are gone, the numbers stay
    EXPECT_EQ(_qor_calendar_db_update_adapter(0, &row), 0);
    EXPECT_EQ(adapter(all), "1|5|6|(null)|1|1|(null)|7|(null)");
    row.adapter_id = 99;
    EXPECT_EQ(_qor_calendar_db_update_adapter(0, &row), 0);  // no such row: nothing changes
    EXPECT_EQ(adapter("SELECT count(*) FROM qor_event_data_table"), "1");
}

TEST_F(MappingStoreTest, LookupsAnswerAMissingRowEachInItsOwnWay) {
    const int32_t event = add_row(5, 0, 0, nullptr);
    const int32_t cancelled = add_row(0, 5, 2, "20140315T093000Z");
    EXPECT_EQ(_qor_calendar_db_get_id_from_adapter_db(5), event);
    EXPECT_EQ(_qor_calendar_db_get_id_from_adapter_db(6), -1);
    int32_t svc_id = 77;
    EXPECT_EQ(_qor_calendar_db_get_svc_id(99, &svc_id), -1);
    EXPECT_EQ(svc_id, 77);
    EXPECT_EQ(_qor_calendar_db_get_svc_id(cancelled, &svc_id), 0);
    EXPECT_EQ(svc_id, 0);
    const struct {
        int32_t parent;
        std::string exdate;
        int32_t id;
    } occurrences[] = {
        {5, "20140315T093000Z", cancelled},
        {5, " 20140315T093000Z", 0},
        {6, "20140315T093000Z", 0},
        {5, "it's", 0},
        {5, "' OR '1'='1", 0},
        {5, std::string(4000, '2'), 0},
    };
    for (const auto& c : occurrences) {
        EXPECT_EQ(_qor_calendar_db_get_id_with_exdate(c.parent, c.exdate.c_str()), c.id)
            << c.exdate;
    }
    OwnedRow row;
    EXPECT_EQ(_qor_calendar_db_get_adapter(99, &row), -1);
    EXPECT_THAT(log(), IsEmpty());
}

TEST_F(MappingStoreTest, NullArgumentsAreRefused) {
    EXPECT_EQ(_qor_calendar_db_insert_adapter(nullptr), -1);  // silently
    EXPECT_EQ(_qor_calendar_db_update_adapter(1, nullptr), -1);
    EXPECT_EQ(_qor_calendar_db_get_adapter(1, nullptr), -1);
    EXPECT_EQ(_qor_calendar_db_get_svc_id(1, nullptr), -1);
    EXPECT_EQ(_qor_calendar_db_get_id_with_exdate(1, nullptr), -1);
    EXPECT_EQ(_qor_calendar_db_get_exdate_adapter_id_list(1, -1, nullptr), -1);
    EXPECT_EQ(_qor_calendar_db_get_exception(nullptr), -1);
    EXPECT_THAT(log(), ElementsAre(critical("_qor_calendar_db_update_adapter", "fail"),
                                   critical("_qor_calendar_db_get_adapter", "fail"),
                                   critical("_qor_calendar_db_get_svc_id", "fail"),
                                   critical("_qor_calendar_db_get_id_with_exdate", "fail"),
                                   critical("_qor_calendar_db_get_exdate_adapter_id_list", "fail"),
                                   critical("_qor_calendar_db_get_exception", "fail")));
}

TEST_F(MappingStoreTest, ListsAreByParentAndStatusOrPending) {
    const int32_t changed = add_row(6, 5, 1, "a");
    const int32_t cancelled = add_row(0, 5, 2, "b");
    const int32_t pending = add_row(0, 0, 2, "c", 1);
    const struct {
        int32_t parent;
        int32_t status;
        std::vector<int32_t> ids;
    } cases[] = {{5, -1, {changed, cancelled}}, {5, 2, {cancelled}}, {5, 0, {}}, {7, -1, {}}};
    for (const auto& c : cases) {
        GList* rows = nullptr;
        EXPECT_EQ(_qor_calendar_db_get_exdate_adapter_id_list(c.parent, c.status, &rows), 0);
        EXPECT_EQ(ids_of(rows), c.ids) << c.parent << " " << c.status;
    }
    GList* rows = nullptr;
    EXPECT_EQ(_qor_calendar_db_get_exception(&rows), 0);
    EXPECT_THAT(ids_of(rows), ElementsAre(pending));
    EXPECT_EQ(_qor_calendar_db_delete_adapter(pending), 0);
    rows = nullptr;
    EXPECT_EQ(_qor_calendar_db_get_exception(&rows), 0);
    EXPECT_EQ(rows, nullptr);
}

TEST_F(MappingStoreTest, DeletingAParentDropsItsExceptionRowsAndNumbersAreNotUsedAgain) {
    const int32_t parent = add_row(5, 0, 0, nullptr);
    add_row(6, 5, 1, "a");
    add_row(0, 5, 2, "b");
    const int32_t other = add_row(0, 7, 2, "c");
    const int32_t unapplied = add_row(0, 0, 1, "d", 1);
    EXPECT_EQ(_qor_calendar_db_delete_adapter(unapplied), 0);  // id 0 cascades to nothing
    EXPECT_EQ(adapter("SELECT count(*) FROM qor_event_data_table"), "4");
    EXPECT_EQ(_qor_calendar_db_delete_adapter(parent), 0);
    EXPECT_EQ(adapter("SELECT adapter_id FROM qor_event_data_table"), std::to_string(other));
    EXPECT_EQ(_qor_calendar_db_delete_all_adapter(), 0);
    EXPECT_EQ(add_row(9, 0, 0, nullptr), unapplied + 1);
}

TEST_F(MappingStoreTest, TheHostDatabaseTranslatesItemsAndKeys) {
    add_cloud_key(12, "key-12");
    run_sql(kHostFile, "INSERT INTO datasync_table VALUES('13', 'key-13', 'CONTACT')");
    const struct {
        const char* key;
        const char* id;
    } cases[] = {
        {"key-12", "12"}, {"key-13", nullptr}, {"it's", nullptr}, {"' OR '1'='1", nullptr}};
    for (const auto& c : cases) {
        const MallocText id(_qor_calendar_db_get_adapter_id_from_server(c.key));
        EXPECT_STREQ(id.get(), c.id) << c.key;
    }
    EXPECT_STREQ(MallocText(_qor_calendar_db_get_cloud_key_from_server(12)).get(), "key-12");
    EXPECT_EQ(_qor_calendar_db_get_cloud_key_from_server(13), nullptr);
    run_sql(kHostFile, "UPDATE datasync_table SET cloud_key=NULL");
    EXPECT_EQ(_qor_calendar_db_get_cloud_key_from_server(12), nullptr);
    EXPECT_THAT(log(), IsEmpty());
}

TEST_F(MappingStoreTest, FailedStatementsHaveTheirMessageAndAnswer) {
    ASSERT_EQ(_qor_calendar_db_open(), 0);
    add_cloud_key(12, "key-12");
    const int32_t id = add_row(5, 0, 0, nullptr);
    static int32_t value = 0;
    static calendar_adapter_row row = {};
    row.adapter_id = id;
    const char* const kStep = "sqlite3_step() failed(10, not an error).";
    const struct {
        const char* function;
        int (*run)();
        int result;
        const char* step_message;      // null: none
        bool prepare_message = false;  // the insert alone reports a text that SQLite refuses
    } cases[] = {
        {"_qor_calendar_db_exec", [] { return _qor_calendar_db_exec("SELECT 1"); }, -1, nullptr},
        {"_qor_calendar_db_get_version",
         [] { return _qor_calendar_db_get_version(1, &value, QOR_EVENT_TABLE); }, -1, kStep},
        {"_qor_calendar_db_get_calendar_version",
         [] { return _qor_calendar_db_get_calendar_version(&value); }, -1, kStep},
        {"_qor_calendar_db_insert_adapter", [] { return _qor_calendar_db_insert_adapter(&row); },
         -1, "insert db fail", true},
        {"_qor_calendar_db_update_adapter", [] { return _qor_calendar_db_update_adapter(0, &row); },
         -1, "insert db fail"},
        {"_qor_calendar_db_get_adapter", [] { return _qor_calendar_db_get_adapter(1, &row); }, -1,
         kStep},
        {"_qor_calendar_db_get_svc_id", [] { return _qor_calendar_db_get_svc_id(1, &value); }, -1,
         kStep},
        {"_qor_calendar_db_get_id_from_adapter_db",
         [] { return _qor_calendar_db_get_id_from_adapter_db(5); }, -1, kStep},
        {"_qor_calendar_db_get_id_with_exdate",
         [] { return _qor_calendar_db_get_id_with_exdate(5, "x"); }, 0, kStep},
        {"_qor_calendar_db_get_cloud_key_from_server",
         [] { return _qor_calendar_db_get_cloud_key_from_server(12) == nullptr ? -1 : 0; }, -1,
         kStep},
        {"_qor_calendar_db_get_adapter_id_from_server",
         [] { return _qor_calendar_db_get_adapter_id_from_server("key-12") == nullptr ? -1 : 0; },
         -1, kStep},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.function);
        faults::fail("sqlite3_step");
        EXPECT_EQ(c.run(), c.result);
        EXPECT_TRUE(faults::fired());
        const std::vector<LogLine> stepped = log();
        ASSERT_EQ(stepped.size(), c.step_message != nullptr ? 1U : 0U);
        if (c.step_message != nullptr) {
            EXPECT_EQ(stepped[0], critical(c.function, c.step_message));
        }
        faults::fail("sqlite3_prepare_v2");
        EXPECT_EQ(c.run(), c.result);
        EXPECT_EQ(log().size(), c.prepare_message ? 1U : 0U);
        faults::clear();
    }
    faults::fail("sqlite3_bind_text", 3);  // what cannot be stored whole is not stored at all
    EXPECT_EQ(_qor_calendar_db_insert_adapter(&row), -1);
    EXPECT_THAT(log(), ElementsAre(critical("_qor_calendar_db_insert_adapter", "insert db fail")));
    faults::fail("calloc");
    GList* rows = nullptr;
    add_row(0, 5, 2, "x", 1);
    EXPECT_EQ(_qor_calendar_db_get_exdate_adapter_id_list(5, -1, &rows), -1);
    faults::fail("calloc");
    EXPECT_EQ(_qor_calendar_db_get_exception(&rows), -1);
    EXPECT_EQ(rows, nullptr);
    EXPECT_THAT(log(),
                ElementsAre(critical("_qor_calendar_db_get_exdate_adapter_id_list", "calloc fail"),
                            critical("_qor_calendar_db_get_exception", "calloc fail")));
}

TEST_F(MappingStoreTest, MutexFailuresAreLoggedAndIgnored) {
    faults::fail("pthread_mutex_lock");
    _qor_calendar_lock();
    faults::fail("pthread_mutex_unlock");
    _qor_calendar_unlock();
    EXPECT_THAT(log(), ElementsAre(critical("_qor_calendar_lock", "mutex_lock Failed(22)"),
                                   critical("_qor_calendar_unlock", "mutex_unlock Failed(1)")));
}

}  // namespace
