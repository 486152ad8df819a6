// SPDX-License-Identifier: Apache-2.0
#include "common/qor_adapters_json_parser.h"

#include <gtest/gtest.h>

#include <chrono>
#include <sstream>
#include <string>
#include <utility>
#include <vector>

#include "tests/support/faults.h"
#include "tests/support/heap.h"
#include "tests/support/json.h"

namespace {

const char* const kTypes[] = {"NONE",   "INT",     "UINT",  "DOUBLE",
                              "STRING", "BOOLEAN", "ARRAY", "OBJECT"};

// "name TYPE value" of a buffer, as its fields say.
std::string describe(const JsonBuffer& buffer) {
    std::ostringstream out;
    out.precision(17);
    out << (buffer.name != nullptr ? buffer.name : "-") << ' ' << kTypes[buffer.type] << ' ';
    if (const char* const text = json_text(buffer); text != nullptr) {
        out << text;
    } else {
        out << (buffer.node != nullptr ? "node" : "none") << ' ' << buffer.value;
    }
    return out.str();
}

// The children, one per line, by index and by walk.
std::pair<std::string, std::string> describe_children(JsonBuffer* parent) {
    std::string by_index;
    std::string by_walk;
    for (int i = 0;; ++i) {
        JsonBuffer child{};
        if (qor_adapters_json_parser_parse_buffer_get_child(parent, &child, i) == 0) {
            break;
        }
        const JsonValue value(&child);
        by_index += describe(child) + "\n";
    }
    JsonBuffer child{};
    JsonWalk walk = walk_json_children(parent);
    while (next_json_child(&walk, &child) != 0) {
        const JsonValue value(&child);
        by_walk += describe(child) + "\n";
    }
    return {by_index, by_walk};
}

std::string nest(int depth, const std::string& open = "[", const std::string& close = "]") {
    std::string text;
    for (int i = 0; i < depth; ++i) {
        text += open;
    }
    text += "1";
    for (int i = 0; i < depth; ++i) {
        text += close;
    }
    return text;
}

TEST(JsonParseBuffer, ARootHoldsItsTypeAndItsNodeOrValue) {
    const struct {
        std::string text;
        const char* root;
    } cases[] = {
        {"42", "root INT none 42"},
        {"-9223372036854775808", "root INT none -9.2233720368547758e+18"},
        {"9007199254740993", "root INT none 9007199254740992"},
        {"true", "root BOOLEAN none 1"},
        {"false", "root BOOLEAN none 0"},
        {"1.5", "root DOUBLE none 1.5"},
        {"\"text\"", "root STRING text"},
        {"null", "root NONE node 0"},
        {"{}", "root OBJECT node 0"},
        {" [1] ", "root ARRAY node 0"},
        {"", "- NONE none 0"},
        {"  ", "- NONE none 0"},
        {"{\"a\":", "- NONE none 0"},
        {"not JSON", "- NONE none 0"},
        {"[\"\xff\xfe\"]", "- NONE none 0"},
        {std::string("[\"a\0b\"]", 7), "- NONE none 0"},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.text);
        JsonDocument document(c.text);
        EXPECT_EQ(describe(document.root), c.root);
    }
}

TEST(JsonParseBuffer, ChildrenComeInDocumentOrderByIndexAndByWalk) {
    const struct {
        std::string text;
        const char* children;
        const char* printed = "";
    } cases[] = {
        {R"({"z":"text","a":7,"m":{"x":1}})", "z STRING text\na INT none 7\nm OBJECT node 0\n"},
        {R"(["text",-1.25,true,[],{}])",
         "- STRING text\n- DOUBLE none -1.25\n- BOOLEAN none 1\n- ARRAY node 0\n- OBJECT node 0\n"},
        {R"({"a":"text","b":null,"c":""})", "a STRING text\nb NONE node 0\nc STRING \n"},
        {R"([null,9223372036854775807])", "- NONE node 0\n- INT none 9.2233720368547758e+18\n"},
        {R"({"a":1,"b":2,"a":"later"})", "a STRING later\nb INT none 2\n"},
        {"{}", ""},
        {"[]", ""},
        {"null", ""},
        {"42", "", "Invalid Input Parameters\nInvalid Input Parameters\n"},
        {"not JSON", "", "Invalid Input Parameters\nInvalid Input Parameters\n"},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.text);
        JsonDocument document(c.text);
        PrintCapture printed;
        const auto [by_index, by_walk] = describe_children(&document.root);
        EXPECT_EQ(by_index, c.children);
        EXPECT_EQ(by_walk, c.children);
        EXPECT_EQ(printed.text(), c.printed);
    }
}

