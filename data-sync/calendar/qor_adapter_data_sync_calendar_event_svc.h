// SPDX-License-Identifier: Apache-2.0
//
// Event store operations: what the host sends, applied to the device's calendar and entered in the
// mapping store. State: the id of the exception retry timer. The first three run with the adapter
// mutex held by the caller; the timer callback runs on the main loop and takes it itself.
#pragma once

#include <glib.h>

#include "data-sync/calendar/qor_adapter_data_sync_calendar_db.h"

extern "C" {

// 0 applied or stored pending; -1 on failure (a pending row then keeps the item's number).
int _qor_calendar_event_svc_insert(calendar_adapter_row* row);

// 0 done or nothing to do; -1 on failure; -2 when the item has no calendar-service event.
int _qor_calendar_event_svc_update(calendar_adapter_row* row);

// 0 or -1.
int _qor_calendar_event_svc_delete(int32_t adapter_id);

// The retry timer's callback: applies the pending exceptions whose parent has become known. Returns
// 0, so that a timer runs once.
gboolean __qor_calendar_event_svc_insert_change(gpointer user_data);

// Applies one pending cancelled occurrence (borrowed row).
void __qor_calendar_event_svc_insert_exdate(calendar_adapter_row* row);
}
