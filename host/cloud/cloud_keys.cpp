// SPDX-License-Identifier: Apache-2.0
//
// The names of documents in the cloud. Keeps no state; any thread.
#include "host/cloud/cloud_keys.h"

#include <fmt/format.h>
#include <glib.h>
#include <sys/random.h>

#include <algorithm>
#include <array>
#include <chrono>

namespace qor {
namespace {

constexpr std::size_t kLongestPlainUid = 200;  // longer ones become digests

bool can_stand_in_key(char c) {
    const bool alphanumeric =
        (c >= '0' && c <= '9') || (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z');
    return alphanumeric || std::string_view("._@#-+=:/{}~").find(c) != std::string_view::npos;
}

}  // namespace

std::string text_digest(std::string_view text) {
    gchar* digest = g_compute_checksum_for_data(
        G_CHECKSUM_SHA256, reinterpret_cast<const guchar*>(text.data()), text.size());
    std::string result(digest);
    g_free(digest);
    return result;
}

std::string new_cloud_key() {
    std::array<unsigned char, 16> bits{};
    if (getrandom(bits.data(), bits.size(), 0) != static_cast<ssize_t>(bits.size())) {
        return {};
    }
    return fmt::format("ev-{:02x}", fmt::join(bits, ""));
}

std::string occurrence_key(std::string_view parent_key, std::int64_t instant_ms) {
    using std::chrono::days, std::chrono::floor, std::chrono::milliseconds, std::chrono::seconds;
    const std::chrono::sys_time<milliseconds> instant{milliseconds(instant_ms)};
    const auto second = floor<seconds>(instant);
    const auto day = floor<days>(second);
    const std::chrono::year_month_day date(day);
    const int year = static_cast<int>(date.year());
    if (year < 0 || year > 9999 || second.time_since_epoch() / days(366) > 9000 ||
        second.time_since_epoch() / days(366) < -9000) {
        return fmt::format("{}#{}", parent_key, instant_ms);
    }
    const std::chrono::hh_mm_ss time(second - day);
    return fmt::format("{}#{:04}{:02}{:02}T{:02}{:02}{:02}Z", parent_key, year,
                       static_cast<unsigned>(date.month()), static_cast<unsigned>(date.day()),
                       time.hours().count(), time.minutes().count(), time.seconds().count());
}

std::string key_from_uid(std::string_view uid) {
    if (!uid.empty() && uid.size() <= kLongestPlainUid &&
        std::ranges::all_of(uid, can_stand_in_key)) {
        return std::string(uid);
    }
    return "uid-" + text_digest(uid).substr(0, 32);
}

}  // namespace qor
