// SPDX-License-Identifier: Apache-2.0
//
// Preloaded into a program: kills it at its n-th call of a function that changes a file, before the
// call is done. QOR_KILL_AT holds n; without it nothing happens.
#include <dlfcn.h>
#include <signal.h>
#include <sys/types.h>
#include <unistd.h>

#include <cstdlib>

namespace {

int remaining() {
    static int count = [] {
        const char* const text = std::getenv("QOR_KILL_AT");
        return text == nullptr ? 0 : std::atoi(text);
    }();
    return count == 0 ? 0 : count--;
}

void count_call() {
    if (remaining() == 1) {
        raise(SIGKILL);
    }
}

template <typename Function>
Function* next(const char* name) {
    return reinterpret_cast<Function*>(dlsym(RTLD_NEXT, name));
}

}  // namespace

// Standard output is no file of the device's.
extern "C" ssize_t write(int fd, const void* data, size_t size) {
    if (fd > STDERR_FILENO) {
        count_call();
    }
    return next<decltype(write)>("write")(fd, data, size);
}

#define QOR_COUNTED(result, name, parameters, arguments) \
    extern "C" result name parameters {                  \
        count_call();                                    \
        return next<result parameters>(#name) arguments; \
    }
QOR_COUNTED(ssize_t, pwrite, (int fd, const void* data, size_t size, off_t at),
            (fd, data, size, at))
QOR_COUNTED(ssize_t, pwrite64, (int fd, const void* data, size_t size, off64_t at),
            (fd, data, size, at))
QOR_COUNTED(int, fdatasync, (int fd), (fd))
QOR_COUNTED(int, fsync, (int fd), (fd))
QOR_COUNTED(int, ftruncate, (int fd, off_t size), (fd, size))
QOR_COUNTED(int, ftruncate64, (int fd, off64_t size), (fd, size))
QOR_COUNTED(int, unlink, (const char* path), (path))
