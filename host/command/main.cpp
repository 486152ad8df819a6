// SPDX-License-Identifier: Apache-2.0
//
// qor-host: the reference host. One table of commands drives dispatch and help.
#include <fmt/format.h>

#include <CLI/CLI.hpp>
#include <algorithm>
#include <cstdio>
#include <exception>
#include <limits>
#include <map>
#include <string>
#include <vector>

#include "host/cli/terminal.h"
#include "host/command/command.h"
#include "host/failure.h"

namespace {

using qor::Arguments;
using qor::Exit;

struct Command {
    const char* name;
    Exit (*run)(const Arguments&);
    void (*options)(CLI::App&, Arguments&);  // null: it takes none
    const char* help;
};

void sign_in_options(CLI::App& app, Arguments& a) {
    app.add_option("account", a.account, "The account's name")->required();
    app.add_flag("--hide-titles", a.hide_titles, "Keep titles out of the logs");
}

void sign_out_options(CLI::App& app, Arguments& a) {
    app.add_flag("--discard", a.discard, "Even if changes of this device are not in the cloud yet");
}

void policy_option(CLI::App& app, Arguments& a) {
    static const std::map<std::string, qor::Policy> kPolicies = {
        {"cloud", qor::Policy::kCloud},
        {"device", qor::Policy::kDevice},
        {"newest", qor::Policy::kNewest},
        {"keep-both", qor::Policy::kKeepBoth},
        {"ask", qor::Policy::kAsk}};
    app.add_option("--policy", a.policy,
                   "Who wins where both sides changed an item: cloud (default), device, newest, "
                   "keep-both or ask. The version that loses is kept: qor-host conflicts")
        ->transform(CLI::Transformer(kPolicies))
        ->option_text("POLICY")
        ->check(CLI::IsMember(std::vector<qor::Policy>{qor::Policy::kCloud, qor::Policy::kDevice,
                                                       qor::Policy::kNewest, qor::Policy::kKeepBoth,
                                                       qor::Policy::kAsk}));
    app.add_flag("--allow-mass-delete", a.allow_mass_delete,
                 "Go on even if more than half of the events would be deleted");
}

void sync_options(CLI::App& app, Arguments& a) {
    app.add_flag("--dry-run", a.dry_run, "Tell what would be done; change no event anywhere");
    policy_option(app, a);
    app.add_flag("--wait-pending", a.wait_pending,
                 "Wait up to a minute for the adapter's next try of pending occurrences");
    app.add_flag("--start-over", a.start_over,
                 "Compare everything anew, after the cloud was replaced or restored");
}

void watch_options(CLI::App& app, Arguments& a) {
    policy_option(app, a);
    app.add_option("--debounce", a.debounce_ms,
                   "Milliseconds in which changes are gathered into one sync")
        ->check(CLI::Range(0, 60000))
        ->capture_default_str();
}

void conflicts_options(CLI::App& app, Arguments& a) {
    app.add_option("action", a.action, "list (default), show or restore")
        ->check(CLI::IsMember({"list", "show", "restore"}));
    app.add_option("number", a.number, "The conflict's number, from the list");
}

void log_options(CLI::App& app, Arguments& a) {
    app.add_option("-n,--count", a.count, "How many runs")
        ->check(CLI::Range(1, std::numeric_limits<int>::max()))
        ->capture_default_str();
}

void account_option(CLI::App& app, Arguments& a) {
    app.add_option("--account-id", a.account_id, "Account number, where nobody has signed in");
}

void ids_options(CLI::App& app, Arguments& a) {
    account_option(app, a);
    app.add_flag("--clear", a.clear, "Tell the adapter that they were taken");
}

void item_options(CLI::App& app, Arguments& a) {
    account_option(app, a);
    app.add_option("item", a.item, "The item's number")->required();
}

void insert_options(CLI::App& app, Arguments& a) {
    account_option(app, a);
    app.add_option("file", a.file, "The document; - for standard input")->required();
}

void update_options(CLI::App& app, Arguments& a) {
    item_options(app, a);
    app.add_option("file", a.file, "The document; - for standard input")->required();
}

constexpr Command kCommands[] = {
    {"sign-in", qor::sign_in, sign_in_options,
     "Connect this device to an account and a cloud (--cloud FILE, remembered)"},
    {"sign-out", qor::sign_out, sign_out_options,
     "Remove the account and its calendar from this device; the cloud keeps everything"},
    {"sync", qor::sync, sync_options, "Bring device and cloud together, once"},
    {"watch", qor::watch, watch_options, "Stay and sync whenever one side changes"},
    {"status", qor::status, nullptr, "Items, pending occurrences, versions, the latest sync"},
    {"conflicts", qor::conflicts, conflicts_options,
     "Versions that lost a conflict: list them, show or restore one"},
    {"log", qor::log, log_options, "What earlier runs did, item by item"},
    {"ids", qor::shell_ids, ids_options, "Adapter shell: changed and deleted items"},
    {"get", qor::shell_get, item_options, "Adapter shell: an item's document"},
    {"insert", qor::shell_insert, insert_options, "Adapter shell: make an item of a document"},
    {"update", qor::shell_update, update_options, "Adapter shell: replace an item's document"},
    {"delete", qor::shell_delete, item_options, "Adapter shell: delete an item"},
};

constexpr const char* kExamples = R"(Examples:
  qor-host --device phone --cloud cloud.db sign-in alice
  qor-host --device phone sync --dry-run        what would be done
  qor-host --device phone sync
  qor-host --device phone watch                 until Ctrl-C
  qor-host --device phone conflicts restore 3
Exit status: 0 done, 1 some items were put aside (they are listed), 2 usage, 3 failed.
Environment: QOR_LOG=stderr shows what the adapter logs.)";

