// SPDX-License-Identifier: Apache-2.0
//
// Prints rows of texts in aligned columns: the first column to the left, the others to the right.
#pragma once

#include <cstdio>
#include <string>
#include <vector>

using TableRow = std::vector<std::string>;

// A number with a fixed count of decimals.
inline std::string decimal(double number, int decimals) {
    char text[64];
    std::snprintf(text, sizeof text, "%.*f", decimals, number);
    return text;
}

// The first row is the heading.
inline void print_table(const char* title, const std::vector<TableRow>& rows) {
    std::vector<size_t> widths(rows.front().size());
    for (const TableRow& row : rows) {
        for (size_t i = 0; i < row.size(); ++i) {
            widths[i] = row[i].size() > widths[i] ? row[i].size() : widths[i];
        }
    }
    std::printf("\n%s\n", title);
    for (const TableRow& row : rows) {
        for (size_t i = 0; i < row.size(); ++i) {
            const int width = static_cast<int>(widths[i]);
            std::printf(i == 0 ? "  %-*s" : "  %*s", width, row[i].c_str());
        }
        std::printf("\n");
    }
}
