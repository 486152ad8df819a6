// SPDX-License-Identifier: Apache-2.0
#include "bench/adapter_operations.h"

#include <cstdlib>
#include <cstring>

#include "bench/bench_device.h"
#include "bench/document_floor.h"
#include "data-sync/qor_adapter_data_sync_calendar_event.h"

AdapterFloor* adapter_floor = nullptr;
calendar_list_h floor_changes = nullptr;

namespace {

MallocText adapter_insert() {
    char* id = nullptr;
    require(qor_adapter_data_sync_insert_value(nullptr, kFloorDocument, &id) == 0, "insert");
    return MallocText(id);
}

MallocText adapter_get(const char* id) {
    char* document = nullptr;
    require(qor_adapter_data_sync_get_value(id, nullptr, &document) == 0, "get");
    return MallocText(document);
}

template <int (*Query)(char***, int*) noexcept>
void adapter_ids(int items) {
    char** ids = nullptr;
    int count = 0;
    require(Query(&ids, &count) == 0 && count == items, "an id query");
    for (int i = 0; i < count; ++i) {
        std::free(ids[i]);
    }
    std::free(ids);
}

}  // namespace

const std::vector<Operation>& adapter_operations() {
    static const std::vector<Operation> operations = {
        {"insert", [](const Item&) { adapter_insert(); },
         [](const Item&) { adapter_floor->insert(); }, false, 0},
        {"get", [](const Item& item) { adapter_get(item.id.c_str()); },
         [](const Item& item) { adapter_floor->get(item.number); }, false, 0},
        {"update",
         [](const Item& item) {
             require(
                 qor_adapter_data_sync_update_value(nullptr, item.id.c_str(), kFloorDocument) == 0,
                 "update");
         },
         [](const Item& item) { adapter_floor->update(item.number); }, false, 0},
        {"delete",
         [](const Item& item) {
             require(qor_adapter_data_sync_delete_value(item.id.c_str()) == 0, "delete");
         },
         [](const Item& item) { adapter_floor->remove(item.number); }, false, 0},
        {"dirty ids",
         [](const Item& items) {
             adapter_ids<qor_adapter_data_sync_get_dirty_ids_p>(items.number);
         },
         [](const Item&) { adapter_floor->dirty_ids(floor_changes); }, true,
         CALENDAR_RECORD_MODIFIED_STATUS_UPDATED},
        {"deleted ids",
         [](const Item& items) {
             adapter_ids<qor_adapter_data_sync_get_deleted_ids_p>(items.number);
         },
         [](const Item&) { adapter_floor->deleted_ids(floor_changes); }, true,
         CALENDAR_RECORD_MODIFIED_STATUS_DELETED},
    };
    return operations;
}

bool floor_gives_the_same() {
    const MallocText adapter_id = adapter_insert();
    const MallocText floor_id = adapter_floor->insert();
    const MallocText adapter_text = adapter_get(adapter_id.get());
    const GText floor_text = adapter_floor->get(std::atoi(floor_id.get()));
    return std::strcmp(adapter_id.get(), floor_id.get()) == 0 &&
           std::strcmp(adapter_text.get(), floor_text.get()) == 0;
}
