// SPDX-License-Identifier: Apache-2.0
//
// sign-in and sign-out. Both can be interrupted anywhere and done again.
#include <fmt/format.h>
#include <qor_platform.h>
#include <nlohmann/json.hpp>

#include "host/adapter/adapter_files.h"
#include "host/command/command.h"
#include "host/command/output.h"
#include "host/command/runner.h"
#include "host/failure.h"
#include "host/sync/collect.h"
#include "host/sync/engine.h"

namespace qor {

namespace {

class AccountService {
  public:
    AccountService() { check(account_connect(), "does not answer"); }
    AccountService(const AccountService&) = delete;
    AccountService& operator=(const AccountService&) = delete;
    ~AccountService() { static_cast<void>(account_disconnect()); }

    int add(const std::string& name) {
        int id = 0;
        check(account_insert(name.c_str(), &id), "could not add the account");
        return id;
    }
    void remove(int id) {
        const int rc = account_delete(id);
        if (rc != ACCOUNT_ERROR_NO_DATA) {  // an interrupted sign-out did it before
            check(rc, "could not delete the account");
        }
    }

  private:
    static void check(int rc, const char* what) {
        if (rc != ACCOUNT_ERROR_NONE) {
            throw Failure(fmt::format("the account service {} (result {})", what, rc));
        }
    }
};

void check_account(HostDatabase& database, const std::string& name) {
    const std::string known = database.setting(setting::kAccountName);
    if (!known.empty() && known != name) {
        throw Failure(
            fmt::format("this device is signed in as '{}'; sign out first: qor-host "
                        "sign-out",
                        known));
    }
    if (database.number(setting::kSigningOut) != 0) {
        throw Failure("a sign-out was interrupted; finish it first: qor-host sign-out");
    }
}

// Changes from here on are reported to the first sync: the adapter stores its baseline as it takes
// notice of the calendar, not at sign-in, and without one it would start from whatever is the
// calendar's version when it is next initialised.
void store_baseline(Device& device, CloudStore& cloud, AdapterSession& session) {
    const SyncOptions options;
    SyncReport report;
    SyncContext context{session, cloud, device.database(), options, report};
    collect_device_changes(context, calendar_version());
    if (adapter_baseline().value_or(1) < 1) {
        throw Failure("the adapter stored no baseline; sign in once more");
    }
}

std::size_t changes_not_in_cloud(Device& device) {
    CloudStore cloud = device.open_cloud();
    if (idle(device, cloud)) {
        return 0;
    }
    const AdapterLibrary library = device.adapter();
    AdapterSession session(library, device.account_id(), false);
    SyncOptions options;
    options.dry_run = true;
    options.allow_mass_delete = true;
    const SyncReport report = run_logged(device, cloud, session, options, "sign-out").report;
    return report.count(What::kUploadNew) + report.count(What::kUploadChange) +
           report.count(What::kUploadDeletion) + report.count(What::kProblem);
}

}  // namespace

Exit sign_in(const Arguments& arguments) {
    Device device(arguments, Device::Access::kCreate);
    HostDatabase& database = device.database();
    check_account(database, arguments.account);
    CloudStore cloud = device.open_cloud(true);
    const AdapterLibrary library = device.adapter();
    const int account_id = AccountService().add(arguments.account);
    {
        WriteBatch batch(database.connection());
        database.set(setting::kAccountName, arguments.account);
        database.set(setting::kAccountId, account_id);
        database.set(setting::kCloudPath, device.cloud_path());
        database.set(setting::kHideTitles, std::int64_t{arguments.hide_titles});
        batch.commit();
    }
    AdapterSession session(library, account_id, true);
    store_baseline(device, cloud, session);
    if (arguments.json) {
        print_json({{"account", arguments.account},
                    {"account_id", account_id},
                    {"cloud", device.cloud_path()}});
    } else {
        fmt::print("signed in as '{}', cloud {}\nnext: qor-host --device {} sync\n",
                   arguments.account, device.cloud_path(), arguments.device);
    }
    return Exit::kDone;
}

Exit sign_out(const Arguments& arguments) {
    Device device(arguments, Device::Access::kUse);
    HostDatabase& database = device.database();
    const std::string name = database.setting(setting::kAccountName);
    if (name.empty()) {
        throw Failure("nobody is signed in on this device");
    }
    if (!arguments.discard && database.number(setting::kSigningOut) == 0) {
        if (const std::size_t count = changes_not_in_cloud(device); count > 0) {
            throw Failure(fmt::format(
                "{} changes of this device are not in the cloud yet. Sync first (qor-host sync), "
                "or lose them: qor-host sign-out --discard",
                count));
        }
    }
    {
        WriteBatch batch(database.connection());
        database.set(setting::kSigningOut, 1);
        batch.commit();
    }
    const AdapterLibrary library = device.adapter();
    AdapterSession session(library, device.account_id(), false);
    session.sign_out();
    AccountService().remove(device.account_id());
    database.forget_account();
    if (arguments.json) {
        print_json({{"signed_out", name}});
    } else {
        fmt::print("signed out '{}'; its calendar is gone from this device\n", name);
    }
    return Exit::kDone;
}

}  // namespace qor
