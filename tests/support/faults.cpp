// SPDX-License-Identifier: Apache-2.0
//
// See faults.h. For each function in wrapped_functions.txt the linker turns calls of NAME into
// calls of __wrap_NAME, and __real_NAME into the function itself.
#include "tests/support/faults.h"

#include <fcntl.h>
#include <json-glib/json-glib.h>
#include <pthread.h>
#include <sqlite3.h>
#include <sys/stat.h>
#include <unicode/ucal.h>

#include <cerrno>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <mutex>
#include <ostream>
#include <utility>

#include "common/device.h"

namespace {

struct Layer {
    std::mutex mutex;
    std::string armed;      // the function that is to fail; empty for any
    bool counting = false;  // calls are counted
    int nth = 0;            // which call fails; 0 for none
    int calls = 0;
    const char* fired = nullptr;
    std::vector<LogLine> log;
};

Layer& layer() {
    static auto* const instance = new Layer;  // never destroyed: used until the last call of exit
    return *instance;
}

// Set while this file itself works, so that it does not fail itself.
thread_local bool t_inside = false;

// Holds the layer. The mutex is wrapped like any other, so its own calls must not count.
class Lock {
  public:
    Lock() : was_inside_(std::exchange(t_inside, true)) { layer().mutex.lock(); }
    ~Lock() {
        layer().mutex.unlock();
        t_inside = was_inside_;
    }
    Lock(const Lock&) = delete;
    Lock& operator=(const Lock&) = delete;

  private:
    bool was_inside_;
};

bool hit(const char* function) {
    if (t_inside) {
        return false;
    }
    const Lock lock;
    Layer& l = layer();
    bool fails = false;
    if (l.counting && l.fired == nullptr && (l.armed.empty() || l.armed == function)) {
        fails = ++l.calls == l.nth;
        l.fired = fails ? function : nullptr;
    }
    return fails;
}

void fail(const char* function, int nth) {
    const Lock lock;
    Layer& l = layer();
    l.armed = function;
    l.counting = true;
    l.nth = nth;
    l.calls = 0;
    l.fired = nullptr;
}

void clear() {
    const Lock lock;
    Layer& l = layer();
    l.counting = false;
    l.fired = nullptr;
}

const char* fired() {
    const Lock lock;
    Layer& l = layer();
    return l.fired;
}

int calls() {
    const Lock lock;
    Layer& l = layer();
    return l.calls;
}

void take_log(void (*line)(const char*, const char*, const char*, void*), void* user_data) {
    std::vector<LogLine> log;
    {
        const Lock lock;
        Layer& l = layer();
        log.swap(l.log);
    }
    for (const LogLine& entry : log) {
        line(entry.level.c_str(), entry.function.c_str(), entry.text.c_str(), user_data);
    }
}

// "FILE: FUNCTION(LINE) > ESC[..m* LEVEL * TEXT ESC[0;m"
LogLine parse_line(const std::string& line) {
    const size_t function = line.find(": ") + 2;
    const size_t function_end = line.find('(', function);
    const size_t level = line.find("m* ", function_end) + 3;
    const size_t level_end = line.find(" * ", level);
    const size_t text = level_end + 3;
    return {line.substr(level, level_end - level), line.substr(function, function_end - function),
            line.substr(text, line.rfind("\033[0;m") - text)};
}

}  // namespace

std::ostream& operator<<(std::ostream& out, const LogLine& line) {
    return out << line.level << ' ' << line.function << ": \"" << line.text << '"';
}

extern "C" __attribute__((visibility("default"))) const FaultControl* qor_fault_control() {
    static const FaultControl control = {fail, clear, fired, calls, take_log};
    return &control;
}

std::vector<LogLine> faults::take_log(const FaultControl* control) {
    std::vector<LogLine> log;
    control->take_log(
        [](const char* level, const char* function, const char* text, void* user_data) {
            static_cast<std::vector<LogLine>*>(user_data)->push_back({level, function, text});
        },
        &log);
    return log;
}

