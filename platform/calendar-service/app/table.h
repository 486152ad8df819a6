// SPDX-License-Identifier: Apache-2.0
//
// Tables for a terminal: columns line up by display width, headings are bold on a terminal only.
#pragma once

#include <string>
#include <string_view>
#include <vector>

namespace calendar_app {

// Whether the bytes are well-formed UTF-8.
bool is_utf8(std::string_view text);

// The text on one line: control characters become blanks, bytes that are not UTF-8 become U+FFFD.
std::string one_line(std::string_view text);

// The cells that a terminal gives to a text of one line.
int display_width(std::string_view text);

class Table {
  public:
    explicit Table(std::vector<std::string> headings);
    void add(std::vector<std::string> cells);
    bool empty() const { return rows_.size() == 1; }
    void print() const;

  private:
    std::vector<std::vector<std::string>> rows_;  // the headings first
};

}  // namespace calendar_app
