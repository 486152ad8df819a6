// SPDX-License-Identifier: Apache-2.0
//
// What must not be forgotten when the process is killed.
#include "host/database/journal.h"

namespace qor {

namespace {

// A deletion replaces what was noted before; a change never takes a deletion back, since an item's
// number is not used again. The time is when the item was first noted.
constexpr const char* kNoteChange =
    "INSERT INTO device_change(adapter_id, gone, noticed_ms, reason, label) VALUES(?, ?, ?, '', '')"
    " ON CONFLICT(adapter_id) DO UPDATE SET gone = max(gone, excluded.gone)";
constexpr const char* kRetry =
    "INSERT INTO retry VALUES(?, ?, ?, ?, ?) ON CONFLICT(cloud_key) DO UPDATE SET "
    "reason = excluded.reason, label = excluded.label, "
    "interrupted = max(interrupted, excluded.interrupted)";
constexpr const char* kAnything =
    "SELECT EXISTS(SELECT 1 FROM device_change) OR EXISTS(SELECT 1 FROM intent) "
    "OR EXISTS(SELECT 1 FROM retry)";

}  // namespace

void Journal::note_change(int id, bool gone, std::int64_t now_ms) {
    connection_.run(kNoteChange, id, static_cast<std::int64_t>(gone), now_ms);
}

std::vector<DeviceChange> Journal::changes() {
    Rows rows = connection_.query(
        "SELECT adapter_id, gone, noticed_ms, reason, label FROM device_change ORDER BY seq");
    std::vector<DeviceChange> changes;
    while (rows.next()) {
        changes.push_back({static_cast<int>(rows.integer(0)), rows.integer(1) != 0, rows.integer(2),
                           rows.text(3), rows.text(4)});
    }
    return changes;
}

void Journal::explain_change(int id, std::string_view reason, std::string_view label) {
    connection_.run("UPDATE device_change SET reason = ?, label = ? WHERE adapter_id = ?", reason,
                    label, id);
}

void Journal::drop_change(int id) {
    connection_.run("DELETE FROM device_change WHERE adapter_id = ?", id);
}

void Journal::intend(const Intent& intent) {
    connection_.run(
        "INSERT INTO intent(action, cloud_key, document, cloud_revision, base_id) "
        "VALUES(?, ?, ?, ?, ?)",
        static_cast<std::int64_t>(intent.action), intent.key, intent.document, intent.revision,
        intent.base_id);
}

std::vector<Intent> Journal::intents() {
    Rows rows = connection_.query(
        "SELECT action, cloud_key, document, cloud_revision, base_id FROM intent ORDER BY seq");
    std::vector<Intent> intents;
    while (rows.next()) {
        intents.push_back({static_cast<Action>(rows.integer(0)), rows.text(1), rows.text(2),
                           rows.integer(3), static_cast<int>(rows.integer(4))});
    }
    return intents;
}

void Journal::drop_intents() {
    connection_.script("DELETE FROM intent");
}

void Journal::retry(const Retry& retry) {
    connection_.run(kRetry, retry.key, retry.reason, retry.label, retry.since_ms,
                    static_cast<std::int64_t>(retry.interrupted));
}

std::vector<Retry> Journal::retries() {
    Rows rows = connection_.query(
        "SELECT cloud_key, reason, label, since_ms, interrupted FROM retry ORDER BY rowid");
    std::vector<Retry> retries;
    while (rows.next()) {
        retries.push_back(
            {rows.text(0), rows.text(1), rows.text(2), rows.integer(3), rows.integer(4) != 0});
    }
    return retries;
}

void Journal::drop_retry(std::string_view key) {
    connection_.run("DELETE FROM retry WHERE cloud_key = ?", key);
}

bool Journal::empty() {
    return connection_.number(kAnything) == 0;
}

}  // namespace qor
