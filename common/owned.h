// SPDX-License-Identifier: Apache-2.0
//
// Owners: each resource has one from the line after it was made, so that every failure exit is a
// plain return. No state, no locks.
#pragma once

#include <glib-object.h>
#include <json-glib/json-glib.h>
#include <sqlite3.h>
#include <unicode/ucal.h>

#include <cstdlib>
#include <memory>
#include <type_traits>

#include "common/device.h"

template <auto Release>
struct Releaser {
    template <typename T>
    void operator()(T* owned) const noexcept {
        static_cast<void>(Release(owned));
    }
};

template <typename T, auto Release>
using Owned = std::unique_ptr<T, Releaser<Release>>;

using Statement = Owned<sqlite3_stmt, sqlite3_finalize>;
using Ucal = Owned<UCalendar, ucal_close>;
using Parser = Owned<JsonParser, g_object_unref>;
using Generator = Owned<JsonGenerator, g_object_unref>;
using Object = Owned<JsonObject, json_object_unref>;
using Array = Owned<JsonArray, json_array_unref>;
using Node = Owned<JsonNode, json_node_free>;
using GText = Owned<char, g_free>;          // texts made by GLib and the JSON library
using GTexts = Owned<char*, g_strfreev>;    // what g_strsplit() makes
using MallocText = Owned<char, std::free>;  // malloc, strdup: what the host will free

// A record's owner destroys its child records too; a list's owner its records.
inline void destroy_record(calendar_record_h record) noexcept {
    static_cast<void>(calendar_record_destroy(record, true));
}
inline void destroy_list(calendar_list_h list) noexcept {
    static_cast<void>(calendar_list_destroy(list, true));
}
using Record = Owned<std::remove_pointer_t<calendar_record_h>, destroy_record>;
using List = Owned<std::remove_pointer_t<calendar_list_h>, destroy_list>;
using Query = Owned<std::remove_pointer_t<calendar_query_h>, calendar_query_destroy>;
using Filter = Owned<std::remove_pointer_t<calendar_filter_h>, calendar_filter_destroy>;
