// SPDX-License-Identifier: Apache-2.0
//
// One initialised adapter.
#include "host/adapter/adapter_session.h"

#include <fmt/format.h>
#include <glib.h>
#include <qor_platform.h>

#include <cstdlib>
#include <memory>
#include <utility>

#include "host/failure.h"

namespace qor {

namespace {

constexpr guint kSettleTimeoutMs = 5000;

struct Free {
    void operator()(void* memory) const noexcept { std::free(memory); }
};
using Text = std::unique_ptr<char, Free>;

// A subscriber of the host's own, made after the adapter's: subscribers are told in order, so once
// it has been told the adapter has been, too.
class Fence {
  public:
    Fence() {
        if (calendar_db_add_changed_cb(_calendar_event._uri, on_told, this) !=
            CALENDAR_ERROR_NONE) {
            throw Failure("the calendar service takes no subscriptions");
        }
    }
    Fence(const Fence&) = delete;
    Fence& operator=(const Fence&) = delete;
    ~Fence() {
        static_cast<void>(calendar_db_remove_changed_cb(_calendar_event._uri, on_told, this));
    }
    bool told() const { return told_; }

  private:
    static void on_told(const char*, void* fence) { static_cast<Fence*>(fence)->told_ = true; }
    bool told_ = false;
};

gboolean expire(gpointer expired) {
    *static_cast<bool*>(expired) = true;
    return G_SOURCE_REMOVE;
}

}  // namespace

AdapterSession::AdapterSession(const AdapterLibrary& library, int account_id, bool sign_in)
    : library_(library), account_id_(account_id) {
    initialize(sign_in);
}

void AdapterSession::initialize(bool sign_in) {
    const int rc = library_.call.initialize(account_id_, sign_in ? 1 : 0);
    if (rc != 0) {
        throw Failure(fmt::format(
            "the adapter could not be initialised for account {} (result {}); its log says why: "
            "set QOR_LOG=stderr and try again",
            account_id_, rc));
    }
    initialized_ = true;
}

AdapterSession::~AdapterSession() {
    unsubscribe();
    if (initialized_) {
        library_.call.deinitialize(0);  // fails only when not initialised
    }
}

void AdapterSession::sign_out() {
    unsubscribe();
    initialized_ = false;
    const int rc = library_.call.deinitialize(1);
    if (rc != 0) {
        throw Failure(fmt::format("the adapter could not sign out (result {})", rc));
    }
}

void AdapterSession::on_changed(void* session) {
    auto* self = static_cast<AdapterSession*>(session);
    self->changed_ = true;
    if (self->listener_) {
        self->listener_();
    }
}

void AdapterSession::subscribe(std::function<void()> listener) {
    unsubscribe();
    listener_ = std::move(listener);
    const int rc = library_.call.set_data_changed_cb(on_changed, this);
    if (rc != 0) {
        throw Failure(fmt::format("the adapter could not subscribe to changes (result {})", rc));
    }
    subscribed_ = true;
}

void AdapterSession::unsubscribe() {
    if (subscribed_) {
        library_.call.unset_data_changed_cb();  // fails only when not initialised
        subscribed_ = false;
    }
}

bool AdapterSession::settle() {
    // Whoever subscribes anew is told once, whatever happened before.
    changed_ = false;
    subscribe(std::exchange(listener_, nullptr));
    const Fence fence;
    bool expired = false;
    const guint timer = g_timeout_add(kSettleTimeoutMs, expire, &expired);
    while (!fence.told() && !expired) {
        g_main_context_iteration(nullptr, TRUE);
    }
    if (expired) {
        throw Failure("the calendar service does not tell of changes");
    }
    g_source_remove(timer);
    return changed_;
}

std::vector<int> AdapterSession::ids(decltype(AdapterFunctions::get_dirty_ids) list,
                                     const char* what) {
    constexpr int kNone = 1;
    char** texts = nullptr;
    int count = 0;
    const int rc = list(&texts, &count);
    if (rc == kNone) {
        return {};
    }
    if (rc != 0) {
        throw Failure(fmt::format("the adapter could not list {} items (result {})", what, rc));
    }
    const std::unique_ptr<char*, Free> array(texts);
    std::vector<int> result;
    for (int i = 0; i < count; ++i) {
        const Text text(texts[i]);
        result.push_back(static_cast<int>(std::strtol(texts[i], nullptr, 10)));
    }
    return result;
}

std::vector<int> AdapterSession::dirty_ids() {
    return ids(library_.call.get_dirty_ids, "changed");
}

std::vector<int> AdapterSession::deleted_ids() {
    return ids(library_.call.get_deleted_ids, "deleted");
}

void AdapterSession::clear_deleted_ids() {
    const int rc = library_.call.clear_deleted_ids();
    if (rc != 0) {
        throw Failure(fmt::format("the adapter could not advance its baseline (result {})", rc));
    }
    changed_ = false;
}

void AdapterSession::forget_everything() {
    settle();
    clear_deleted_ids();
    unsubscribe();
    initialized_ = false;
    library_.call.deinitialize(0);  // fails only when not initialised
    initialize(false);
    clear_deleted_ids();
}

ItemValue AdapterSession::get(int id) const {
    constexpr int kFailed = 6;
    char* document = nullptr;
    const int rc = library_.call.get_value(std::to_string(id).c_str(), "", &document);
    const Text owned(document);
    if (rc == 0 && document != nullptr) {
        return {ItemValue::State::kRead, document};
    }
    // An item that stands for nothing answers with a number that is no result code.
    return {rc == kFailed ? ItemValue::State::kGone : ItemValue::State::kUnapplied, {}};
}

int AdapterSession::insert(const std::string& document) const {
    char* id = nullptr;
    const int rc = library_.call.insert_value(nullptr, document.c_str(), &id);
    const Text owned(id);
    return rc == 0 && id != nullptr ? static_cast<int>(std::strtol(id, nullptr, 10)) : -1;
}

bool AdapterSession::update(int id, const std::string& document) const {
    return library_.call.update_value(nullptr, std::to_string(id).c_str(), document.c_str()) == 0;
}

bool AdapterSession::remove(int id) const {
    return library_.call.delete_value(std::to_string(id).c_str()) == 0;
}

}  // namespace qor
