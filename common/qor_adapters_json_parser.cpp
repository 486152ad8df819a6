// SPDX-License-Identifier: Apache-2.0
//
// JSON parse buffer over the JSON library's tree. Every number becomes a double, also a 64-bit
// integer: the documents carry their numbers as strings. No state between calls.
#include "common/qor_adapters_json_parser.h"

#include <cstdlib>
#include <cstring>

#include "common/json_depth.h"
#include "common/log.h"
#include "common/owned.h"

namespace {

constexpr char kInvalidInput[] = "Invalid Input Parameters\n";
constexpr char kRootName[] = "root";

void set_number(qor_adapters_json_parse_buffer* buffer, qor_adapters_json_value_type type,
                double value) {
    buffer->type = type;
    buffer->node = nullptr;
    buffer->value = value;
}

// Types a child by its node, which has been set, and reads a value.
int read_child(qor_adapters_json_parse_buffer* child, JsonNode* node) {
    switch (json_node_get_node_type(node)) {
        case JSON_NODE_OBJECT:
            child->type = QOR_ADAPTERS_JSON_OBJECT;
            return 1;
        case JSON_NODE_ARRAY:
            child->type = QOR_ADAPTERS_JSON_ARRAY;
            return 1;
        case JSON_NODE_VALUE:
            return qor_adapters_json_parser_parse_buffer_get_value(child);
        case JSON_NODE_NULL:
            return 1;  // Deliberate: a null leaves the type code that the buffer held before.
    }
    return 0;
}

// Fills a child with the next member of an object.
int read_member(JsonObjectIter* members, qor_adapters_json_parse_buffer* child) {
    const char* name = nullptr;
    JsonNode* node = nullptr;
    const bool found = json_object_iter_next_ordered(members, &name, &node) != FALSE;
    child->name = const_cast<char*>(name);
    if (!found) {
        return 0;
    }
    child->node = node;
    return read_child(child, node);
}

int read_member_at(JsonObject* object, qor_adapters_json_parse_buffer* child, int32_t index) {
    JsonObjectIter members;
    json_object_iter_init_ordered(&members, object);
    for (int32_t i = 0; i < index; ++i) {
        if (json_object_iter_next_ordered(&members, nullptr, nullptr) == FALSE) {
            child->name = nullptr;
            return 0;
        }
    }
    return read_member(&members, child);
}

int read_element_at(JsonArray* array, qor_adapters_json_parse_buffer* child, int32_t index) {
    child->name = nullptr;
    if (static_cast<guint>(index) >= json_array_get_length(array)) {
        return 0;
    }
    JsonNode* const element = json_array_get_element(array, static_cast<guint>(index));
    child->node = element;
    return element != nullptr ? read_child(child, element) : 0;
}

}  // namespace

void qor_adapters_json_parser_parse_buffer(const char* text, size_t length,
                                           qor_adapters_json_parse_buffer* root) {
    if (text == nullptr || length == 0) {
        g_print(kInvalidInput);
        return;
    }
    if (length > static_cast<size_t>(G_MAXSSIZE) || !is_shallow_json(text, length)) {
        return;
    }
    const Parser parser(json_parser_new());  // GLib (2.36 on) starts its types by itself
    if (!parser || json_parser_load_from_data(parser.get(), text, static_cast<gssize>(length),
                                              nullptr) != TRUE) {
        return;
    }
    JsonNode* const tree = json_parser_get_root(parser.get());
    if (tree == nullptr) {
        return;
    }
    root->name = static_cast<char*>(std::malloc(sizeof kRootName));
    if (root->name != nullptr) {
        std::memcpy(root->name, kRootName, sizeof kRootName);
    }
    Node copy(json_node_copy(tree));
    root->node = copy.get();
    switch (json_node_get_node_type(tree)) {
        case JSON_NODE_VALUE:
            qor_adapters_json_parser_parse_buffer_get_value(root);
            break;
        case JSON_NODE_OBJECT:
            root->type = QOR_ADAPTERS_JSON_OBJECT;
            break;
        case JSON_NODE_ARRAY:
            root->type = QOR_ADAPTERS_JSON_ARRAY;
            break;
        default:
            root->type = QOR_ADAPTERS_JSON_NONE;
    }
    if (root->node == copy.get()) {  // not replaced by a value
        static_cast<void>(copy.release());
    }
}

