// SPDX-License-Identifier: Apache-2.0
//
// Preloaded into a program: kills it at its n-th call of a function that changes a file, before the
// call is done. QOR_KILL_AT holds n; without it nothing happens.
#include <dlfcn.h>
#include <sys/types.h>
#include <unistd.h>

#include <csignal>
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

extern "C" ssize_t pwrite(int fd, const void* data, size_t size, off_t at) {
    count_call();
    return next<decltype(pwrite)>("pwrite")(fd, data, size, at);
}

extern "C" ssize_t pwrite64(int fd, const void* data, size_t size, off64_t at) {
    count_call();
    return next<decltype(pwrite64)>("pwrite64")(fd, data, size, at);
}

extern "C" int fdatasync(int fd) {
    count_call();
    return next<decltype(fdatasync)>("fdatasync")(fd);
}

extern "C" int fsync(int fd) {
    count_call();
    return next<decltype(fsync)>("fsync")(fd);
}

extern "C" int ftruncate(int fd, off_t size) noexcept {
    count_call();
    return next<int(int, off_t)>("ftruncate")(fd, size);
}

extern "C" int ftruncate64(int fd, off64_t size) noexcept {
    count_call();
    return next<int(int, off64_t)>("ftruncate64")(fd, size);
}

extern "C" int unlink(const char* path) noexcept {
    count_call();
    return next<int(const char*)>("unlink")(path);
}
