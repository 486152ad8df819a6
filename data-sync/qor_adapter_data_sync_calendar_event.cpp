// SPDX-License-Identifier: Apache-2.0
//
// Entry points: identity, lifecycle and the entries that do nothing. State: the module state
// (calendar_adapter). No lock is taken.
#include "data-sync/qor_adapter_data_sync_calendar_event.h"

#include <malloc.h>
#include <sqlite3.h>

#include <cstdlib>
#include <cstring>

#include "common/log.h"
#include "common/owned.h"
#include "common/result.h"
#include "data-sync/qor_adapter_data_sync_calendar_event_state.h"

calendar_adapter_state* calendar_adapter = nullptr;

namespace {

constexpr char kClientId[] = "p3RwQZ7mNa";
constexpr char kType[] = "DATASYNC";
constexpr char kName[] = "CALENDAR";
constexpr char kBookName[] = "Korvane Calendar";

// Stores a new text, or null when memory has run out. A host without a place for it gets none.
int give_text(const char* text, char** out) {
    if (out != nullptr) {
        *out = strdup(text);
    }
    return kSuccess;
}

int give_no_files(void** files) {
    if (files != nullptr) {
        *files = nullptr;
    }
    return kSuccess;
}

// The steps of finding or making the book return what to say on failure, or null: a message stands
// under the name of the entry point that logs it.

const char* query_books(int account_id, List* books) {
    calendar_query_h new_query = nullptr;
    if (calendar_query_create(_calendar_book._uri, &new_query) != 0) {
        return "query create fail";
    }
    const Query query(new_query);
    calendar_filter_h new_filter = nullptr;
    if (calendar_filter_create(_calendar_book._uri, &new_filter) != 0) {
        return "filter_create fail";
    }
    const Filter filter(new_filter);
    if (calendar_filter_add_int(filter.get(), _calendar_book.account_id, CALENDAR_MATCH_EQUAL,
                                account_id) != 0 ||
        calendar_filter_add_operator(filter.get(), CALENDAR_FILTER_OPERATOR_AND) != 0 ||
        calendar_filter_add_int(filter.get(), _calendar_book.store_type, CALENDAR_MATCH_EQUAL,
                                CALENDAR_BOOK_TYPE_EVENT) != 0) {
        return "filter fail";
    }
    if (calendar_query_set_filter(query.get(), filter.get()) != 0) {
        return "query fail";
    }
    calendar_list_h list = nullptr;
    if (calendar_db_get_records_with_query(query.get(), 0, 0, &list) != 0) {
        return "get_records_with_query fail";
    }
    books->reset(list);
    return nullptr;
}

const char* read_first_book(const List& books, int32_t* book_id) {
    calendar_record_h book = nullptr;  // borrowed from the list
    if (calendar_list_first(books.get()) != 0 ||
        calendar_list_get_current_record_p(books.get(), &book) != 0 ||
        calendar_record_get_int(book, _calendar_book.id, book_id) != 0) {
        return "get_records_with_query fail";
    }
    return nullptr;
}

// Deliberate: every failure of making the book but that of the user name has one message.
const char* create_book(int account_id, int32_t* book_id) {
    constexpr const char* kFail = "get_records_with_query fail";
    calendar_record_h new_book = nullptr;
    if (calendar_record_create(_calendar_book._uri, &new_book) != 0) {
        return kFail;
    }
    const Record book(new_book);
    if (calendar_record_set_int(book.get(), _calendar_book.account_id, account_id) != 0 ||
        calendar_record_set_int(book.get(), _calendar_book.store_type, CALENDAR_BOOK_TYPE_EVENT) !=
            0 ||
        calendar_record_set_str(book.get(), _calendar_book.name, kBookName) != 0) {
        return kFail;
    }
    char* user_name = nullptr;
    if (__qor_calendar_event_get_account_user_name(&user_name) != 0) {
        return "get_account_user_name fail";
    }
    const MallocText description(user_name);
    if (calendar_record_set_str(book.get(), _calendar_book.description, description.get()) != 0 ||
        calendar_db_insert_record(book.get(), book_id) != 0) {
        return kFail;
    }
    return nullptr;
}

const char* find_or_create_book(calendar_adapter_state* state) {
    List books;
    int count = 0;
    if (const char* message = query_books(state->account_id, &books)) {
        return message;
    }
    if (calendar_list_get_count(books.get(), &count) != 0) {
        return "get_records_with_query fail";
    }
    if (count > 0) {
        return read_first_book(books, &state->calendar_id);
    }
    if (const char* message = create_book(state->account_id, &state->calendar_id)) {
        return message;
    }
    // A new book starts without map rows; rows that cannot be deleted name no event of it.
    static_cast<void>(_qor_calendar_db_delete_all_adapter());
    return nullptr;
}

// What fails leaves the adapter not initialised, whatever it was before. The databases and the
// connection stay as they are; a later initialise uses them again.
int fail_initialize() {
    free(calendar_adapter);
    calendar_adapter = nullptr;
    return kFailure;
}

}  // namespace

// ---- Identity
// --------------------------------------------------------------------------------------

