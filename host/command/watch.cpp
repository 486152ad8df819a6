// SPDX-License-Identifier: Apache-2.0
//
// watch: stays in the main loop and syncs whenever the device's calendar or the cloud has changed.
// Both tell by themselves; nothing is polled. Changes that come close together become one sync.
#include <fmt/format.h>
#include <glib-unix.h>
#include <glib.h>
#include <sys/inotify.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <csignal>
#include <cstdio>
#include <nlohmann/json.hpp>
#include <system_error>

#include "host/command/command.h"
#include "host/command/output.h"
#include "host/command/runner.h"
#include "host/failure.h"
#include "host/sync/engine.h"

namespace qor {

namespace {

constexpr guint kRetryMs = 30000;  // after a sync that failed as a whole

class Watch {
  public:
    Watch(Device& device, CloudStore& cloud, AdapterSession& session, const Arguments& arguments)
        : device_(device),
          cloud_(cloud),
          session_(session),
          arguments_(arguments),
          options_(sync_options(arguments)) {
        options_.ask = nullptr;
        watch_cloud();
        g_unix_signal_add(SIGINT, on_signal, this);
        g_unix_signal_add(SIGTERM, on_signal, this);
        session_.subscribe([this] { schedule(static_cast<guint>(arguments_.debounce_ms)); });
    }
    Watch(const Watch&) = delete;
    Watch& operator=(const Watch&) = delete;
    ~Watch() { close(inotify_); }

    void run() {
        sync_now();
        while (!ended_) {
            g_main_context_iteration(nullptr, TRUE);
            if (due_) {
                sync_now();
            }
        }
    }

  private:
    void watch_cloud() {
        inotify_ = inotify_init1(IN_NONBLOCK | IN_CLOEXEC);
        if (inotify_ < 0 ||
            inotify_add_watch(inotify_, cloud_.notify_path().c_str(), IN_CLOSE_WRITE) < 0) {
            throw Failure(fmt::format("{}: cannot be watched: {}", cloud_.notify_path(),
                                      std::generic_category().message(errno)));
        }
        g_unix_fd_add(inotify_, G_IO_IN, on_cloud, this);
    }

    static gboolean on_cloud(gint fd, GIOCondition, gpointer self) {
        std::array<char, 4096> events{};
        while (read(fd, events.data(), events.size()) > 0) {
        }
        auto* watch = static_cast<Watch*>(self);
        watch->schedule(static_cast<guint>(watch->arguments_.debounce_ms));
        return G_SOURCE_CONTINUE;
    }

    static gboolean on_signal(gpointer self) {
        static_cast<Watch*>(self)->ended_ = true;
        return G_SOURCE_CONTINUE;
    }

    static gboolean on_due(gpointer self) {
        auto* watch = static_cast<Watch*>(self);
        watch->timer_ = 0;
        watch->due_ = true;
        return G_SOURCE_REMOVE;
    }

    void schedule(guint wait_ms) {
        if (timer_ == 0) {
            timer_ = g_timeout_add(wait_ms, on_due, this);
        }
    }

    void sync_now() {
        due_ = false;
        try {
            if (nothing_to_do(cloud_, device_.database(), calendar_version())) {
                return;
            }
            tell(run_logged(device_, cloud_, session_, options_, "watch"));
        } catch (const Failure& failure) {
            fmt::print(stderr, "qor-host: error: {}; trying again\n", failure.what());
            schedule(kRetryMs);
        }
    }

    void tell(const Outcome& outcome) const {
        if (outcome.report.entries.empty()) {
            return;
        }
        if (arguments_.json) {
            fmt::print("{}\n", report_json(outcome.report, outcome.duration_ms).dump());
        } else {
            print_report(outcome.report, outcome.duration_ms);
        }
        std::fflush(stdout);
    }

    Device& device_;
    CloudStore& cloud_;
    AdapterSession& session_;
    const Arguments& arguments_;
    SyncOptions options_;
    int inotify_ = -1;
    guint timer_ = 0;
    bool due_ = false;
    bool ended_ = false;
};

}  // namespace

Exit watch(const Arguments& arguments) {
    Device device(arguments, Device::Access::kUse);
    if (device.account_id() == 0) {
        throw Failure("nobody is signed in on this device: qor-host sign-in NAME --cloud FILE");
    }
    CloudStore cloud = device.open_cloud();
    const AdapterLibrary library = device.adapter();
    AdapterSession session(library, device.account_id(), false);
    Watch(device, cloud, session, arguments).run();
    return Exit::kDone;
}

}  // namespace qor
