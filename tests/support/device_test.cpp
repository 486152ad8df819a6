// SPDX-License-Identifier: Apache-2.0
#include "tests/support/device_test.h"

#include <glib.h>
#include <sqlite3.h>

#include <cstdlib>

DeviceTest::DeviceTest() {
    std::string pattern = (std::filesystem::temp_directory_path() / "qor-test.XXXXXX").string();
    directory_ = mkdtemp(pattern.data());
    std::filesystem::current_path(directory_);
    std::filesystem::create_directories(kAdapterFolder);
    std::filesystem::create_directories(QOR_DEVICE_ROOT "/opt/usr/dbspace");
    faults::clear();
    faults::take_log();
}

DeviceTest::~DeviceTest() {
    faults::clear();
    static_cast<void>(calendar_disconnect());  // not every test has connected
    std::filesystem::current_path("/");
    std::error_code ignored;  // a test may have left a folder that cannot be read
    std::filesystem::remove_all(directory_, ignored);
}

bool DeviceTest::run_until(const std::function<bool()>& done) {
    bool timed_out = false;
    const guint timer = g_timeout_add(
        10000,
        [](gpointer flag) -> gboolean {
            *static_cast<bool*>(flag) = true;
            return G_SOURCE_CONTINUE;
        },
        &timed_out);
    while (!done() && !timed_out) {
        g_main_context_iteration(nullptr, TRUE);
    }
    g_source_remove(timer);
    return done();
}

Record DeviceTest::new_record(const char* view_uri) {
    calendar_record_h record = nullptr;
    EXPECT_EQ(calendar_record_create(view_uri, &record), 0);
    return Record(record);
}

int DeviceTest::insert(const Record& record) {
    int id = 0;
    EXPECT_EQ(calendar_db_insert_record(record.get(), &id), 0);
    return id;
}

Record DeviceTest::read(int id, const char* view_uri) {
    calendar_record_h record = nullptr;
    static_cast<void>(calendar_db_get_record(view_uri, id, &record));  // null says that it failed
    return Record(record);
}

int DeviceTest::add_book(int account_id) {
    const Record book = new_record(_calendar_book._uri);
    calendar_record_h b = book.get();
    EXPECT_EQ(calendar_record_set_int(b, _calendar_book.account_id, account_id), 0);
    EXPECT_EQ(calendar_record_set_int(b, _calendar_book.store_type, CALENDAR_BOOK_TYPE_EVENT), 0);
    EXPECT_EQ(calendar_record_set_str(b, _calendar_book.name, "Book"), 0);
    return insert(book);
}

int DeviceTest::newest_book() {
    calendar_query_h new_query = nullptr;
    EXPECT_EQ(calendar_query_create(_calendar_book._uri, &new_query), 0);
    const Query query(new_query);
    calendar_list_h new_list = nullptr;
    EXPECT_EQ(calendar_db_get_records_with_query(query.get(), 0, 0, &new_list), 0);
    const List books(new_list);
    int newest = 0;
    for (int more = calendar_list_first(books.get()); more == 0;
         more = calendar_list_next(books.get())) {
        calendar_record_h book = nullptr;
        EXPECT_EQ(calendar_list_get_current_record_p(books.get(), &book), 0);
        EXPECT_EQ(calendar_record_get_int(book, _calendar_book.id, &newest), 0);
    }
    return newest;
}

int DeviceTest::add_event(int book_id, const std::string& summary, int original_event_id) {
    const Record event = new_record(_calendar_event._uri);
    calendar_record_h e = event.get();
    EXPECT_EQ(calendar_record_set_int(e, _calendar_event.calendar_book_id, book_id), 0);
    EXPECT_EQ(calendar_record_set_str(e, _calendar_event.summary, summary.c_str()), 0);
    if (original_event_id != 0) {
        EXPECT_EQ(calendar_record_set_int(e, _calendar_event.original_event_id, original_event_id),
                  0);
    }
    return insert(event);
}

void DeviceTest::set_text(int event_id, unsigned int property, const char* text) {
    const Record event = read(event_id);
    ASSERT_TRUE(event);
    ASSERT_EQ(calendar_record_set_str(event.get(), property, text), 0);
    ASSERT_EQ(calendar_db_update_record(event.get()), 0);
}

std::string DeviceTest::text(const Record& record, unsigned int property) {
    char* text = nullptr;
    EXPECT_EQ(calendar_record_get_str_p(record.get(), property, &text), 0);
    return text != nullptr ? text : "(null)";
}

int DeviceTest::number(const Record& record, unsigned int property) {
    int value = 0;
    EXPECT_EQ(calendar_record_get_int(record.get(), property, &value), 0);
    return value;
}

int DeviceTest::current_version() {
    int version = 0;
    EXPECT_EQ(calendar_db_get_current_version(&version), 0);
    return version;
}

void DeviceTest::run_sql(const char* file, const std::string& sql) {
    sqlite3* db = nullptr;
    ASSERT_EQ(sqlite3_open(file, &db), SQLITE_OK);
    EXPECT_EQ(sqlite3_exec(db, sql.c_str(), nullptr, nullptr, nullptr), SQLITE_OK)
        << sql << ": " << sqlite3_errmsg(db);
    sqlite3_close(db);
}

std::string DeviceTest::query(const char* file, const std::string& sql) {
    sqlite3* db = nullptr;
    EXPECT_EQ(sqlite3_open_v2(file, &db, SQLITE_OPEN_READONLY, nullptr), SQLITE_OK);
    std::string result;
    const auto add_row = [](void* out, int count, char** values, char**) {
        auto& text = *static_cast<std::string*>(out);
        text += text.empty() ? "" : "\n";
        for (int i = 0; i < count; ++i) {
            text += i == 0 ? "" : "|";
            text += values[i] != nullptr ? values[i] : "(null)";
        }
        return 0;
    };
    EXPECT_EQ(sqlite3_exec(db, sql.c_str(), add_row, &result, nullptr), SQLITE_OK)
        << sql << ": " << sqlite3_errmsg(db);
    sqlite3_close(db);
    return result;
}

void DeviceTest::add_cloud_key(int adapter_id, const std::string& cloud_key) {
    run_sql(kHostFile,
            "CREATE TABLE IF NOT EXISTS datasync_table(adapter_id TEXT, cloud_key TEXT, "
            "adapter_name TEXT);"
            "INSERT INTO datasync_table VALUES('" +
                std::to_string(adapter_id) + "', '" + cloud_key + "', 'CALENDAR');");
}
