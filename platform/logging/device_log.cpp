// SPDX-License-Identifier: Apache-2.0
//
// Logging: one line per message, written by one write(2), to the destination that QOR_LOG names.
// Keeps the open destination while the variable is unchanged, under one mutex. Any thread.
#include "platform/include/device_log.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <memory>
#include <mutex>
#include <new>
#include <string>
#include <string_view>

namespace {

// Where QOR_LOG pointed at the last message.
struct Destination {
    std::string name;
    int fd = -1;
    bool terminal = false;
};

// Never destroyed: messages may still come while the process ends.
std::mutex& destination_mutex() {
    static auto* const mutex = new std::mutex;
    return *mutex;
}
Destination& destination() {
    static auto* const current = new Destination;
    return *current;
}

// False for a file that was removed since it was opened.
bool is_still_there(int fd) {
    struct stat status {};
    return fstat(fd, &status) == 0 && status.st_nlink > 0;
}

// Makes the destination the one named. 0, or a negative errno value.
int open_destination(const char* name) {
    Destination& current = destination();
    if (current.fd >= 0 && current.name == name && is_still_there(current.fd)) {
        return 0;
    }
    if (current.fd > STDERR_FILENO) {
        static_cast<void>(close(current.fd));  // every line is already written
    }
    current.fd = -1;
    current.name = name;
    const bool is_stderr = std::strcmp(name, "stderr") == 0;
    const int fd =
        is_stderr ? STDERR_FILENO : open(name, O_WRONLY | O_APPEND | O_CREAT | O_CLOEXEC, 0644);
    if (fd < 0) {
        return -errno;
    }
    current.fd = fd;
    current.terminal = isatty(fd) == 1;
    return 0;
}

// Length of the colour sequence "ESC[...m" that the text begins with; 0 when it begins with none.
size_t colour_length(std::string_view text) {
    if (!text.starts_with("\033[")) {
        return 0;
    }
    const size_t end = text.find_first_not_of("0123456789;", 2);
    return end != std::string_view::npos && text[end] == 'm' ? end + 1 : 0;
}

// Appends the message as one line; colour only where it is wanted.
void append_message(std::string* line, std::string_view message, bool keep_colour) {
    while (!message.empty()) {
        const size_t colour = colour_length(message);
        if (colour > 0) {
            line->append(message.substr(0, keep_colour ? colour : 0));
            message.remove_prefix(colour);
            continue;
        }
        const char c = message.front();
        line->push_back(c == '\n' || c == '\r' ? ' ' : c);
        message.remove_prefix(1);
    }
    line->push_back('\n');
}

void append_prefix(std::string* line, int priority, const char* tag) {
    timespec now{};
    tm local{};
    static_cast<void>(clock_gettime(CLOCK_REALTIME, &now));  // cannot fail for this clock
    static_cast<void>(localtime_r(&now.tv_sec, &local));     // a null result leaves zeros
    std::array<char, 64> time{};
    const size_t length = std::strftime(time.data(), time.size(), "%F %T", &local);
    static_cast<void>(std::snprintf(time.data() + length, time.size() - length, ".%03ld ",
                                    now.tv_nsec / 1000000));
    const char letter = priority == DLOG_ERROR  ? 'E'
                        : priority == DLOG_WARN ? 'W'
                        : priority == DLOG_INFO ? 'I'
                                                : '?';
    line->append(time.data()).append(1, letter).append(" ").append(tag).append(": ");
}

int write_line(int priority, const char* tag, std::string_view message, const char* name) {
    const std::lock_guard lock(destination_mutex());
    const int rc = open_destination(name);
    if (rc != 0) {
        return rc;
    }
    std::string line;
    append_prefix(&line, priority, tag);
    append_message(&line, message, destination().terminal);
    ssize_t written = 0;
    do {
        written = write(destination().fd, line.data(), line.size());
    } while (written < 0 && errno == EINTR);
    if (written < 0) {
        return -errno;
    }
    return written == static_cast<ssize_t>(line.size()) ? 0 : -ENOSPC;
}

bool is_off(const char* name) {
    return name == nullptr || *name == '\0' || std::strcmp(name, "off") == 0;
}

}  // namespace

// One buffer serves every log id in development.
int __dlog_print(int /*log_id*/, int priority, const char* tag, const char* format, ...) {
    if (format == nullptr) {
        return -EINVAL;
    }
    char* text = nullptr;
    va_list arguments;
    va_start(arguments, format);
    const int length = vasprintf(&text, format, arguments);
    va_end(arguments);
    if (length < 0) {
        return -ENOMEM;
    }
    const std::unique_ptr<char, decltype(&std::free)> message(text, &std::free);
    const char* const name = std::getenv("QOR_LOG");
    if (is_off(name)) {
        return length;
    }
    try {
        const int rc = write_line(priority, tag == nullptr ? "" : tag, message.get(), name);
        return rc == 0 ? length : rc;
    } catch (const std::bad_alloc&) {
        return -ENOMEM;
    }
}