TEST(JsonParseBuffer, AChildThatIsNotThereLeavesItsNode) {
    JsonDocument object(R"({"a":"text","b":null})");
    JsonDocument array("[1]");
    JsonDocument null("null");
    JsonBuffer child{};
    ASSERT_EQ(qor_adapters_json_parser_parse_buffer_get_child(&object.root, &child, 0), 1);
    EXPECT_EQ(describe(child), "a STRING text");
    qor_adapters_json_parser_parse_buffer_free_value(&child);
    EXPECT_EQ(child.node, nullptr);

    // A null keeps the code of the member before it.
    ASSERT_EQ(qor_adapters_json_parser_parse_buffer_get_child(&object.root, &child, 1), 1);
    EXPECT_EQ(child.type, QOR_ADAPTERS_JSON_STRING);
    EXPECT_STREQ(child.name, "b");
    void* const node = child.node;
    EXPECT_NE(node, nullptr);

    for (const int index : {2, 3, INT32_MAX}) {
        child.name = object.root.name;
        EXPECT_EQ(qor_adapters_json_parser_parse_buffer_get_child(&object.root, &child, index), 0);
        EXPECT_EQ(child.name, nullptr);
        child.name = object.root.name;
        EXPECT_EQ(qor_adapters_json_parser_parse_buffer_get_child(&array.root, &child, index), 0);
        EXPECT_EQ(child.name, nullptr);
        EXPECT_EQ(child.node, node);
    }
    EXPECT_EQ(qor_adapters_json_parser_parse_buffer_get_child(&null.root, &child, 0), 0);
    EXPECT_EQ(child.node, nullptr);

    // The parent's type code is not consulted.
    object.root.type = QOR_ADAPTERS_JSON_INT;
    EXPECT_EQ(qor_adapters_json_parser_parse_buffer_get_child(&object.root, &child, 1), 1);
    EXPECT_STREQ(child.name, "b");
}

TEST(JsonParseBuffer, UnusableArgumentsArePrintedOrLogged) {
    JsonDocument document("[1]");
    JsonBuffer child{};
    JsonBuffer empty{};
    PrintCapture printed;
    const auto get_child = qor_adapters_json_parser_parse_buffer_get_child;
    EXPECT_EQ(get_child(nullptr, &child, 0), 0);
    EXPECT_EQ(get_child(&empty, &child, 0), 0);
    EXPECT_EQ(get_child(&document.root, nullptr, 0), 0);
    EXPECT_EQ(get_child(&document.root, &child, -1), 0);
    JsonWalk walk = walk_json_children(nullptr);
    EXPECT_EQ(next_json_child(&walk, &child), 0);
    EXPECT_EQ(qor_adapters_json_parser_parse_buffer_get_value(nullptr), -1);
    qor_adapters_json_parser_parse_buffer(nullptr, 3, &empty);
    qor_adapters_json_parser_parse_buffer("[1]", 0, &empty);
    EXPECT_EQ(describe(empty), "- NONE none 0");
    std::string expected;
    for (int i = 0; i < 8; ++i) {
        expected += "Invalid Input Parameters\n";
    }
    EXPECT_EQ(printed.text(), expected);

    faults::take_log();
    qor_adapters_json_parser_parse_buffer_free(nullptr);
    qor_adapters_json_parser_parse_buffer_free_value(nullptr);
    const std::vector<LogLine> logged = {
        critical("qor_adapters_json_parser_parse_buffer_free", "Invalid Input Parameters\n"),
        critical("qor_adapters_json_parser_parse_buffer_free_value", "Invalid Input Parameters\n")};
    EXPECT_EQ(faults::take_log(), logged);

    qor_adapters_json_parser_parse_buffer_free_value(&document.root);  // no string: left alone
    EXPECT_EQ(describe(document.root), "root ARRAY node 0");
    qor_adapters_json_parser_parse_buffer_free(&document.root);
    EXPECT_EQ(document.root.name, nullptr);
    EXPECT_EQ(document.root.node, nullptr);
}

