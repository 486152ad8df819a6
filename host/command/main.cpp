// SPDX-License-Identifier: Apache-2.0
//
// qor-host: the reference host. One table of commands drives dispatch and help.
#include <exception>
#include <limits>
#include <map>
#include <string>
#include <vector>

#include "cli/command_line.h"
#include "host/command/command.h"
#include "host/failure.h"

namespace {

using qor::Arguments;
using qor::Exit;

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

constexpr qor::Command<Arguments> kCommands[] = {
    {"sign-in", "Connect this device to an account and a cloud (--cloud FILE, remembered)", "",
     sign_in_options, qor::sign_in},
    {"sign-out", "Remove the account and its calendar from this device; the cloud keeps everything",
     "", sign_out_options, qor::sign_out},
    {"sync", "Bring device and cloud together, once", "", sync_options, qor::sync},
    {"watch", "Stay and sync whenever one side changes", "", watch_options, qor::watch},
    {"status", "Items, pending occurrences, versions, the latest sync", "", nullptr, qor::status},
    {"conflicts", "Versions that lost a conflict: list them, show or restore one", "",
     conflicts_options, qor::conflicts},
    {"log", "What earlier runs did, item by item", "", log_options, qor::log},
    {"ids", "Adapter shell: changed and deleted items", "", ids_options, qor::shell_ids},
    {"get", "Adapter shell: an item's document", "", item_options, qor::shell_get},
    {"insert", "Adapter shell: make an item of a document", "", insert_options, qor::shell_insert},
    {"update", "Adapter shell: replace an item's document", "", update_options, qor::shell_update},
    {"delete", "Adapter shell: delete an item", "", item_options, qor::shell_delete},
};

constexpr const char* kExamples = R"(Examples:
  qor-host --device phone --cloud cloud.db sign-in alice
  qor-host --device phone sync --dry-run        what would be done
  qor-host --device phone sync
  qor-host --device phone watch                 until Ctrl-C
  qor-host --device phone conflicts restore 3
Exit status: 0 done, 1 some items were put aside (they are listed), 2 usage, 3 failed.
Environment: QOR_LOG=stderr shows what the adapter logs.)";

int run(int argc, char** argv) {
    CLI::App app("qor-host: keeps a device's calendar and a cloud the same");
    Arguments arguments;
    app.name("qor-host");
    app.footer(kExamples);
    app.add_option("--device", arguments.device, "The device's directory")->capture_default_str();
    app.add_option("--cloud", arguments.cloud, "The cloud's file; remembered at sign-in");
    app.add_option("--adapter", arguments.adapter, "The adapter library");
    app.add_flag("--json", arguments.json, "Answer in JSON");
    qor::declare_commands(app, kCommands, arguments);
    int status = 0;
    const auto* const command = qor::choose_command(app, kCommands, argc, argv, &status);
    return command != nullptr ? static_cast<int>(command->run(arguments)) : status;
}

}  // namespace

int main(int argc, char** argv) {
    try {
        return run(argc, argv);
    } catch (const std::exception& error) {
        qor::print_error("qor-host", error.what());
    }
    return static_cast<int>(Exit::kFailed);
}
