// SPDX-License-Identifier: Apache-2.0
//
// Connection and store functions of the calendar service. State: one store per process, under one
// mutex, which is held during a call and never while a callback runs.
#include <climits>
#include <cstdlib>
#include <memory>
#include <mutex>
#include <string>

#include "platform/calendar-service/book_store.h"
#include "platform/calendar-service/event_store.h"
#include "platform/calendar-service/guard.h"
#include "platform/calendar-service/notify.h"
#include "platform/calendar-service/store.h"
#include "platform/include/calendar_service.h"

#ifndef QOR_DEVICE_ROOT
#define QOR_DEVICE_ROOT ""
#endif

using device::Failure;
using device::Store;
using device::Transaction;
using device::View;

namespace {

constexpr char kFolder[] = QOR_DEVICE_ROOT "/opt/usr/dbspace";
constexpr char kFile[] = "/.calendar-service.db";

struct Connection {
    Connection(std::string resolved_folder, int connection_number)
        : folder(std::move(resolved_folder)), store(folder + kFile), number(connection_number) {}

    const std::string folder;  // resolved, so that the current directory may change
    Store store;
    const int number;
};

struct State {
    std::mutex mutex;
    std::unique_ptr<Connection> connection;
    int connections_made = 0;
};

// Never destroyed: calls may come while the process ends.
State& state() {
    static auto* const instance = new State;
    return *instance;
}

// The calling thread's latest write, and the connection that it was made on.
struct LastWrite {
    int connection_number = 0;
    int version = 0;
};
thread_local LastWrite last_write;

Connection& connected() {
    if (!state().connection) {
        throw Failure{CALENDAR_ERROR_NOT_CONNECTED};
    }
    return *state().connection;
}

void connect() {
    const std::lock_guard lock(state().mutex);
    if (state().connection) {
        return;
    }
    const std::unique_ptr<char, decltype(&std::free)> folder(realpath(kFolder, nullptr),
                                                             &std::free);
    if (!folder) {
        throw Failure{CALENDAR_ERROR_DB_FAILED};
    }
    state().connection = std::make_unique<Connection>(folder.get(), state().connections_made + 1);
    ++state().connections_made;
}

// Calls the action with the store, within one read transaction.
template <typename Action>
auto read(const Action& action) {
    const std::lock_guard lock(state().mutex);
    Store& store = connected().store;
    Transaction transaction(store, Transaction::Kind::kRead);
    return action(store);
}

// What a write has changed besides the store.
struct Written {
    bool books = false;
    bool events = false;
};

// Calls the action with the store and the new version, within one write transaction; then tells
// the subscribers.
template <typename Action>
void write(const Action& action) {
    Written written;
    std::string folder;
    {
        const std::lock_guard lock(state().mutex);
        Connection& connection = connected();
        folder = connection.folder;
        Transaction transaction(connection.store, Transaction::Kind::kWrite);
        const int version = device::next_version(connection.store);
        written = action(connection.store, version);
        transaction.commit();
        last_write = {connection.number, version};
    }
    if (written.books) {
        device::announce_change(folder, device::kBookView);
    }
    if (written.events) {
        device::announce_change(folder, device::kEventView);
    }
}

constexpr Written kBooks{.books = true, .events = false};
constexpr Written kEvents{.books = false, .events = true};

// The view of a URI that the store keeps records of.
const View& stored_view(const View* view) {
    if (view == nullptr) {
        throw Failure{CALENDAR_ERROR_INVALID_PARAMETER};
    }
    if (view != &device::kBookView && view != &device::kEventView) {
        throw Failure{CALENDAR_ERROR_NOT_SUPPORTED};
    }
    return *view;
}
const View& stored_view(const char* uri) {
    return stored_view(device::find_view(uri));
}

void require(bool condition) {
    if (!condition) {
        throw Failure{CALENDAR_ERROR_INVALID_PARAMETER};
    }
}

}  // namespace

int calendar_connect(void) {
    return device::guarded(connect);
}

int calendar_disconnect(void) {
    return device::guarded([] {
        std::unique_ptr<Connection> closing;
        const std::lock_guard lock(state().mutex);
        static_cast<void>(connected());
        device::unsubscribe_all();
        closing = std::move(state().connection);
    });
}