// NOLINTBEGIN(bugprone-macro-parentheses): types and names of a signature
#define JOIN2(a, b) a##b
#define JOIN(a, b) JOIN2(a, b)  // expands b first: ICU's names are macros

// A wrapped function that answers `failure` when its turn to fail has come.
#define WRAP(result, name, parameters, arguments, failure)                                \
    extern "C" result JOIN(__real_, name) parameters;                                     \
    extern "C" result JOIN(__wrap_, name) parameters;                                     \
    extern "C" result JOIN(__wrap_, name) parameters {                                    \
        return hit(#name) ? static_cast<result>(failure) : JOIN(__real_, name) arguments; \
    }

constexpr int kCalendarFailure = CALENDAR_ERROR_DB_FAILED;
constexpr int kAccountFailure = ACCOUNT_ERROR_DB_FAILED;
using Rec = calendar_record_h;
using Lst = calendar_list_h;
using Uint = unsigned int;
using Uri = const char*;

WRAP(int, account_connect, (), (), kAccountFailure)
WRAP(int, account_disconnect, (), (), kAccountFailure)
WRAP(int, account_foreach_account_from_db, (account_cb f, void* u), (f, u), kAccountFailure)
WRAP(int, account_get_user_name, (account_h a, char** n), (a, n), kAccountFailure)
WRAP(int, calendar_connect, (), (), kCalendarFailure)
WRAP(int, calendar_disconnect, (), (), kCalendarFailure)
WRAP(int, calendar_db_add_changed_cb, (Uri v, calendar_db_changed_cb f, void* u), (v, f, u),
     kCalendarFailure)
WRAP(int, calendar_db_remove_changed_cb, (Uri v, calendar_db_changed_cb f, void* u), (v, f, u),
     kCalendarFailure)
WRAP(int, calendar_db_delete_record, (Uri v, int i), (v, i), kCalendarFailure)
WRAP(int, calendar_db_get_changes_by_version, (Uri v, int b, int n, Lst* l, int* c),
     (v, b, n, l, c), kCalendarFailure)
WRAP(int, calendar_db_get_current_version, (int* n), (n), kCalendarFailure)
WRAP(int, calendar_db_get_last_change_version, (int* n), (n), kCalendarFailure)
WRAP(int, calendar_db_get_record, (Uri v, int i, Rec* r), (v, i, r), kCalendarFailure)
WRAP(int, calendar_db_get_records_with_query, (calendar_query_h q, int o, int n, Lst* l),
     (q, o, n, l), kCalendarFailure)
WRAP(int, calendar_db_insert_record, (Rec r, int* i), (r, i), kCalendarFailure)
WRAP(int, calendar_db_replace_record, (Rec r, int i), (r, i), kCalendarFailure)
WRAP(int, calendar_db_update_record, (Rec r), (r), kCalendarFailure)
WRAP(int, calendar_filter_add_int,
     (calendar_filter_h f, Uint p, calendar_match_int_flag_e m, int v), (f, p, m, v),
     kCalendarFailure)
WRAP(int, calendar_filter_add_operator, (calendar_filter_h f, calendar_filter_operator_e o), (f, o),
     kCalendarFailure)
WRAP(int, calendar_filter_create, (Uri v, calendar_filter_h* f), (v, f), kCalendarFailure)
WRAP(int, calendar_list_first, (Lst l), (l), kCalendarFailure)
WRAP(int, calendar_list_get_count, (Lst l, int* n), (l, n), kCalendarFailure)
WRAP(int, calendar_list_get_current_record_p, (Lst l, Rec* r), (l, r), kCalendarFailure)
WRAP(int, calendar_list_next, (Lst l), (l), kCalendarFailure)
WRAP(int, calendar_query_create, (Uri v, calendar_query_h* q), (v, q), kCalendarFailure)
WRAP(int, calendar_query_set_filter, (calendar_query_h q, calendar_filter_h f), (q, f),
     kCalendarFailure)
WRAP(int, calendar_record_add_child_record, (Rec r, Uint p, Rec c), (r, p, c), kCalendarFailure)
WRAP(int, calendar_record_create, (Uri v, Rec* r), (v, r), kCalendarFailure)
WRAP(int, calendar_record_get_caltime, (Rec r, Uint p, calendar_time_s* v), (r, p, v),
     kCalendarFailure)
WRAP(int, calendar_record_get_child_record_at_p, (Rec r, Uint p, int i, Rec* c), (r, p, i, c),
     kCalendarFailure)
WRAP(int, calendar_record_get_child_record_count, (Rec r, Uint p, int* n), (r, p, n),
     kCalendarFailure)
WRAP(int, calendar_record_get_double, (Rec r, Uint p, double* v), (r, p, v), kCalendarFailure)
WRAP(int, calendar_record_get_int, (Rec r, Uint p, int* v), (r, p, v), kCalendarFailure)
WRAP(int, calendar_record_get_str_p, (Rec r, Uint p, char** v), (r, p, v), kCalendarFailure)
WRAP(int, calendar_record_get_uri_p, (Rec r, const char** v), (r, v), kCalendarFailure)
WRAP(int, calendar_record_set_caltime, (Rec r, Uint p, calendar_time_s v), (r, p, v),
     kCalendarFailure)
WRAP(int, calendar_record_set_double, (Rec r, Uint p, double v), (r, p, v), kCalendarFailure)
WRAP(int, calendar_record_set_int, (Rec r, Uint p, int v), (r, p, v), kCalendarFailure)
WRAP(int, calendar_record_set_str, (Rec r, Uint p, const char* v), (r, p, v), kCalendarFailure)

WRAP(int, db_util_open, (const char* p, sqlite3** d, int o), (p, d, o), SQLITE_CANTOPEN)
WRAP(int, sqlite3_bind_text, (sqlite3_stmt * s, int i, const char* t, int n, void (*f)(void*)),
     (s, i, t, n, f), SQLITE_NOMEM)
WRAP(const unsigned char*, sqlite3_column_text, (sqlite3_stmt * s, int i), (s, i), nullptr)
WRAP(int, sqlite3_step, (sqlite3_stmt * s), (s), SQLITE_IOERR)
WRAP(int, fchmod, (int f, mode_t m), (f, m), -1)

WRAP(void*, calloc, (size_t n, size_t s), (n, s), nullptr)
WRAP(void*, malloc, (size_t s), (s), nullptr)
WRAP(char*, strdup, (const char* t), (t), nullptr)

WRAP(JsonArray*, json_array_new, (), (), nullptr)
WRAP(JsonGenerator*, json_generator_new, (), (), nullptr)
WRAP(JsonNode*, json_node_new, (JsonNodeType t), (t), nullptr)
WRAP(JsonObject*, json_object_new, (), (), nullptr)
WRAP(JsonParser*, json_parser_new, (), (), nullptr)

// Functions that report otherwise than by their result alone.

extern "C" {

int __real_sqlite3_exec(sqlite3* d, const char* s, int (*f)(void*, int, char**, char**), void* u,
                        char** e);
int __wrap_sqlite3_exec(sqlite3* d, const char* s, int (*f)(void*, int, char**, char**), void* u,
                        char** e);
int __wrap_sqlite3_exec(sqlite3* d, const char* s, int (*f)(void*, int, char**, char**), void* u,
                        char** e) {
    if (!hit("sqlite3_exec")) {
        return __real_sqlite3_exec(d, s, f, u, e);
    }
    if (e != nullptr) {
        *e = sqlite3_mprintf("injected");
    }
    return SQLITE_IOERR;
}

int __real_sqlite3_prepare_v2(sqlite3* d, const char* s, int n, sqlite3_stmt** t, const char** e);
int __wrap_sqlite3_prepare_v2(sqlite3* d, const char* s, int n, sqlite3_stmt** t, const char** e);
int __wrap_sqlite3_prepare_v2(sqlite3* d, const char* s, int n, sqlite3_stmt** t, const char** e) {
    if (!hit("sqlite3_prepare_v2")) {
        return __real_sqlite3_prepare_v2(d, s, n, t, e);
    }
    *t = nullptr;
    return SQLITE_NOMEM;
}

// A mutex call that fails has still done its work, so that no thread is left without its lock.
int __real_pthread_mutex_lock(pthread_mutex_t* m);
int __wrap_pthread_mutex_lock(pthread_mutex_t* m);
int __wrap_pthread_mutex_lock(pthread_mutex_t* m) {
    const int result = __real_pthread_mutex_lock(m);
    return hit("pthread_mutex_lock") ? EINVAL : result;
}
int __real_pthread_mutex_unlock(pthread_mutex_t* m);
int __wrap_pthread_mutex_unlock(pthread_mutex_t* m);
int __wrap_pthread_mutex_unlock(pthread_mutex_t* m) {
    const int result = __real_pthread_mutex_unlock(m);
    return hit("pthread_mutex_unlock") ? EPERM : result;
}

int __real_open(const char* path, int flags, ...);
int __wrap_open(const char* path, int flags, ...);
int __wrap_open(const char* path, int flags, ...) {
    va_list arguments;
    va_start(arguments, flags);
    const mode_t mode = (flags & O_CREAT) != 0 ? va_arg(arguments, mode_t) : 0;
    va_end(arguments);
    if (hit("open")) {
        errno = EACCES;
        return -1;
    }
    return __real_open(path, flags, mode);
}

// The log never fails; it is captured and handed on.
int __real___dlog_print(int log_id, int priority, const char* tag, const char* format, ...);
__attribute__((format(printf, 4, 5))) int __wrap___dlog_print(int log_id, int priority,
                                                              const char* tag, const char* format,
                                                              ...);
int __wrap___dlog_print(int log_id, int priority, const char* tag, const char* format, ...) {
    const bool inside = t_inside;
    t_inside = true;
    va_list arguments;
    va_start(arguments, format);
    char* line = nullptr;
    const int length = vasprintf(&line, format, arguments);
    va_end(arguments);
    int result = -1;
    if (length >= 0) {
        {
            const Lock lock;
            Layer& l = layer();
            l.log.push_back(parse_line(line));
        }
        result = __real___dlog_print(log_id, priority, tag, "%s", line);
        std::free(line);
    }
    t_inside = inside;
    return result;
}

// ICU reports through its status.
#define WRAP_ICU(result, name, parameters, arguments, failure) \
    result JOIN(__real_, name) parameters;                     \
    result JOIN(__wrap_, name) parameters;                     \
    result JOIN(__wrap_, name) parameters {                    \
        if (!hit(#name)) {                                     \
            return JOIN(__real_, name) arguments;              \
        }                                                      \
        *status = U_INTERNAL_PROGRAM_ERROR;                    \
        return failure;                                        \
    }
WRAP_ICU(UCalendar*, ucal_open,
         (const UChar* z, int32_t n, const char* l, UCalendarType t, UErrorCode* status),
         (z, n, l, t, status), nullptr)
WRAP_ICU(void, ucal_setMillis, (UCalendar * c, UDate d, UErrorCode* status), (c, d, status), )
WRAP_ICU(void, ucal_setDate, (UCalendar * c, int32_t y, int32_t m, int32_t d, UErrorCode* status),
         (c, y, m, d, status), )
WRAP_ICU(void, ucal_add, (UCalendar * c, UCalendarDateFields f, int32_t n, UErrorCode* status),
         (c, f, n, status), )
WRAP_ICU(int32_t, ucal_get, (const UCalendar* c, UCalendarDateFields f, UErrorCode* status),
         (c, f, status), 0)
WRAP_ICU(UDate, ucal_getMillis, (const UCalendar* c, UErrorCode* status), (c, status), 0)
WRAP_ICU(int32_t, ucal_getTimeZoneID,
         (const UCalendar* c, UChar* id, int32_t n, UErrorCode* status), (c, id, n, status), 0)
}
// NOLINTEND(bugprone-macro-parentheses)