int qor_adapters_json_parser_parse_buffer_get_child(qor_adapters_json_parse_buffer* parent,
                                                    qor_adapters_json_parse_buffer* child,
                                                    int32_t index) {
    if (parent == nullptr || parent->node == nullptr || child == nullptr || index < 0) {
        g_print(kInvalidInput);
        return 0;
    }
    auto* const node = static_cast<JsonNode*>(parent->node);
    switch (json_node_get_node_type(node)) {
        case JSON_NODE_OBJECT:
            return read_member_at(json_node_get_object(node), child, index);
        case JSON_NODE_ARRAY:
            return read_element_at(json_node_get_array(node), child, index);
        default:
            child->name = nullptr;
            child->node = nullptr;
            return 0;
    }
}

JsonWalk walk_json_children(qor_adapters_json_parse_buffer* parent) noexcept {
    JsonWalk walk{};
    if (parent == nullptr || parent->type == QOR_ADAPTERS_JSON_STRING) {
        return walk;  // a text that has been read is no node
    }
    walk.parent = parent;
    auto* const node = static_cast<JsonNode*>(parent->node);
    if (node != nullptr && json_node_get_node_type(node) == JSON_NODE_OBJECT) {
        walk.has_members = true;
        json_object_iter_init_ordered(&walk.members, json_node_get_object(node));
    }
    return walk;
}

int next_json_child(JsonWalk* walk, qor_adapters_json_parse_buffer* child) noexcept {
    *child = {};
    return walk->has_members ? read_member(&walk->members, child)
                             : qor_adapters_json_parser_parse_buffer_get_child(walk->parent, child,
                                                                               walk->next_index++);
}

int qor_adapters_json_parser_parse_buffer_get_value(qor_adapters_json_parse_buffer* buffer) {
    if (buffer == nullptr) {
        g_print(kInvalidInput);
        return -1;
    }
    auto* const node = static_cast<JsonNode*>(buffer->node);
    GValue value = G_VALUE_INIT;
    json_node_get_value(node, &value);
    switch (json_node_get_value_type(node)) {
        case G_TYPE_BOOLEAN:
            set_number(buffer, QOR_ADAPTERS_JSON_BOOLEAN, g_value_get_boolean(&value));
            break;
        case G_TYPE_INT:
            set_number(buffer, QOR_ADAPTERS_JSON_INT, g_value_get_int(&value));
            break;
        case G_TYPE_UINT:
            set_number(buffer, QOR_ADAPTERS_JSON_UINT, g_value_get_uint(&value));
            break;
        case G_TYPE_INT64:
            set_number(buffer, QOR_ADAPTERS_JSON_INT,
                       static_cast<double>(g_value_get_int64(&value)));
            break;
        case G_TYPE_UINT64:
            set_number(buffer, QOR_ADAPTERS_JSON_UINT,
                       static_cast<double>(g_value_get_uint64(&value)));
            break;
        case G_TYPE_DOUBLE:
            set_number(buffer, QOR_ADAPTERS_JSON_DOUBLE, g_value_get_double(&value));
            break;
        case G_TYPE_STRING:
            buffer->type = QOR_ADAPTERS_JSON_STRING;
            buffer->node = g_value_dup_string(&value);
            buffer->value = 0;
            break;
        default:
            g_print("\n Entering node default case\n");
    }
    g_value_unset(&value);
    return 1;
}

void qor_adapters_json_parser_parse_buffer_free(qor_adapters_json_parse_buffer* buffer) {
    if (buffer == nullptr) {
        QOR_LOG(CRITICAL, "%s", kInvalidInput);
        return;
    }
    std::free(buffer->name);
    buffer->name = nullptr;
    if (buffer->node != nullptr) {
        json_node_free(static_cast<JsonNode*>(buffer->node));
        buffer->node = nullptr;
    }
}

void qor_adapters_json_parser_parse_buffer_free_value(qor_adapters_json_parse_buffer* buffer) {
    if (buffer == nullptr) {
        QOR_LOG(CRITICAL, "%s", kInvalidInput);
        return;
    }
    if (buffer->type == QOR_ADAPTERS_JSON_STRING) {
        g_free(buffer->node);
        buffer->node = nullptr;
    }
}
