// SPDX-License-Identifier: Apache-2.0
//
// Coordinates: whole micro-degrees as decimal text in a document, degrees in an event record. No
// state between calls.
#include <algorithm>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <cstring>

#include "common/log.h"
#include "common/result.h"
#include "data-sync/calendar/qor_adapter_data_sync_calendar_parser.h"

namespace {

constexpr double kMicroDegrees = 1000000.0;

double parse_degrees(const char* text) {
    return static_cast<double>(std::strtoll(text, nullptr, 10)) / kMicroDegrees;
}

// The text of a position: six decimals without their separator, "0500000" for half a degree. False
// for what has no such text (not finite, or 23 digits and more).
bool format_micro_degrees(double degrees, char (&text)[32]) {
    const int length = std::snprintf(text, sizeof(text), "%.6f", degrees);
    if (!std::isfinite(degrees) || length < 0 || static_cast<size_t>(length) >= sizeof(text)) {
        return false;
    }
    // The separator is the host locale's, one byte or more: only sign and digits stay.
    char* end = std::remove_if(text, text + length,
                               [](char c) { return c != '-' && (c < '0' || c > '9'); });
    *end = '\0';
    return true;
}

bool is_event(calendar_record_h record) {
    return __qor_calendar_get_record_type(record) == kEventRecord;
}

}  // namespace

int _qor_calendar_parse_latitude(const char* text, calendar_record_h record) {
    if (text == nullptr || !is_event(record)) {
        return kNotAnEvent;
    }
    const int error =
        calendar_record_set_double(record, _calendar_event.latitude, parse_degrees(text));
    if (error != CALENDAR_ERROR_NONE) {
        QOR_LOG(CRITICAL, "set_double() fail (%x)", error);
        return kServiceFailed;
    }
    return kSuccess;
}

int _qor_calendar_parse_longitude(const char* text, calendar_record_h record) {
    if (text == nullptr || !is_event(record)) {
        return kNotAnEvent;
    }
    const int error =
        calendar_record_set_double(record, _calendar_event.longitude, parse_degrees(text));
    if (error != CALENDAR_ERROR_NONE) {
        QOR_LOG(CRITICAL, "set_double() fail (%x)", error);
        return kServiceFailed;
    }
    return kSuccess;
}

int _qor_calendar_make_latitude(calendar_record_h record, char** text) {
    if (text == nullptr || !is_event(record)) {
        return kNotAnEvent;
    }
    double degrees = CALENDAR_RECORD_NO_COORDINATE;
    const int error = calendar_record_get_double(record, _calendar_event.latitude, &degrees);
    if (error != CALENDAR_ERROR_NONE) {
        QOR_LOG(CRITICAL, "get_double() fail (%x)", error);
        return kServiceFailed;
    }
    if (degrees == CALENDAR_RECORD_NO_COORDINATE) {
        return kSuccess;
    }
    char digits[32];
    if (!format_micro_degrees(degrees, digits)) {
        QOR_LOG(CRITICAL, "no place: %g degrees", degrees);
        return kSuccess;
    }
    char* copy = strdup(digits);
    if (copy == nullptr) {
        QOR_LOG(CRITICAL, "Failed to strdup");
        return kServiceFailed;
    }
    *text = copy;
    return kSuccess;
}

int _qor_calendar_make_longitude(calendar_record_h record, char** text) {
    if (text == nullptr || !is_event(record)) {
        return kNotAnEvent;
    }
    double degrees = CALENDAR_RECORD_NO_COORDINATE;
    const int error = calendar_record_get_double(record, _calendar_event.longitude, &degrees);
    if (error != CALENDAR_ERROR_NONE) {
        QOR_LOG(CRITICAL, "get_double() fail (%x)", error);
        return kServiceFailed;
    }
    if (degrees == CALENDAR_RECORD_NO_COORDINATE) {
        return kSuccess;
    }
    char digits[32];
    if (!format_micro_degrees(degrees, digits)) {
        QOR_LOG(CRITICAL, "no place: %g degrees", degrees);
        return kSuccess;
    }
    char* copy = strdup(digits);
    if (copy == nullptr) {
        QOR_LOG(CRITICAL, "Failed to strdup");
        return kServiceFailed;
    }
    *text = copy;
    return kSuccess;
}
