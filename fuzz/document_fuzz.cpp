// SPDX-License-Identifier: Apache-2.0
//
// Event documents: the input is read into a record, and the record written again, as an event and
// as a cancelled occurrence. What was written must be read without a failure.
//
// The adapter keeps some things on purpose (a document of which a member cannot be stored,
// calendars that turn an instant into a date). The calls that make and release them are wrapped at
// link time and what was kept is released after each input, so that a long run needs no more memory
// than a short one and any other leak shows.
#include <algorithm>
#include <cstdint>
#include <cstdlib>
#include <string>
#include <vector>

#include "common/owned.h"
#include "common/qor_adapters_json_parser.h"
#include "data-sync/calendar/qor_adapter_data_sync_calendar_parser_event.h"

using Buffer = qor_adapters_json_parse_buffer;

#define JOIN2(a, b) a##b
#define JOIN(a, b) JOIN2(a, b)  // expands b first: ICU's names are macros
#define REAL(name) JOIN(__real_, name)
#define WRAP(name) JOIN(__wrap_, name)

namespace {

template <typename T>
struct Kept {
    std::vector<T> all;

    T add(T one) {
        all.push_back(one);
        return one;
    }
    void remove(T one) { all.erase(std::remove(all.begin(), all.end(), one), all.end()); }
};

Kept<char*> g_texts;
Kept<UCalendar*> g_calendars;
std::vector<Buffer> g_roots;

void check(bool holds) {
    if (!holds) {
        std::abort();
    }
}

}  // namespace

extern "C" {

void REAL(qor_adapters_json_parser_parse_buffer)(const char* text, size_t length, Buffer* root);
void WRAP(qor_adapters_json_parser_parse_buffer)(const char* text, size_t length, Buffer* root) {
    REAL(qor_adapters_json_parser_parse_buffer)(text, length, root);
    g_roots.push_back(*root);
}

void REAL(qor_adapters_json_parser_parse_buffer_free)(Buffer* buffer);
void WRAP(qor_adapters_json_parser_parse_buffer_free)(Buffer* buffer) {
    REAL(qor_adapters_json_parser_parse_buffer_free)(buffer);
    g_roots.clear();
}

char* REAL(g_value_dup_string)(const GValue* value);
char* WRAP(g_value_dup_string)(const GValue* value) {
    return g_texts.add(REAL(g_value_dup_string)(value));
}

void REAL(g_free)(void* memory);
void WRAP(g_free)(void* memory) {
    g_texts.remove(static_cast<char*>(memory));
    REAL(g_free)(memory);
}

UCalendar* REAL(ucal_open)(const UChar* zone, int32_t length, const char* locale,
                           UCalendarType type, UErrorCode* status);
UCalendar* WRAP(ucal_open)(const UChar* zone, int32_t length, const char* locale,
                           UCalendarType type, UErrorCode* status) {
    return g_calendars.add(REAL(ucal_open)(zone, length, locale, type, status));
}

void REAL(ucal_close)(UCalendar* calendar);
void WRAP(ucal_close)(UCalendar* calendar) {
    g_calendars.remove(calendar);
    REAL(ucal_close)(calendar);
}
}

namespace {

void release_kept() {
    for (Buffer& root : g_roots) {
        REAL(qor_adapters_json_parser_parse_buffer_free)(&root);
    }
    std::for_each(g_texts.all.begin(), g_texts.all.end(), REAL(g_free));
    std::for_each(g_calendars.all.begin(), g_calendars.all.end(), REAL(ucal_close));
    g_roots.clear();
    g_texts.all.clear();
    g_calendars.all.clear();
}

int parse(const std::string& text, calendar_adapter_row* row) {
    check(calendar_record_create(_calendar_event._uri, &row->record) == 0);
    const int result = _qor_calendar_parse_event_from_json(text.c_str(), 0, text.size(), 0, row);
    release_kept();
    return result;
}

std::string make(calendar_record_h record, const char* exdate) {
    char* made = nullptr;
    size_t length = 0;
    const int result = _qor_calendar_parse_make_event_to_json(record, exdate, &made, &length);
    check((result == 0) == (made != nullptr) && (result == 0 || result == 6));
    const GText text(made);
    return text ? std::string(text.get(), length) : std::string();
}

}  // namespace

extern "C" int LLVMFuzzerInitialize(int* /*argc*/, char*** /*argv*/) {
    g_set_print_handler([](const char*) {});  // roots without children are told of
    return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    if (size == 0) {
        return 0;
    }
    calendar_adapter_row row{};
    const int result = parse(std::string(reinterpret_cast<const char*>(data), size), &row);
    check(result == 0 || result == -1);
    check(make(row.record, "20140315T093000Z").empty());  // no host knows this event
    if (const std::string text = make(row.record, nullptr); !text.empty()) {
        calendar_adapter_row again{};
        check(parse(text, &again) == 0);
        check(again.exception_status == 0 && again.has_pending_duration == 0);
        _qor_calendar_free_adapter_row(&again);
    }
    _qor_calendar_free_adapter_row(&row);
    release_kept();
    return 0;
}
