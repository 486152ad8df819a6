// SPDX-License-Identifier: Apache-2.0
#include "platform/calendar-service/app/zone.h"

#include <unicode/strenum.h>
#include <unicode/timezone.h>

#include <algorithm>
#include <map>
#include <memory>
#include <mutex>

#include "cli/nearest.h"

namespace calendar_text {
namespace {

using Rules = std::unique_ptr<const icu::BasicTimeZone>;

Rules make_rules(const std::string& id) {
    std::unique_ptr<icu::TimeZone> zone(
        icu::TimeZone::createTimeZone(icu::UnicodeString::fromUTF8(id)));
    if (!zone || *zone == icu::TimeZone::getUnknown()) {
        return nullptr;
    }
    const auto* rules = dynamic_cast<const icu::BasicTimeZone*>(zone.get());
    if (rules != nullptr) {
        static_cast<void>(zone.release());  // the same object, owned as what it is from here on
    }
    return Rules(rules);
}

const icu::BasicTimeZone* cached_rules(const std::string& id) {
    static std::mutex mutex;
    static std::map<std::string, Rules> cache;
    const std::lock_guard<std::mutex> lock(mutex);
    const auto found = cache.find(id);
    if (found != cache.end()) {
        return found->second.get();
    }
    return cache.emplace(id, make_rules(id)).first->second.get();
}

}  // namespace

Zone Zone::utc() {
    return Zone("Etc/GMT", nullptr);
}

std::optional<Zone> Zone::find(const std::string& id) {
    if (id.empty() || id == "Etc/GMT") {
        return utc();
    }
    const icu::BasicTimeZone* rules = cached_rules(id);
    if (rules == nullptr) {
        return std::nullopt;
    }
    return Zone(id, rules);
}

Zone Zone::of_machine() {
    const std::unique_ptr<icu::TimeZone> zone(icu::TimeZone::detectHostTimeZone());
    icu::UnicodeString id;
    std::string text;
    if (zone) {
        zone->getID(id).toUTF8String(text);
    }
    for (const char* same : {"Etc/UTC", "UTC", "GMT", "Etc/Unknown"}) {
        text = text == same ? "Etc/GMT" : text;
    }
    return find(text).value_or(utc());
}

std::string Zone::nearest_id(const std::string& id) {
    UErrorCode status = U_ZERO_ERROR;
    const std::unique_ptr<icu::StringEnumeration> ids(
        icu::TimeZone::createTimeZoneIDEnumeration(UCAL_ZONE_TYPE_ANY, nullptr, nullptr, status));
    qor::Nearest nearest(id);
    while (U_SUCCESS(status) && ids) {
        const char* next = ids->next(nullptr, status);
        if (next == nullptr) {
            break;
        }
        nearest.offer(next);
    }
    return nearest.name();
}

std::int64_t Zone::to_utc(std::int64_t wall_s) const {
    const std::int64_t wall = std::clamp(wall_s, kEarliest_s, kLatest_s);
    if (rules_ == nullptr) {
        return wall;
    }
    UErrorCode status = U_ZERO_ERROR;
    int32_t raw_ms = 0;
    int32_t saving_ms = 0;
    rules_->getOffsetFromLocal(static_cast<double>(wall) * 1000.0, UCAL_TZ_LOCAL_FORMER,
                               UCAL_TZ_LOCAL_FORMER, raw_ms, saving_ms, status);
    return U_SUCCESS(status) ? wall - (raw_ms + saving_ms) / 1000 : wall;
}

std::int64_t Zone::to_wall(std::int64_t utc_s) const {
    const std::int64_t utc = std::clamp(utc_s, kEarliest_s, kLatest_s);
    if (rules_ == nullptr) {
        return utc;
    }
    UErrorCode status = U_ZERO_ERROR;
    int32_t raw_ms = 0;
    int32_t saving_ms = 0;
    rules_->getOffset(static_cast<double>(utc) * 1000.0, 0, raw_ms, saving_ms, status);
    return U_SUCCESS(status) ? utc + (raw_ms + saving_ms) / 1000 : utc;
}

}  // namespace calendar_text
