// SPDX-License-Identifier: Apache-2.0
//
// The names of documents in the cloud. A key is ASCII without quotes, blanks or control
// characters, since adapters put it between single quotes in their SQL.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

namespace qor {

// A new key that no document has had before: 128 random bits as text, "ev-" and 32 hexadecimal
// digits. Empty when the system has no random numbers to give.
std::string new_cloud_key();

// The key of one occurrence of a recurring event: its parent's key, "#" and the instant that the
// rule gave the occurrence, "evening-class#20260105T190000Z". The same occurrence has the same key
// whoever cancels or changes it. `instant_ms` is "originalInstanceTime" (midnight UTC of the date
// for an all-day event).
std::string occurrence_key(std::string_view parent_key, std::int64_t instant_ms);

// The key of an imported event: its UID where that can stand as a key, else "uid-" and a digest of
// it. An exported event's UID is its key, so that importing an export meets the same documents.
std::string key_from_uid(std::string_view uid);

// Hexadecimal SHA-256 of a text; what imports use to tell whether their source has changed.
std::string text_digest(std::string_view text);

}  // namespace qor
