// SPDX-License-Identifier: Apache-2.0
//
// The commands of qor-host: what they are given, and the one table that drives both dispatch and
// help.
#pragma once

#include <string>
#include <vector>

#include "cli/exit_code.h"
#include "host/sync/context.h"

namespace qor {

struct Arguments {
    std::string device = ".";
    std::string adapter;  // empty: the one that was built with this program
    std::string cloud;    // empty: the one remembered at sign-in
    bool json = false;

    std::string account;
    bool hide_titles = false;
    bool discard = false;
    bool dry_run = false;
    bool allow_mass_delete = false;
    bool start_over = false;
    bool wait_pending = false;
    Policy policy = Policy::kCloud;
    int debounce_ms = 200;
    std::string action = "list";
    int number = 0;
    int count = 20;
    int account_id = 0;
    bool clear = false;
    std::string item;
    std::string file;
};

Exit sign_in(const Arguments& arguments);
Exit sign_out(const Arguments& arguments);
Exit sync(const Arguments& arguments);
Exit watch(const Arguments& arguments);
Exit status(const Arguments& arguments);
Exit conflicts(const Arguments& arguments);
Exit log(const Arguments& arguments);
Exit shell_ids(const Arguments& arguments);
Exit shell_get(const Arguments& arguments);
Exit shell_insert(const Arguments& arguments);
Exit shell_update(const Arguments& arguments);
Exit shell_delete(const Arguments& arguments);

}  // namespace qor