std::string did_you_mean(const std::string& typed) {
    std::vector<std::string> names;
    for (const Command& command : kCommands) {
        names.emplace_back(command.name);
    }
    const std::string meant = qor::nearest(typed, names);
    return meant.empty() ? "" : fmt::format("did you mean '{}'? ", meant);
}

void fail(const std::string& message) {
    fmt::print(stderr, "qor-host: error: {}\n", message);
}

// The first word that is neither an option nor an option's value, as typed.
std::string typed_command(int argc, char** argv) {
    for (int i = 1; i < argc; ++i) {
        std::string word = argv[i];
        if (word == "--device" || word == "--adapter" || word == "--cloud") {
            ++i;
        } else if (!word.starts_with("-")) {
            return word;
        }
    }
    return {};
}

int usage_error(const CLI::ParseError& error, int argc, char** argv) {
    const std::string typed = typed_command(argc, argv);
    const bool known = std::any_of(std::begin(kCommands), std::end(kCommands),
                                   [&](const Command& command) { return typed == command.name; });
    if (typed.empty()) {
        fail("a command is missing; see qor-host --help");
    } else if (!known) {
        fail(fmt::format("there is no command '{}'; {}see qor-host --help", typed,
                         did_you_mean(typed)));
    } else {
        fail(fmt::format("{}; see qor-host {} --help", error.what(), typed));
    }
    return static_cast<int>(Exit::kUsage);
}

int run(int argc, char** argv) {
    CLI::App app("qor-host: keeps a device's calendar and a cloud the same");
    Arguments arguments;
    app.footer(kExamples);
    app.require_subcommand(1);
    app.fallthrough();
    app.add_option("--device", arguments.device, "The device's directory")->capture_default_str();
    app.add_option("--cloud", arguments.cloud, "The cloud's file; remembered at sign-in");
    app.add_option("--adapter", arguments.adapter, "The adapter library");
    app.add_flag("--json", arguments.json, "Answer in JSON");
    const Command* chosen = nullptr;
    for (const Command& command : kCommands) {
        CLI::App* sub = app.add_subcommand(command.name, command.help);
        if (command.options != nullptr) {
            command.options(*sub, arguments);
        }
        sub->callback([&chosen, &command] { chosen = &command; });
    }
    try {
        app.parse(argc, argv);
    } catch (const CLI::Success& success) {
        return app.exit(success);
    } catch (const CLI::ParseError& error) {
        return usage_error(error, argc, argv);
    }
    return static_cast<int>(chosen->run(arguments));
}

}  // namespace

int main(int argc, char** argv) {
    try {
        return run(argc, argv);
    } catch (const std::exception& error) {
        fail(error.what());
    }
    return static_cast<int>(Exit::kFailed);
}
