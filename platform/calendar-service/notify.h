// SPDX-License-Identifier: Apache-2.0
//
// Change notification between processes: a writer changes the time of a small file, which costs no
// disk sync, and subscribers watch it with inotify. One file per view.
#pragma once

#include <string>

#include "platform/calendar-service/view.h"
#include "platform/include/calendar_service.h"

namespace device {

// Tells the subscribers of a view, in every process, that it has changed. Any thread.
void announce_change(const std::string& folder, const View& view);

// The subscriptions of this process. Any thread. They throw Failure.
void subscribe(const std::string& folder, const View& view, calendar_db_changed_cb callback,
               void* user_data);
void unsubscribe(const View& view, calendar_db_changed_cb callback, void* user_data);
void unsubscribe_all();

}  // namespace device
