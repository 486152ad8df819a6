// SPDX-License-Identifier: Apache-2.0
//
// The host sync database: what the host knows about one device, and what the adapter looks up there
// (datasync_table: item number, cloud key, adapter name). Write-ahead log; every change is part of
// a WriteBatch, so that a process that is killed leaves whole steps only.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "host/database/connection.h"

namespace qor {

// Where a device keeps it, under the device directory.
extern const char* const kHostDatabasePath;

class HostDatabase {
  public:
    // Opens the current device's database, creating file and tables when asked to.
    static HostDatabase open(bool create);
    static bool exists();

    Connection& connection() { return connection_; }

    // Named values that outlive a run; empty or 0 when never set.
    std::string setting(std::string_view name);
    std::int64_t number(std::string_view name);
    void set(std::string_view name, std::string_view value);
    void set(std::string_view name, std::int64_t value);

    // Forgets the account and everything known about its items; the logs and conflicts stay.
    void forget_account();

  private:
    explicit HostDatabase(Connection connection) : connection_(std::move(connection)) {}
    Connection connection_;
};

// Names of settings.
namespace setting {
inline constexpr const char* kAccountName = "account name";
inline constexpr const char* kAccountId = "account id";
inline constexpr const char* kCloudPath = "cloud path";
inline constexpr const char* kCloudRevision = "cloud revision";  // everything up to it is done
inline constexpr const char* kDeviceVersion = "device version";  // likewise, of the calendar
inline constexpr const char* kHighestId = "highest id";          // of all items ever seen
inline constexpr const char* kCascadeCheck = "cascade check";    // see sync/collect.h
inline constexpr const char* kHideTitles = "hide titles";
inline constexpr const char* kSigningOut = "signing out";
}  // namespace setting

}  // namespace qor
