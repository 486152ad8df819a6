// SPDX-License-Identifier: Apache-2.0
//
// What the built library shows and needs.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdio>
#include <cstring>
#include <fstream>
#include <set>
#include <string>
#include <vector>

#include "tests/support/adapter.h"

namespace {

std::vector<std::string> lines_of(const std::string& command) {
    std::vector<std::string> lines;
    FILE* const pipe = popen(command.c_str(), "r");
    char line[4096];
    while (fgets(line, sizeof(line), pipe) != nullptr) {
        lines.emplace_back(line, strcspn(line, "\n"));
    }
    EXPECT_EQ(pclose(pipe), 0) << command;
    return lines;
}

TEST(ExportsTest, TheEntryPointsAreTheOnlyVisibleSymbols) {
    std::set<std::string> visible;
    for (const std::string& line :
         lines_of(std::string("nm -D --defined-only ") + kAdapterLibrary)) {
        visible.insert(line.substr(line.rfind(' ') + 1));
    }
    std::set<std::string> listed;
    std::ifstream map(QOR_SOURCE_DIR "/data-sync/exports.map");
    for (std::string word; map >> word;) {
        if (word.starts_with("qor_adapter_")) {
            listed.insert(word.substr(0, word.find(';')));
        }
    }
    EXPECT_EQ(listed.size(), 23U);
    EXPECT_EQ(visible, listed);
}

TEST(ExportsTest, TheLibraryNeedsNothingBeyondItsDependencies) {
#if defined(__SANITIZE_ADDRESS__) || defined(__SANITIZE_THREAD__) || defined(__clang__)
    GTEST_SKIP() << "sanitizer runtimes and coverage need more";
#endif
    const std::vector<std::string> allowed = {"libqor-platform", "libsqlite3",       "libglib-2.0",
                                              "libgobject-2.0",  "libjson-glib-1.0", "libicui18n",
                                              "libicuuc",        "libc.so",          "libgcc_s"};
    for (const std::string& line :
         lines_of(std::string("readelf -d ") + kAdapterLibrary + " | grep NEEDED")) {
        const std::string library = line.substr(line.find('[') + 1);
        EXPECT_THAT(allowed,
                    ::testing::Contains(::testing::ResultOf(
                        [&](const std::string& name) { return library.starts_with(name); }, true)))
            << line;
    }
}

}  // namespace
