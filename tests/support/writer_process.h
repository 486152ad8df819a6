// SPDX-License-Identifier: Apache-2.0
//
// Runs calendar_writer, the second process of a test, in the current directory.
#pragma once

#include <gtest/gtest.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <string>

class WriterProcess {
  public:
    WriterProcess(int book, int count) {
        std::string program = QOR_BIN_DIR "/calendar_writer";
        std::string book_text = std::to_string(book);
        std::string count_text = std::to_string(count);
        char* arguments[] = {program.data(), book_text.data(), count_text.data(), nullptr};
        EXPECT_EQ(posix_spawn(&pid_, program.c_str(), nullptr, nullptr, arguments, environ), 0);
    }
    ~WriterProcess() { EXPECT_TRUE(waited_) << "wait() tells how it ended"; }
    WriterProcess(const WriterProcess&) = delete;
    WriterProcess& operator=(const WriterProcess&) = delete;

    void wait() {
        int status = -1;
        EXPECT_EQ(waitpid(pid_, &status, 0), pid_);
        EXPECT_EQ(status, 0);
        waited_ = true;
    }

  private:
    pid_t pid_ = -1;
    bool waited_ = false;
};
