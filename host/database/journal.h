// SPDX-License-Identifier: Apache-2.0
//
// What must not be forgotten when the process is killed: what the device reported (the adapter
// forgets deleted items as it tells of them), what is about to be written to the device, and what
// could not be done and is tried again at the next sync.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "host/database/connection.h"

namespace qor {

struct DeviceChange {
    int id = 0;
    bool gone = false;
    std::int64_t noticed_ms = 0;
    std::string reason;  // why the latest try failed; empty before the first
    std::string label;
};

enum class Action {
    kInsert,
    kUpdate,
    kReplace,  // remove, then insert: what cannot be updated, and what must be delivered anew
    kRemove,
};

struct Intent {
    Action action = Action::kInsert;
    std::string key;
    std::string document;
    std::int64_t revision = 0;
    int base_id = 0;  // items made by the batch have higher numbers
};

struct Retry {
    std::string key;
    std::string reason;
    std::string label;
    std::int64_t since_ms = 0;
    bool interrupted = false;  // must be delivered even when it looks the same
};

class Journal {
  public:
    explicit Journal(Connection& connection) : connection_(connection) {}

    void note_change(int id, bool gone, std::int64_t now_ms);
    std::vector<DeviceChange> changes();
    void explain_change(int id, std::string_view reason, std::string_view label);
    void drop_change(int id);

    void intend(const Intent& intent);
    std::vector<Intent> intents();
    void drop_intents();

    void retry(const Retry& retry);
    std::vector<Retry> retries();
    void drop_retry(std::string_view key);

    bool empty();

  private:
    Connection& connection_;
};

}  // namespace qor
