// SPDX-License-Identifier: Apache-2.0
//
// What the host needs to understand of an event document: what kind of item it is, whom it belongs
// to, whether two documents say the same, and how a device's change is carried into the cloud's
// document without losing what a device cannot hold. No state.
#pragma once

#include <cstdint>
#include <memory>
#include <nlohmann/json_fwd.hpp>
#include <optional>
#include <string>
#include <string_view>

namespace qor {

enum class ItemKind {
    kOrdinary,   // an event, recurring or not
    kChanged,    // one occurrence of a recurring event, changed
    kCancelled,  // one occurrence of a recurring event, cancelled
};

class SyncedDocument {
  public:
    SyncedDocument();
    SyncedDocument(const SyncedDocument& other);
    SyncedDocument(SyncedDocument&& other) noexcept;
    SyncedDocument& operator=(SyncedDocument other) noexcept;
    ~SyncedDocument();

    // No value for a text that is not an event document, or is nested beyond reason.
    static std::optional<SyncedDocument> parse(std::string_view text);

    ItemKind kind() const;
    bool recurring() const;
    std::string title() const;        // empty when it has none
    std::string parent_key() const;   // "original_sync_id"
    std::int64_t instant_ms() const;  // "originalInstanceTime"
    // For people: the title and when, "Dentist (2026-01-05 14:00 UTC)".
    std::string label() const;

    void set(const std::string& key, const std::string& value);
    std::string text() const;

    nlohmann::ordered_json& event();
    const nlohmann::ordered_json& event() const;
    nlohmann::ordered_json& root() { return *root_; }
    const nlohmann::ordered_json& root() const { return *root_; }

  private:
    // The text value of a key; empty when there is none.
    std::string value(const char* key) const;
    std::unique_ptr<nlohmann::ordered_json> root_;  // null only once moved from
};

// Whether a device would show the same for both. What a device does not keep is left out; of a
// cancelled occurrence only its parent and instant count, since the rest is its parent's.
bool documents_agree(const SyncedDocument& one, const SyncedDocument& other);

// The cloud's document with everything that changed on the device from `before` to `now`. What a
// device cannot hold (unknown members, the parent of a changed occurrence) stays as it was.
SyncedDocument merge_changes(const SyncedDocument& cloud, const SyncedDocument& before,
                             const SyncedDocument& now);

// The document as it is handed to a device: UNTIL as wall-clock time, and the occurrence's members
// behind those that tell what kind of time they are ("allDay" decides how the instant is kept).
std::string for_device(const SyncedDocument& document);

}  // namespace qor
