// SPDX-License-Identifier: Apache-2.0
//
// Each subscription is one GLib source with an inotify watch of its own, on the main context that
// was current when it was made. A burst of changes becomes one callback: the first change starts a
// timer, during which the watch sleeps; when it is due, the callback runs, unless more changes have
// come meanwhile and it may still wait. The list of subscriptions has its own mutex, which is never
// held while a callback runs.
#include "platform/calendar-service/notify.h"

#include <fcntl.h>
#include <glib-unix.h>
#include <glib.h>
#include <sys/inotify.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <memory>
#include <mutex>
#include <new>
#include <vector>

#include "platform/calendar-service/guard.h"

namespace device {

namespace {

constexpr gint64 kQuietUs = 50'000;           // changes closer together are one burst
constexpr gint64 kLongestWaitUs = 1'000'000;  // of a callback, while a burst goes on
constexpr gint64 kNever = -1;

// The members below the GSource are set right after g_source_new(), which gives zeroed memory.
struct Watch {
    GSource source;
    const View* view;
    std::string* path;  // of the watched file
    int fd;             // inotify; -1 before it is open
    gpointer fd_tag;
    gint64 first_change;  // when the burst began; meaningful while the timer runs
};

struct Subscription {
    const View* view;
    calendar_db_changed_cb callback;
    void* user_data;
    GSource* source;
};

// Never destroyed: calls may come while the process ends.
std::mutex& subscriptions_mutex() {
    static auto* const mutex = new std::mutex;
    return *mutex;
}
std::vector<Subscription>& subscriptions() {
    static auto* const list = new std::vector<Subscription>;
    return *list;
}

std::string path_of(const std::string& folder, const View& view) {
    return folder + (&view == &kBookView ? "/.calendar-service.books-changed"
                                         : "/.calendar-service.events-changed");
}

// Watches the file, creating it when absent. False when that fails.
bool watch_file(const Watch& watch) {
    const int file = open(watch.path->c_str(), O_RDONLY | O_CREAT | O_CLOEXEC, 0644);
    if (file < 0) {
        return false;
    }
    static_cast<void>(close(file));  // nothing was written
    return inotify_add_watch(watch.fd, watch.path->c_str(), IN_ATTRIB | IN_MODIFY) >= 0;
}

// Takes what has come. Whether it was anything; a file that was removed is watched anew.
bool drain(const Watch& watch) {
    alignas(inotify_event) std::array<char, 4096> buffer;
    bool any = false;
    bool lost = false;
    ssize_t length = 0;
    while ((length = read(watch.fd, buffer.data(), buffer.size())) > 0) {
        any = true;
        for (ssize_t at = 0; at < length;) {
            const auto* event = reinterpret_cast<const inotify_event*>(buffer.data() + at);
            lost = lost || (event->mask & IN_IGNORED) != 0;
            at += static_cast<ssize_t>(sizeof(inotify_event) + event->len);
        }
    }
    if (lost) {
        // A folder that is gone has nothing more to tell; its watch just stays silent.
        static_cast<void>(watch_file(watch));
    }
    return any;
}

void start_timer(Watch* watch, gint64 due) {
    g_source_modify_unix_fd(&watch->source, watch->fd_tag, static_cast<GIOCondition>(0));
    g_source_set_ready_time(&watch->source, due);
}

void stop_timer(Watch* watch) {
    g_source_set_ready_time(&watch->source, kNever);
    g_source_modify_unix_fd(&watch->source, watch->fd_tag, G_IO_IN);
}

gboolean dispatch(GSource* source, GSourceFunc callback, gpointer user_data) {
    auto* const watch = reinterpret_cast<Watch*>(source);
    const gint64 now = g_source_get_time(source);
    const bool more = drain(*watch);
    if (g_source_get_ready_time(source) == kNever) {
        if (more) {
            watch->first_change = now;
            start_timer(watch, now + kQuietUs);
        }
        return G_SOURCE_CONTINUE;
    }
    if (more && now - watch->first_change < kLongestWaitUs) {
        start_timer(watch, now + kQuietUs);
        return G_SOURCE_CONTINUE;
    }
    stop_timer(watch);
    // The callback may end its subscription; GLib keeps the source until this returns.
    const auto changed =
        reinterpret_cast<calendar_db_changed_cb>(reinterpret_cast<void (*)()>(callback));
    changed(watch->view->uri, user_data);
    return G_SOURCE_CONTINUE;
}

void finalize(GSource* source) {
    auto* const watch = reinterpret_cast<Watch*>(source);
    if (watch->fd >= 0) {
        static_cast<void>(close(watch->fd));  // nothing was written
    }
    delete watch->path;
}

GSourceFuncs source_functions = {nullptr, nullptr, dispatch, finalize, nullptr, nullptr};

struct ReleaseSource {
    void operator()(GSource* source) const {
        g_source_destroy(source);
        g_source_unref(source);
    }
};
using SourceOwner = std::unique_ptr<GSource, ReleaseSource>;

SourceOwner make_source(const std::string& folder, const View& view) {
    SourceOwner source(g_source_new(&source_functions, sizeof(Watch)));
    auto* const watch = reinterpret_cast<Watch*>(source.get());
    watch->view = &view;
    watch->fd = inotify_init1(IN_NONBLOCK | IN_CLOEXEC);
    watch->path = new std::string(path_of(folder, view));
    if (watch->fd < 0 || !watch_file(*watch)) {
        throw Failure{errno == ENOSPC ? CALENDAR_ERROR_FILE_NO_SPACE : CALENDAR_ERROR_DB_FAILED};
    }
    watch->fd_tag = g_source_add_unix_fd(source.get(), watch->fd, G_IO_IN);
    return source;
}

std::vector<Subscription>::iterator find_subscription(const View& view,
                                                      calendar_db_changed_cb callback,
                                                      const void* user_data) {
    auto& list = subscriptions();
    auto at = list.begin();
    while (at != list.end() &&
           (at->view != &view || at->callback != callback || at->user_data != user_data)) {
        ++at;
    }
    return at;
}

}  // namespace

void announce_change(const std::string& folder, const View& view) {
    // Fails only where nobody has ever subscribed: the file is the subscribers'.
    static_cast<void>(utimensat(AT_FDCWD, path_of(folder, view).c_str(), nullptr, 0));
}

void subscribe(const std::string& folder, const View& view, calendar_db_changed_cb callback,
               void* user_data) {
    const std::lock_guard lock(subscriptions_mutex());
    if (find_subscription(view, callback, user_data) != subscriptions().end()) {
        throw Failure{CALENDAR_ERROR_INVALID_PARAMETER};
    }
    SourceOwner source = make_source(folder, view);
    g_source_set_callback(source.get(), G_SOURCE_FUNC(callback), user_data, nullptr);
    // A new subscriber cannot know what it has missed: its first callback is due at once.
    start_timer(reinterpret_cast<Watch*>(source.get()), 0);
    subscriptions().push_back({&view, callback, user_data, source.get()});
    GSource* const shared = source.release();  // the list's from now on
    GMainContext* const context = g_main_context_ref_thread_default();
    static_cast<void>(g_source_attach(shared, context));  // its id is not used
    g_main_context_unref(context);
}

void unsubscribe(const View& view, calendar_db_changed_cb callback, void* user_data) {
    SourceOwner source;
    const std::lock_guard lock(subscriptions_mutex());
    const auto at = find_subscription(view, callback, user_data);
    if (at == subscriptions().end()) {
        throw Failure{CALENDAR_ERROR_NO_DATA};
    }
    source.reset(at->source);
    subscriptions().erase(at);
}

void unsubscribe_all() {
    std::vector<Subscription> dropped;
    {
        const std::lock_guard lock(subscriptions_mutex());
        dropped.swap(subscriptions());
    }
    for (const Subscription& subscription : dropped) {
        ReleaseSource()(subscription.source);
    }
}

}  // namespace device