TEST(JsonParseBuffer, WithoutMemoryThereIsNoRootOrNoName) {
    faults::fail("json_parser_new");
    {
        JsonDocument document("[1]");
        EXPECT_EQ(describe(document.root), "- NONE none 0");
    }
    faults::fail("malloc");
    {
        JsonDocument document("[1]");
        EXPECT_EQ(describe(document.root), "- ARRAY node 0");
    }
    faults::clear();
}

TEST(JsonParseBuffer, ATextNestedDeeperThan256LevelsIsNotJson) {
    const int many = 1000000;
    const std::string deep(many, '[');
    std::string pairs;  // more brackets than levels
    for (int i = 0; i < 300; ++i) {
        pairs += "{},";
    }
    const struct {
        const char* name;
        std::string text;
        bool is_parsed;
    } cases[] = {
        {"256 arrays", nest(256), true},
        {"257 arrays", nest(257), false},
        {"256 objects", nest(256, R"({"a":)", "}"), true},
        {"257 objects", nest(257, R"({"a":)", "}"), false},
        {"a million levels", nest(many), false},
        {"never closed", deep, false},
        {"side by side", "[" + nest(255) + "," + nest(255) + "]", true},
        {"objects side by side", "[" + pairs + "0]", true},
        {"in a string", "[\"" + deep + "\"]", true},
        {"after an escaped quote", R"(["\"[)" + deep + "\"]", true},
        {"after an escaped backslash", R"(["\\",")" + deep + "\"]", true},
        {"after a quote that a backslash does not escape", R"(["\\")" + deep + "\"]", false},
        {"after a character of two escapes", R"(["\ud83d\ude00)" + deep + "\"]", true},
        {"after an escape", R"(["\u00e9)" + deep + "\"]", true},
        {"after an escape next to half a character", R"(["\ud7ff)" + deep + "\"]", true},
        // The library takes the quote after these for a part of the string.
        {"after half a character", R"(["\ud800",")" + deep, false},
        {"after another half", R"(["\udfff",")" + deep, false},
        {"after half a character and another escape", R"(["\ud800\n",")" + deep, false},
        {"after a short escape", R"(["\u12",")" + deep, false},
        {"after an escape of no digit", R"(["\ug000",")" + deep, false},
        {"after an escape of one digit", R"(["\u0g00",")" + deep, false},
        {"after an escape of two digits", R"(["\u00g0",")" + deep, false},
        {"after an escape of three digits", R"(["\u000g",")" + deep, false},
        {"after a short second half", R"(["\ud83d\ude",")" + deep, false},
        {"after a quote in a comment", R"(/*"*/)" + deep, false},
        {"after a quote in single quotes", R"(['"',)" + deep, false},
        {"after closing brackets", "]]]]" + deep, false},
        {"a comment above 256 levels", "/**/" + nest(256), true},
        {"a string that does not end", "[" + pairs + R"("a)", false},
        {"a string that ends in a backslash", "[" + pairs + R"("\)", false},
        {"a string that ends in an escape", "[" + pairs + R"("\u00)", false},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.name);
        JsonDocument document(c.text);
        EXPECT_EQ(document.root.node != nullptr, c.is_parsed);
    }
}

TEST(JsonParseBuffer, AWalkOverManyMembersTakesNoTime) {
    std::string object = "{";
    std::string array = "[";
    const int many = kIsSanitized ? 20000 : 200000;
    for (int i = 0; i < many; ++i) {
        object += (i == 0 ? "\"" : ",\"") + std::to_string(i) + "\":\"\"";
        array += i == 0 ? "0" : ",0";
    }
    for (const std::string& text : {object + "}", array + "]"}) {
        JsonDocument document(text);
        const auto start = std::chrono::steady_clock::now();
        JsonWalk walk = walk_json_children(&document.root);
        JsonBuffer child{};
        int count = 0;
        while (next_json_child(&walk, &child) != 0) {
            const JsonValue value(&child);
            ++count;
        }
        EXPECT_EQ(count, many);
        EXPECT_LT(std::chrono::steady_clock::now() - start, std::chrono::seconds(2));
        // By index, as long as the library walks no further than the index.
        EXPECT_EQ(qor_adapters_json_parser_parse_buffer_get_child(&document.root, &child, many - 1),
                  1);
        qor_adapters_json_parser_parse_buffer_free_value(&child);
    }
}

}  // namespace
