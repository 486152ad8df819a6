// SPDX-License-Identifier: Apache-2.0
//
// JSON parse buffer: JSON text as a tree that is walked one member at a time through a flat record.
// No state between calls; any thread, one buffer on one thread at a time.
#pragma once

#include <json-glib/json-glib.h>

#include <cstddef>
#include <cstdint>

#include "common/owned.h"

enum qor_adapters_json_value_type : int32_t {
    QOR_ADAPTERS_JSON_NONE = 0,  // a JSON null at the root, or a buffer never filled
    QOR_ADAPTERS_JSON_INT = 1,
    QOR_ADAPTERS_JSON_UINT = 2,
    QOR_ADAPTERS_JSON_DOUBLE = 3,
    QOR_ADAPTERS_JSON_STRING = 4,
    QOR_ADAPTERS_JSON_BOOLEAN = 5,
    QOR_ADAPTERS_JSON_ARRAY = 6,
    QOR_ADAPTERS_JSON_OBJECT = 7,
};

// One JSON node. The caller zero-fills it before its first use.
struct qor_adapters_json_parse_buffer {
    int32_t type;  // qor_adapters_json_value_type
    char* name;    // "root" (owned) for a root; a member's name (borrowed from the tree); or null
    // A container's node: an owned copy for a root, borrowed from the tree for a child. Once a
    // string has been read: its text (owned, g_free()). Null once a number or boolean has been
    // read.
    void* node;
    double value;  // of a number or boolean (1.0 or 0.0); 0 for a string
};

extern "C" {

// Parses length bytes of text into a root buffer. The outcome shows in the buffer: one still of
// type NONE without a node means that nothing was parsed.
void qor_adapters_json_parser_parse_buffer(const char* text, size_t length,
                                           qor_adapters_json_parse_buffer* root);

// Fills child with the index-th member of an object or element of an array, in document order.
// Returns 1 when filled; 0 when there is no such member or the arguments are unusable. A null
// member returns 1 and leaves the child's type code as it was.
int qor_adapters_json_parser_parse_buffer_get_child(qor_adapters_json_parse_buffer* parent,
                                                    qor_adapters_json_parse_buffer* child,
                                                    int32_t index);

// Reads a value node into its buffer. Returns 1, or -1 for a null buffer.
int qor_adapters_json_parser_parse_buffer_get_value(qor_adapters_json_parse_buffer* buffer);

// Releases a root buffer: its name and its tree. The text of a string root must have been released
// with the function below before.
void qor_adapters_json_parser_parse_buffer_free(qor_adapters_json_parse_buffer* buffer);

// Releases the text of a STRING buffer and clears its node; other types are left alone.
void qor_adapters_json_parser_parse_buffer_free_value(qor_adapters_json_parse_buffer* buffer);
}

// Releases the value of a child, which stays where it is, at the end of the child's turn.
using JsonValue =
    Owned<qor_adapters_json_parse_buffer, qor_adapters_json_parser_parse_buffer_free_value>;

// The text of a string value, borrowed; null for any other value.
inline const char* json_text(const qor_adapters_json_parse_buffer& buffer) noexcept {
    return buffer.type == QOR_ADAPTERS_JSON_STRING ? static_cast<const char*>(buffer.node)
                                                   : nullptr;
}

// A walk over all children of a container: what get_child() gives for the indices 0, 1, 2, ..., but
// each in constant time. Borrows the parent.
struct JsonWalk {
    qor_adapters_json_parse_buffer* parent;
    int32_t next_index;
    bool has_members;  // the parent is an object, walked with:
    JsonObjectIter members;
};

// Begins a walk. A parent without children to give (none, or a value) ends it at its first step.
JsonWalk walk_json_children(qor_adapters_json_parse_buffer* parent) noexcept;

// Clears child (release its value before), then fills it as get_child() does and returns the same.
int next_json_child(JsonWalk* walk, qor_adapters_json_parse_buffer* child) noexcept;
