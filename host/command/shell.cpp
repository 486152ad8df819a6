// SPDX-License-Identifier: Apache-2.0
//
// The low-level shell: single entry points of an adapter, for whoever debugs one. What it does to a
// device that is signed in is noted, so that the next sync takes it along and nothing that the
// adapter forgets by telling it is lost.
#include <fmt/format.h>

#include <fstream>
#include <iostream>
#include <iterator>
#include <memory>
#include <nlohmann/json.hpp>

#include "host/command/command.h"
#include "host/command/device.h"
#include "host/command/output.h"
#include "host/failure.h"
#include "host/sync/context.h"

namespace qor {

namespace {

constexpr int kNobody = 1;  // the account number on a device where nobody has signed in

class Shell {
  public:
    explicit Shell(const Arguments& arguments)
        : device_(arguments, Device::Access::kCreate),
          library_(device_.adapter()),
          session_(library_, account(arguments), false) {}

    AdapterSession& session() { return session_; }

    void note(int id, bool gone) {
        if (device_.account_id() == 0 || id <= 0) {
            return;
        }
        WriteBatch batch(device_.database().connection());
        Journal(device_.database().connection()).note_change(id, gone, now_ms());
        batch.commit();
    }

  private:
    int account(const Arguments& arguments) {
        const int known = device_.account_id();
        return arguments.account_id != 0 ? arguments.account_id : known != 0 ? known : kNobody;
    }

    Device device_;
    const AdapterLibrary library_;
    AdapterSession session_;
};

int item_number(const Arguments& arguments) {
    const std::string& text = arguments.item;
    if (text.empty() || text.size() > 9 ||
        text.find_first_not_of("0123456789") != std::string::npos) {
        throw Failure(fmt::format("'{}' is no item number; see qor-host ids", text));
    }
    return std::stoi(text);
}

std::string read_document(const std::string& file) {
    if (file == "-") {
        return {std::istreambuf_iterator<char>(std::cin), {}};
    }
    std::ifstream in(file, std::ios::binary);
    std::string text{std::istreambuf_iterator<char>(in), {}};
    if (!in) {
        throw Failure(fmt::format("{}: cannot be read", file));
    }
    return text;
}

Exit tell(const Arguments& arguments, int id, const char* what) {
    if (arguments.json) {
        print_json({{"item", id}, {"result", what}});
    } else {
        fmt::print("item {} {}\n", id, what);
    }
    return Exit::kDone;
}

}  // namespace

Exit shell_ids(const Arguments& arguments) {
    Shell shell(arguments);
    const bool changed = shell.session().settle();
    const std::vector<int> dirty = changed ? shell.session().dirty_ids() : std::vector<int>();
    for (const int id : dirty) {
        shell.note(id, false);
    }
    const std::vector<int> deleted = changed ? shell.session().deleted_ids() : std::vector<int>();
    for (const int id : deleted) {
        shell.note(id, true);
    }
    if (arguments.clear && changed) {
        shell.session().clear_deleted_ids();
    }
    if (arguments.json) {
        print_json({{"changed", dirty}, {"deleted", deleted}});
        return Exit::kDone;
    }
    for (const int id : dirty) {
        fmt::print("changed {}\n", id);
    }
    for (const int id : deleted) {
        fmt::print("deleted {}\n", id);
    }
    return Exit::kDone;
}

Exit shell_get(const Arguments& arguments) {
    const int id = item_number(arguments);
    Shell shell(arguments);
    const ItemValue value = shell.session().get(id);
    if (value.state == ItemValue::State::kUnapplied) {
        throw Failure(fmt::format("item {} is not applied to the calendar (yet)", id));
    }
    if (value.state == ItemValue::State::kGone) {
        throw Failure(fmt::format("item {} is not there, or cannot be read", id));
    }
    fmt::print("{}\n", value.document);
    return Exit::kDone;
}

Exit shell_insert(const Arguments& arguments) {
    const std::string document = read_document(arguments.file);
    Shell shell(arguments);
    const int id = shell.session().insert(document);
    if (id <= 0) {
        throw Failure(id == 0 ? "the adapter could store no item" : "the adapter refused it");
    }
    shell.note(id, false);
    return tell(arguments, id, "inserted");
}

Exit shell_update(const Arguments& arguments) {
    const int id = item_number(arguments);
    const std::string document = read_document(arguments.file);
    Shell shell(arguments);
    if (!shell.session().update(id, document)) {
        throw Failure(fmt::format("the adapter did not update item {}", id));
    }
    shell.note(id, false);
    return tell(arguments, id, "updated");
}

Exit shell_delete(const Arguments& arguments) {
    const int id = item_number(arguments);
    Shell shell(arguments);
    if (!shell.session().remove(id)) {
        throw Failure(fmt::format("the adapter did not delete item {}", id));
    }
    shell.note(id, true);
    return tell(arguments, id, "deleted");
}

}  // namespace qor
