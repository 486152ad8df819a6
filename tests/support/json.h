// SPDX-License-Identifier: Apache-2.0
//
// Parse buffers in tests, and what the JSON layer prints.
#pragma once

#include <glib.h>

#include <string>
#include <utility>

#include "common/qor_adapters_json_parser.h"

using JsonBuffer = qor_adapters_json_parse_buffer;

// A parsed text that releases itself.
struct JsonDocument {
    JsonBuffer root{};
    explicit JsonDocument(const std::string& text) {
        qor_adapters_json_parser_parse_buffer(text.data(), text.size(), &root);
    }
    ~JsonDocument() {
        qor_adapters_json_parser_parse_buffer_free_value(&root);
        qor_adapters_json_parser_parse_buffer_free(&root);
    }
    JsonDocument(const JsonDocument&) = delete;
    JsonDocument& operator=(const JsonDocument&) = delete;
};

// Takes what g_print() prints while it lives.
class PrintCapture {
  public:
    PrintCapture() : previous_(g_set_print_handler([](const char* text) { captured() += text; })) {
        captured().clear();
    }
    ~PrintCapture() { g_set_print_handler(previous_); }
    PrintCapture(const PrintCapture&) = delete;
    PrintCapture& operator=(const PrintCapture&) = delete;

    static std::string text() { return std::exchange(captured(), {}); }

  private:
    static std::string& captured() {
        static std::string text;
        return text;
    }
    GPrintFunc previous_;
};
