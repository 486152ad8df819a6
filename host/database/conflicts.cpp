// SPDX-License-Identifier: Apache-2.0
//
// The documents that lost a conflict.
#include "host/database/conflicts.h"

namespace qor {

namespace {

constexpr const char* kKeep =
    "INSERT INTO conflict(time_ms, cloud_key, label, lost, document, kept, restored) "
    "SELECT ?1, ?2, ?3, ?4, ?5, ?6, 0 WHERE NOT EXISTS(SELECT 1 FROM conflict "
    "WHERE cloud_key = ?2 AND lost = ?4 AND document = ?5 AND restored = 0)";
constexpr const char* kList =
    "SELECT id, time_ms, cloud_key, label, lost, document, kept, restored FROM conflict "
    "ORDER BY id";
constexpr const char* kGet =
    "SELECT id, time_ms, cloud_key, label, lost, document, kept, restored FROM conflict "
    "WHERE id = ?";

Conflict read(const Rows& rows) {
    return {rows.integer(0), rows.integer(1), rows.text(2), rows.text(3),
            rows.text(4),    rows.text(5),    rows.text(6), rows.integer(7) != 0};
}

}  // namespace

void Conflicts::keep(const Conflict& conflict) {
    connection_.run(kKeep, conflict.time_ms, conflict.key, conflict.label, conflict.lost,
                    conflict.document, conflict.kept);
}

std::vector<Conflict> Conflicts::list() {
    Rows rows = connection_.query(kList);
    std::vector<Conflict> conflicts;
    while (rows.next()) {
        conflicts.push_back(read(rows));
    }
    return conflicts;
}

std::optional<Conflict> Conflicts::get(std::int64_t id) {
    Rows rows = connection_.query(kGet, id);
    return rows.next() ? std::optional<Conflict>(read(rows)) : std::nullopt;
}

void Conflicts::mark_restored(std::int64_t id) {
    connection_.run("UPDATE conflict SET restored = 1 WHERE id = ?", id);
}

}  // namespace qor
