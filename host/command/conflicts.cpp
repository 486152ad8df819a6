// SPDX-License-Identifier: Apache-2.0
//
// conflicts: the documents that lost, and putting one back into the cloud, from where every device
// gets it. What it replaces there is kept in turn.
#include <fmt/format.h>
#include <nlohmann/json.hpp>

#include "cli/terminal.h"
#include "host/command/command.h"
#include "host/command/device.h"
#include "host/command/output.h"
#include "host/failure.h"
#include "host/sync/context.h"

namespace qor {

namespace {

using Json = nlohmann::ordered_json;

Json conflict_json(const Conflict& conflict, bool whole) {
    Json json = {{"id", conflict.id},       {"time", time_text(conflict.time_ms)},
                 {"title", conflict.label}, {"key", conflict.key},
                 {"lost", conflict.lost},   {"restored", conflict.restored}};
    if (whole) {
        json["document"] = Json::parse(conflict.document, nullptr, false);
        json["kept"] =
            conflict.kept.empty() ? Json(nullptr) : Json::parse(conflict.kept, nullptr, false);
    }
    return json;
}

Exit list(Conflicts& conflicts, bool as_json) {
    Json all = Json::array();
    for (const Conflict& conflict : conflicts.list()) {
        all.push_back(conflict_json(conflict, false));
        if (!as_json) {
            fmt::print("{:>4} {} {}: the {}'s version lost{}\n", conflict.id,
                       time_text(conflict.time_ms), one_line(conflict.label), conflict.lost,
                       conflict.restored ? ", restored" : "");
        }
    }
    if (as_json) {
        print_json(all);
    } else if (all.empty()) {
        fmt::print("no conflicts\n");
    }
    return Exit::kDone;
}

Conflict find(Conflicts& conflicts, int id) {
    std::optional<Conflict> conflict = conflicts.get(id);
    if (!conflict) {
        throw Failure(fmt::format("there is no conflict {}; see qor-host conflicts", id));
    }
    return std::move(*conflict);
}

Exit restore(Device& device, Conflicts& conflicts, const Arguments& arguments) {
    const Conflict conflict = find(conflicts, arguments.number);
    CloudStore cloud = device.open_cloud();
    const std::optional<CloudDocument> present = need(cloud.get(conflict.key));
    WriteBatch batch(device.database().connection());
    CloudWrite write;
    write.key = conflict.key;
    write.text = conflict.document;
    write.expected = present && !present->deleted ? present->revision : 0;
    if (*write.expected != 0 && present->text != conflict.document) {
        Conflict replaced;
        replaced.time_ms = now_ms();
        replaced.key = conflict.key;
        replaced.label = conflict.label;
        replaced.lost = "cloud";
        replaced.document = present->text;
        replaced.kept = conflict.document;
        conflicts.keep(replaced);
    }
    conflicts.mark_restored(conflict.id);
    if (need(cloud.write(write)).outcome == WriteOutcome::kConflict) {
        throw Failure("the cloud has changed meanwhile; nothing was restored. Try again");
    }
    batch.commit();
    if (arguments.json) {
        print_json(conflict_json(conflict, true));
    } else {
        fmt::print("restored '{}' in the cloud; next: qor-host sync\n", one_line(conflict.label));
    }
    return Exit::kDone;
}

}  // namespace

Exit conflicts(const Arguments& arguments) {
    Device device(arguments,
                  arguments.action == "restore" ? Device::Access::kUse : Device::Access::kRead);
    Conflicts conflicts(device.database().connection());
    if (arguments.action == "list") {
        return list(conflicts, arguments.json);
    }
    if (arguments.action == "restore") {
        return restore(device, conflicts, arguments);
    }
    print_json(conflict_json(find(conflicts, arguments.number), true));
    return Exit::kDone;
}

}  // namespace qor
