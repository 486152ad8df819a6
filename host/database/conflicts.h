// SPDX-License-Identifier: Apache-2.0
//
// The documents that lost a conflict. They are kept until the account's owner removes the file;
// signing out keeps them.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "host/database/connection.h"

namespace qor {

struct Conflict {
    std::int64_t id = 0;
    std::int64_t time_ms = 0;
    std::string key;
    std::string label;
    std::string lost;      // whose document it is: "device" or "cloud"
    std::string document;  // the document that lost
    std::string kept;      // the one that was kept; empty for a deletion
    bool restored = false;
};

class Conflicts {
  public:
    explicit Conflicts(Connection& connection) : connection_(connection) {}

    // Keeps a document that is about to be overwritten; the same one is kept once.
    void keep(const Conflict& conflict);
    std::vector<Conflict> list();
    std::optional<Conflict> get(std::int64_t id);
    void mark_restored(std::int64_t id);

  private:
    Connection& connection_;
};

}  // namespace qor