int qor_adapter_get_cid(char** cid) noexcept {
    return give_text(kClientId, cid);
}
int qor_adapter_get_type(char** type) noexcept {
    return give_text(kType, type);
}
int qor_adapter_get_name(char** name) noexcept {
    return give_text(kName, name);
}

// ---- Lifecycle
// -------------------------------------------------------------------------------------

int qor_adapter_data_sync_initialize(int account_id, int is_signin) noexcept {
    QOR_LOG(WARNING, "is_signin=%d", is_signin);
    if (calendar_adapter != nullptr) {
        QOR_LOG(CRITICAL, "already exist");
    } else {
        calendar_adapter =
            static_cast<calendar_adapter_state*>(calloc(1, sizeof(calendar_adapter_state)));
        if (calendar_adapter == nullptr) {
            QOR_LOG(CRITICAL, "calloc fail");
            return fail_initialize();
        }
    }
    calendar_adapter->account_id = account_id;
    if (_qor_calendar_db_open() != 0) {
        QOR_LOG(CRITICAL, "_qor_calendar_db_open fail");
        return fail_initialize();
    }
    if (calendar_connect() != 0) {
        QOR_LOG(CRITICAL, "calendar_connect fail");
        return fail_initialize();
    }
    if (calendar_adapter->calendar_id == 0) {
        if (const char* message = find_or_create_book(calendar_adapter)) {
            QOR_LOG(CRITICAL, "%s", message);
            return fail_initialize();
        }
    }
    int32_t* const version = &calendar_adapter->version;
    if ((_qor_calendar_db_get_calendar_version(version) != 0 || *version <= 0) &&
        calendar_db_get_current_version(version) != 0) {
        QOR_LOG(CRITICAL, "get_current_version fail");
        return fail_initialize();
    }
    QOR_LOG(WARNING, "%d", *version);
    return kSuccess;
}

int qor_adapter_data_sync_deinitialize(int is_signout) noexcept {
    QOR_LOG(WARNING, "is_signout=%d", is_signout);
    if (calendar_adapter == nullptr) {
        QOR_LOG(CRITICAL,
                "Since qor_adapter_data_sync_initialize() failed before, it couldn't be "
                "deinitialized");
        return kNotInitialized;
    }
    if (is_signout == 1) {
        const int32_t book = calendar_adapter->calendar_id;
        if (book > 0 && calendar_db_delete_record(_calendar_book._uri, book) != 0) {
            QOR_LOG(CRITICAL, "calendar delete fail(calendar_id=%d)", book);
        }
        static_cast<void>(_qor_calendar_db_delete_all_adapter());  // signing out goes on regardless
    }
    static_cast<void>(_qor_calendar_db_close());
    static_cast<void>(calendar_disconnect());
    // Deliberate: a pending change list, the version tables, the change subscription and the retry
    // timer are left as they are.
    free(calendar_adapter);
    calendar_adapter = nullptr;
    return kSuccess;
}

int __qor_calendar_event_get_account_user_name(char** user_name) {
    if (account_connect() != 0) {
        QOR_LOG(CRITICAL, "account_connect fail");
        return kError;
    }
    char* last_name = nullptr;
    const int result =
        account_foreach_account_from_db(__qor_calendar_event_get_account_cb, &last_name);
    MallocText name(last_name);
    if (result != 0) {
        QOR_LOG(CRITICAL, "account_foreach_account_from_db fail");
        return kError;  // Deliberate: without disconnecting.
    }
    if (account_disconnect() != 0) {
        QOR_LOG(CRITICAL, "account_connect fail");  // Deliberate: the text of connecting.
    }
    *user_name = name.release();
    return 0;
}

bool __qor_calendar_event_get_account_cb(account_h account, void* user_data) {
    char* name = nullptr;
    if (account_get_user_name(account, &name) != 0) {
        QOR_LOG(CRITICAL, "account_get_user_name failed");
        return false;
    }
    auto* const last_name = static_cast<char**>(user_data);
    free(*last_name);  // each account's name replaces the one before
    *last_name = name;
    return true;
}

void __qor_calendar_event_release_memory(void) {
    while (sqlite3_release_memory(-1) != 0) {
    }
    static_cast<void>(malloc_trim(0));  // whether anything was given back does not matter
}

// ---- Entries that do nothing
// -----------------------------------------------------------------------

int qor_adapter_data_sync_get_dependency(void) noexcept {
    return kSuccess;
}
int qor_adapter_data_sync_is_ors_supported(void) noexcept {
    return kSuccess;
}
int qor_adapter_data_sync_get_deleted_folder(void) noexcept {
    return kSuccess;
}
int qor_adapter_data_sync_set_metadata(void) noexcept {
    return kSuccess;
}
int qor_adapter_data_sync_completed(void) noexcept {
    return kSuccess;
}
int qor_adapter_data_sync_done(void) noexcept {
    return kSuccess;
}

int qor_adapter_data_sync_get_files_for_upsync(void*, void*, void*, void*, void*, void*, void*,
                                               void*, void** files) noexcept {
    return give_no_files(files);
}

int qor_adapter_data_sync_get_files_for_downsync(void*, void*, void*, void*, void*,
                                                 void** files) noexcept {
    return give_no_files(files);
}