int calendar_db_insert_record(calendar_record_h record, int* out_id) {
    return device::guarded([&] {
        require(record != nullptr);
        const View& view = stored_view(&record->view);
        int id = 0;
        write([&](Store& store, int version) {
            if (&view == &device::kBookView) {
                id = device::insert_book(store, *record);
                return kBooks;
            }
            id = device::insert_event(store, *record, version);
            return kEvents;
        });
        if (out_id != nullptr) {
            *out_id = id;
        }
    });
}

int calendar_db_get_record(const char* view_uri, int id, calendar_record_h* out_record) {
    return device::guarded([&] {
        require(out_record != nullptr);
        const View& view = stored_view(view_uri);
        *out_record = read([&](Store& store) {
                          return &view == &device::kBookView ? device::read_book(store, id)
                                                             : device::read_event(store, id);
                      }).release();
    });
}

int calendar_db_update_record(calendar_record_h record) {
    return device::guarded([&] {
        require(record != nullptr);
        const View& view = stored_view(&record->view);
        write([&](Store& store, int version) {
            if (&view == &device::kBookView) {
                device::update_book(store, *record, record->at(_calendar_book.id).integer);
                return kBooks;
            }
            device::update_event(store, *record, version);
            return kEvents;
        });
    });
}

int calendar_db_replace_record(calendar_record_h record, int id) {
    return device::guarded([&] {
        require(record != nullptr);
        const View& view = stored_view(&record->view);
        write([&](Store& store, int version) {
            if (&view == &device::kBookView) {
                device::update_book(store, *record, id);
                return kBooks;
            }
            device::replace_event(store, *record, id, version);
            return kEvents;
        });
    });
}

int calendar_db_delete_record(const char* view_uri, int id) {
    return device::guarded([&] {
        const View& view = stored_view(view_uri);
        write([&](Store& store, int version) {
            if (&view == &device::kBookView) {
                return Written{.books = true, .events = device::delete_book(store, id, version)};
            }
            device::delete_event(store, id, version);
            return kEvents;
        });
    });
}

int calendar_db_get_records_with_query(calendar_query_h query, int offset, int limit,
                                       calendar_list_h* out_list) {
    return device::guarded([&] {
        require(query != nullptr && out_list != nullptr && offset >= 0 && limit >= 0);
        const device::Selection selection{query->view, query->conditions, offset, limit};
        *out_list = read([&](Store& store) {
                        return &query->view == &device::kBookView
                                   ? device::read_books(store, selection)
                                   : device::read_events(store, selection);
                    }).release();
    });
}

int calendar_db_get_current_version(int* out_version) {
    return device::guarded([&] {
        require(out_version != nullptr);
        *out_version = read(device::current_version);
    });
}

int calendar_db_get_last_change_version(int* out_version) {
    return device::guarded([&] {
        require(out_version != nullptr);
        const std::lock_guard lock(state().mutex);
        *out_version = connected().number == last_write.connection_number ? last_write.version : 0;
    });
}

int calendar_db_get_changes_by_version(const char* view_uri, int calendar_book_id, int version,
                                       calendar_list_h* out_list, int* out_current_version) {
    return device::guarded([&] {
        require(out_list != nullptr && out_current_version != nullptr);
        if (&stored_view(view_uri) != &device::kEventView) {
            throw Failure{CALENDAR_ERROR_NOT_SUPPORTED};
        }
        int current = 0;
        *out_list = read([&](Store& store) {
                        current = device::current_version(store);
                        return device::read_changes(store, calendar_book_id, version);
                    }).release();
        *out_current_version = current;
    });
}

int calendar_db_add_changed_cb(const char* view_uri, calendar_db_changed_cb callback,
                               void* user_data) {
    return device::guarded([&] {
        require(callback != nullptr);
        const View& view = stored_view(view_uri);
        const std::lock_guard lock(state().mutex);
        device::subscribe(connected().folder, view, callback, user_data);
    });
}

int calendar_db_remove_changed_cb(const char* view_uri, calendar_db_changed_cb callback,
                                  void* user_data) {
    return device::guarded([&] {
        require(callback != nullptr);
        const View& view = stored_view(view_uri);
        const std::lock_guard lock(state().mutex);
        static_cast<void>(connected());
        device::unsubscribe(view, callback, user_data);
    });
}
