// SPDX-License-Identifier: Apache-2.0
//
// The items: one line per document that the device and the cloud share, keyed by its cloud key.
#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "host/database/connection.h"
#include "host/document/synced_document.h"

namespace qor {

struct Item {
    std::string key;
    int id = 0;  // the adapter's number; 0 while the device does not have it
    ItemKind kind = ItemKind::kOrdinary;
    std::string parent_key;       // of an occurrence
    std::string label;            // for messages
    std::string document;         // as agreed with the cloud; empty until it was there
    std::string device_document;  // as the device told it then
    std::int64_t revision = 0;    // of `document` in the cloud
    bool pending = false;         // the adapter keeps it until its parent arrives
};

class Items {
  public:
    explicit Items(Connection& connection) : connection_(connection) {}

    std::optional<Item> by_key(std::string_view key);
    std::optional<Item> by_id(int id);
    std::vector<Item> children(std::string_view parent_key);
    std::vector<Item> absent();   // wanted on the device, but not there
    std::vector<Item> pending();  // held back by the adapter
    void each(const std::function<void(const Item&)>& visit);
    std::optional<Item> first_on_device();

    void store(const Item& item);  // adds, or replaces the line of its key
    void forget(std::string_view key);

    // Further numbers under which the device lists the same occurrence.
    bool is_alias(int id);
    void add_alias(int id, std::string_view key);
    void drop_alias(int id);
    std::vector<int> aliases(std::string_view key);

    struct Counts {
        std::int64_t events = 0;       // ordinary ones
        std::int64_t occurrences = 0;  // changed and cancelled ones
        std::int64_t pending = 0;
    };
    Counts counts();

  private:
    Connection& connection_;
};

}  // namespace qor
