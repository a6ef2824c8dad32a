// SPDX-License-Identifier: Apache-2.0

#include "support/faults.h"

#include <errno.h>
#include <fcntl.h>
#include <stdarg.h>
#include <string.h>
#include <sys/stat.h>
#include <sys/uio.h>
#include <unistd.h>

#include <algorithm>

namespace {

struct Fault {
    int calls = 0;
    int from = 0;  // first failing call, counted like calls; 0: none
    int until = 0;
    int error = 0;
    bool hit = false;
    bool cut = false;
    size_t max = 0;
};

Fault s_faults[faults::NUM_CALLS];
time_t s_time;
std::string s_part;
std::vector<std::string> s_commands;

// Counts a call; true when it has to fail, with errno set.
bool fails(faults::Call call) {
    Fault& fault = s_faults[call];
    ++fault.calls;
    if (fault.from == 0 || fault.calls < fault.from || fault.calls >= fault.until) {
        return false;
    }
    fault.hit = true;
    errno = fault.error;
    return true;
}

bool fails(faults::Call call, const char* path) {
    return strstr(path, s_part.c_str()) && fails(call);
}

// The bytes of a transfer that are left when it is to be short.
size_t limit(faults::Call call, size_t len) {
    Fault& fault = s_faults[call];
    return fault.cut ? (fault.cut = false, std::min(len, fault.max)) : len;
}

}  // namespace

namespace faults {

void reset() {
    std::fill(s_faults, s_faults + NUM_CALLS, Fault());
    s_time = 0;
    s_part = "/modem_log";
    s_commands.clear();
}

void fail(Call call, int nth, int error, int times) {
    Fault& fault = s_faults[call];
    fault.from = fault.calls + nth;
    fault.until = fault.from + times;
    fault.error = error;
    fault.hit = false;
}

void only_on(const char* part) {
    s_part = part;
}

void shorten(Call call, size_t max) {
    s_faults[call].cut = true;
    s_faults[call].max = max;
}

int calls(Call call) {
    return s_faults[call].calls;
}

bool hit(Call call) {
    return s_faults[call].hit;
}

void set_time(time_t now) {
    s_time = now;
}

const std::vector<std::string>& commands() {
    return s_commands;
}

}  // namespace faults

extern "C" {

ssize_t __real_write(int fd, const void* data, size_t len);
ssize_t __real_writev(int fd, const struct iovec* pieces, int num);
int __real_open(const char* path, int flags, ...);
int __real_mkdir(const char* path, mode_t mode);
int __real_rename(const char* from, const char* to);
int __real_unlink(const char* path);
int __real_access(const char* path, int mode);
int __real_system(const char* command);
time_t __real_time(time_t* result);

ssize_t __wrap_write(int fd, const void* data, size_t len) {
    if (fd <= STDERR_FILENO) {
        return __real_write(fd, data, len);
    }
    return fails(faults::WRITE) ? -1 : __real_write(fd, data, limit(faults::WRITE, len));
}

ssize_t __wrap_writev(int fd, const struct iovec* pieces, int num) {
    if (fails(faults::WRITEV)) {
        return -1;
    }
    std::string all;
    for (int i = 0; i < num; ++i) {
        all.append(static_cast<const char*>(pieces[i].iov_base), pieces[i].iov_len);
    }
    const size_t len = limit(faults::WRITEV, all.size());
    return len < all.size() ? __real_write(fd, all.data(), len) : __real_writev(fd, pieces, num);
}

int __wrap_open(const char* path, int flags, ...) {
    va_list args;
    va_start(args, flags);
    const mode_t mode = flags & O_CREAT ? va_arg(args, mode_t) : 0;
    va_end(args);
    return fails(faults::OPEN, path) ? -1 : __real_open(path, flags, mode);
}

// The name of open where off_t was asked to have 64 bits.
int __wrap_open64(const char* path, int flags, ...) __attribute__((alias("__wrap_open")));

int __wrap_mkdir(const char* path, mode_t mode) {
    return fails(faults::MKDIR, path) ? -1 : __real_mkdir(path, mode);
}

int __wrap_rename(const char* from, const char* to) {
    return fails(faults::RENAME, from) ? -1 : __real_rename(from, to);
}

int __wrap_unlink(const char* path) {
    return fails(faults::UNLINK, path) ? -1 : __real_unlink(path);
}

int __wrap_access(const char* path, int mode) {
    return fails(faults::ACCESS, path) ? -1 : __real_access(path, mode);
}

int __wrap_system(const char* command) {
    s_commands.push_back(command);
    return __real_system(command);
}

time_t __wrap_time(time_t* result) {
    if (s_time == 0) {
        return __real_time(result);
    }
    if (result) {
        *result = s_time;
    }
    return s_time;
}
}
