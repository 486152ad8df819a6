// SPDX-License-Identifier: Apache-2.0
//
// What the tools show on a terminal: lines, tables that line up, progress.
#pragma once

#include <cstddef>
#include <initializer_list>
#include <string>
#include <string_view>
#include <vector>

namespace qor {

// Whether the bytes are well-formed UTF-8.
bool is_utf8(std::string_view text);

// The text on one line: control characters become blanks, what is not UTF-8 becomes U+FFFD.
std::string one_line(std::string_view text);

// The cells that a terminal gives to a text of one line.
std::size_t display_width(std::string_view text);

// Cut to so many cells, the last one "…" when something was cut.
std::string shortened(std::string_view text, std::size_t width);

// Columns as wide as their widest cell; the last one is not padded.
class Table {
  public:
    explicit Table(std::vector<std::string> headings) { rows_.push_back(std::move(headings)); }
    void right_align(std::initializer_list<std::size_t> columns) { right_ = columns; }
    // Each cell is made one line; a row has as many as there are headings.
    void add(std::vector<std::string> cells);
    bool empty() const { return rows_.size() == 1; }
    // Lines that end in "\n"; headings bold when `colour`.
    std::string text(bool colour = false) const;
    // To stdout, headings bold on a terminal only.
    void print() const;

  private:
    std::vector<std::vector<std::string>> rows_;  // the headings first
    std::vector<std::size_t> right_;
};

// A line on stderr that is written over again and again, on a terminal only.
class Progress {
  public:
    explicit Progress(std::string what);
    ~Progress();
    Progress(const Progress&) = delete;
    Progress& operator=(const Progress&) = delete;
    void show(std::size_t done, std::size_t total);

  private:
    std::string what_;
    bool on_terminal_;
    bool shown_ = false;
};

// "3 events", "1 event".
std::string plural(std::size_t count, std::string_view noun);

}  // namespace qor
