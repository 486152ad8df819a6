// SPDX-License-Identifier: Apache-2.0
#include "bench/counters.h"

#include <sqlite3.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <atomic>
#include <cctype>
#include <cstring>

namespace {

// A calendar service may write from a thread of its own.
std::atomic<long> syncs = 0;
std::atomic<long> adapter_statements = 0;
std::atomic<long> other_statements = 0;
std::vector<std::string>* collected = nullptr;

std::string without_numbers(const char* sql) {
    std::string text;
    for (; *sql != '\0'; ++sql) {
        if (std::isdigit(static_cast<unsigned char>(*sql)) == 0) {
            text += *sql;
        } else if (text.empty() || text.back() != '#') {
            text += '#';
        }
    }
    return text;
}

int count_adapter_statement(unsigned /*event*/, void* /*context*/, void* statement, void* /*sql*/) {
    ++adapter_statements;
    if (collected != nullptr) {
        collected->push_back(without_numbers(sqlite3_sql(static_cast<sqlite3_stmt*>(statement))));
    }
    return 0;
}

int count_other_statement(unsigned /*event*/, void* /*context*/, void* /*statement*/,
                          void* /*sql*/) {
    ++other_statements;
    return 0;
}

// Called by SQLite for each new connection; the file decides whose it is.
int trace_connection(sqlite3* db, char** /*error*/, const void* /*api*/) {
    const char* file = sqlite3_db_filename(db, "main");
    const bool is_adapters = file != nullptr && (std::strstr(file, "qor-adapter") != nullptr ||
                                                 std::strstr(file, "cloud_qor") != nullptr);
    return sqlite3_trace_v2(db, SQLITE_TRACE_STMT,
                            is_adapters ? count_adapter_statement : count_other_statement, nullptr);
}

}  // namespace

// Every disk sync of the process comes through these, since the program's symbols go before those
// of the C library.
extern "C" int fdatasync(int fd) {
    ++syncs;
    return static_cast<int>(syscall(SYS_fdatasync, fd));
}
extern "C" int fsync(int fd) {
    ++syncs;
    return static_cast<int>(syscall(SYS_fsync, fd));
}

void start_counting() {
    // SQLite takes the function by a type without arguments.
    static_cast<void>(  // without it every count is 0, which the comparison with the floor shows
        sqlite3_auto_extension(reinterpret_cast<void (*)()>(trace_connection)));
}

Counts counts_now() {
    return {syncs, adapter_statements, other_statements};
}

Counts operator-(const Counts& later, const Counts& earlier) {
    return {later.syncs - earlier.syncs, later.adapter_statements - earlier.adapter_statements,
            later.other_statements - earlier.other_statements};
}

void collect_statements(std::vector<std::string>* texts) {
    collected = texts;
}
