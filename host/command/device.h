// SPDX-License-Identifier: Apache-2.0
//
// A device directory in use by this process: it is the current directory from then on, and no other
// host works on it at the same time.
#pragma once

#include <memory>
#include <optional>
#include <string>

#include "host/adapter/adapter_library.h"
#include "host/cloud/cloud_store.h"
#include "host/command/command.h"
#include "host/database/host_database.h"

namespace qor {

class Device {
  public:
    enum class Access {
        kRead,    // beside a host that is at work
        kUse,     // alone
        kCreate,  // alone, and the folders are made when missing
    };
    // Resolves every other path of the arguments, then changes into the device's directory. Without
    // kCreate, fails where nobody has signed in.
    Device(const Arguments& arguments, Access access);
    Device(const Device&) = delete;
    Device& operator=(const Device&) = delete;
    ~Device();

    const std::string& name() const { return name_; }
    HostDatabase& database() { return *database_; }
    AdapterLibrary adapter() const { return load_adapter(adapter_path_); }
    // The cloud that was named, or else remembered.
    std::string cloud_path();
    CloudStore open_cloud(bool create = false);
    int account_id();  // 0 while nobody has signed in

    // When the latest sync ended, also when there was nothing to do; 0 before the first.
    static std::int64_t last_sync_ms();
    static void mark_synced();

  private:
    void lock();

    std::string name_;
    std::string adapter_path_;
    std::string cloud_path_;
    int lock_ = -1;
    std::optional<HostDatabase> database_;
};

}  // namespace qor
