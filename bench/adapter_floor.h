// SPDX-License-Identifier: Apache-2.0
//
// The adapter's operations at their floor: the SQL statements, the calls of the device's services,
// of the JSON library and of ICU that an operation cannot do without, on an adapter database of its
// own, without a check, a lookup of names or a failure path. What the adapter costs above it is its
// own work.
#pragma once

#include <sqlite3.h>

#include <string>

#include "common/device.h"
#include "common/owned.h"

class AdapterFloor {
  public:
    // Opens a database that the adapter has made.
    explicit AdapterFloor(const std::string& file);

    MallocText insert();
    GText get(int item_id);
    void update(int item_id);
    void remove(int item_id);
    // The numbers of the ids of a change list: changed items, or deleted ones.
    int dirty_ids(calendar_list_h changes);
    int deleted_ids(calendar_list_h changes);

  private:
    int insert_row(int event_id);
    void record_version(int event_id);
    void delete_row(int item_id);
    void read_derived_rows(int event_id);

    Owned<sqlite3, sqlite3_close> db_;
    guint retry_timer_ = 0;
};
