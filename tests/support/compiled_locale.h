// SPDX-License-Identifier: Apache-2.0
//
// A host that runs in another country's locale, whichever the machine has installed.
#pragma once

#include <gtest/gtest.h>

#include <clocale>
#include <cstdlib>
#include <filesystem>
#include <string>

// Puts the process into a locale ("de_DE") for a scope; it is compiled into the directory from the
// sources of Debian's package `locales`.
class CompiledLocale {
  public:
    CompiledLocale(const std::string& name, const std::string& directory) {
        const std::string compiled = directory + "/" + name;
        if (!std::filesystem::exists(compiled)) {
            const std::string compile =
                "localedef -i " + name + " -f UTF-8 '" + compiled + "' 2>/dev/null";
            EXPECT_EQ(std::system(compile.c_str()), 0) << compile;
        }
        setenv("LOCPATH", directory.c_str(), 1);
        EXPECT_NE(std::setlocale(LC_ALL, name.c_str()), nullptr) << name;
    }
    ~CompiledLocale() {
        std::setlocale(LC_ALL, "C");
        unsetenv("LOCPATH");
    }
    CompiledLocale(const CompiledLocale&) = delete;
    CompiledLocale& operator=(const CompiledLocale&) = delete;
};
