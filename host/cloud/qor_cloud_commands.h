// SPDX-License-Identifier: Apache-2.0
//
// The commands of qor-cloud. Results go to stdout, messages to stderr.
#pragma once

#include <fmt/format.h>

#include <string>
#include <vector>

#include "cli/exit_code.h"
#include "host/cloud/cloud_store.h"

namespace qor {

// The command line as typed.
struct CloudArguments {
    std::string cloud = "cloud.db";
    std::string who = "qor-cloud";
    bool json = false;
    std::vector<std::string> files;  // import
    std::string zone;
    bool overwrite = false;
    bool dry_run = false;
    std::string output = "-";  // export
    std::string match;         // list
    bool deleted = false;
    long long since = 0;
    std::string key;  // show, log
    std::size_t limit = 50;
};

void print_error(const std::string& text);

// Why a store cannot be used, with what to do.
Exit fail(const Error& error);

Exit cloud_import(const CloudArguments& arguments);
Exit cloud_export(const CloudArguments& arguments);
Exit cloud_list(const CloudArguments& arguments);
Exit cloud_show(const CloudArguments& arguments);
Exit cloud_log(const CloudArguments& arguments);

}  // namespace qor
