// SPDX-License-Identifier: Apache-2.0
//
// A device directory in use by this process.
#include "host/command/device.h"

#include <fcntl.h>
#include <fmt/format.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <system_error>

#include "host/failure.h"

namespace qor {

namespace {

namespace fs = std::filesystem;

constexpr const char* kFolders[] = {QOR_DEVICE_ROOT "/opt/usr/data/cloud-qor",
                                    QOR_DEVICE_ROOT "/opt/usr/dbspace"};
constexpr const char* kLockFile = QOR_DEVICE_ROOT "/opt/usr/dbspace/.cloud_qor.lock";
// Its time is when the latest sync ended: a sync with nothing to do writes no database.
constexpr const char* kSyncedFile = QOR_DEVICE_ROOT "/opt/usr/dbspace/.cloud_qor.synced";

std::string absolute(const std::string& path) {
    return path.empty() ? path : fs::absolute(path).lexically_normal().string();
}

std::string built_adapter() {
    std::error_code error;
    const fs::path program = fs::read_symlink("/proc/self/exe", error);
    return (program.parent_path().parent_path() / "lib" / "libqor-adapter-calendar.so").string();
}

}  // namespace

Device::Device(const Arguments& arguments, Access access)
    : adapter_path_(arguments.adapter.empty() ? built_adapter() : absolute(arguments.adapter)),
      cloud_path_(absolute(arguments.cloud)) {
    std::error_code error;
    const fs::path directory = absolute(arguments.device);
    if (access == Access::kCreate) {
        fs::create_directories(directory, error);
    }
    name_ = (directory / "").parent_path().filename().string();
    if (chdir(directory.c_str()) != 0) {
        throw Failure(fmt::format("{}: not a device directory: {}", directory.string(),
                                  std::generic_category().message(errno)));
    }
    if (access == Access::kCreate) {
        for (const char* folder : kFolders) {
            fs::create_directories(folder, error);
            if (error) {
                throw Failure(
                    fmt::format("{}/{}: {}", directory.string(), folder, error.message()));
            }
        }
    } else if (!HostDatabase::exists()) {
        throw Failure(
            fmt::format("{}: nobody has signed in here. Do that first: qor-host --device "
                        "{} sign-in NAME --cloud FILE",
                        directory.string(), arguments.device));
    }
    if (access != Access::kRead) {
        lock();
    }
    database_.emplace(HostDatabase::open(access == Access::kCreate));
}

Device::~Device() {
    if (lock_ >= 0) {
        close(lock_);  // nothing was written
    }
}

void Device::lock() {
    constexpr int kTries = 20;
    constexpr useconds_t kPauseUs = 50000;
    lock_ = open(kLockFile, O_RDWR | O_CREAT | O_CLOEXEC, 0644);
    if (lock_ < 0) {
        throw Failure(fmt::format("{}: {}", kLockFile, std::generic_category().message(errno)));
    }
    for (int i = 0; flock(lock_, LOCK_EX | LOCK_NB) != 0; ++i) {
        if (errno != EWOULDBLOCK || i == kTries) {
            throw Failure(
                "another qor-host is at work on this device; a watch syncs by itself. Wait for it "
                "or end it");
        }
        usleep(kPauseUs);
    }
}

std::string Device::cloud_path() {
    return cloud_path_.empty() ? database_->setting(setting::kCloudPath) : cloud_path_;
}

CloudStore Device::open_cloud(bool create) {
    const std::string path = cloud_path();
    if (path.empty()) {
        throw Failure("no cloud is known yet; name its file: --cloud FILE");
    }
    CloudOptions options;
    options.who = name_;
    options.create = create;
    options.log_titles = database_->number(setting::kHideTitles) == 0;
    return need(CloudStore::open(path, options));
}

int Device::account_id() {
    return static_cast<int>(database_->number(setting::kAccountId));
}

std::int64_t Device::last_sync_ms() {
    struct stat file {};
    if (stat(kSyncedFile, &file) != 0) {
        return 0;
    }
    return static_cast<std::int64_t>(file.st_mtim.tv_sec) * 1000 + file.st_mtim.tv_nsec / 1000000;
}

void Device::mark_synced() {
    const int file = open(kSyncedFile, O_WRONLY | O_CREAT | O_CLOEXEC, 0644);
    if (file >= 0) {
        futimens(file, nullptr);  // a time that could not be told is only shown, never relied on
        close(file);
    }
}

}  // namespace qor
