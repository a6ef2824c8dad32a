// SPDX-License-Identifier: Apache-2.0

#include "support/faults.h"

#include <errno.h>
#include <string.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>

namespace {

struct Fault {
    std::atomic<int> calls{0};  // the only thing that other threads change
    int from = 0;               // first failing call, counted like calls; 0: none
    int last = 0;
    int error = 0;
    bool hit = false;
    bool cut = false;
    size_t max = 0;
};

Fault s_faults[faults::NUM_CALLS];
time_t s_time;
std::string s_part = "/modem_log";

enum { REAL, FROZEN, FAILING } s_boot_clock = REAL;
timespec s_boot_time = {1000, 999999999};

bool counts(int fd) {
    return fd > STDERR_FILENO;
}
bool counts(const char* path) {
    return strstr(path, s_part.c_str()) != nullptr;
}
template <typename T>
bool counts(T /*first*/) {
    return true;
}

// Counts a call; true when it has to fail, with errno set.
template <typename First, typename... Rest>
bool fails(faults::Call call, First first, Rest... /*rest*/) {
    if (!counts(first)) {
        return false;
    }
    Fault& fault = s_faults[call];
    // Without an order, which would put the threads of the program in one.
    const int number = fault.calls.fetch_add(1, std::memory_order_relaxed) + 1;
    if (fault.from == 0 || number < fault.from || number > fault.last) {
        return false;
    }
    fault.hit = true;
    errno = fault.error;
    return true;
}

// The bytes of a transfer that are left when it is to be short.
size_t limit(faults::Call call, size_t len) {
    Fault& fault = s_faults[call];
    return fault.cut ? (fault.cut = false, std::min(len, fault.max)) : len;
}

// What the special calls do when they do not fail.
namespace special {

ssize_t write(int fd, const void* data, size_t len) {
    return real::write(fd, data, fd > STDERR_FILENO ? limit(faults::WRITE, len) : len);
}

ssize_t writev(int fd, const iovec* pieces, int num) {
    std::string all;
    for (int i = 0; i < num; ++i) {
        all.append(static_cast<const char*>(pieces[i].iov_base), pieces[i].iov_len);
    }
    const size_t len = limit(faults::WRITEV, all.size());
    return len < all.size() ? real::write(fd, all.data(), len) : real::writev(fd, pieces, num);
}

time_t time(time_t* result) {
    const time_t now = s_time ? s_time : real::time(nullptr);
    return result ? *result = now : now;
}

int clock_gettime(clockid_t id, timespec* now) {
    if (id != CLOCK_BOOTTIME || s_boot_clock == REAL) {
        return real::clock_gettime(id, now);
    }
    *now = s_boot_time;
    errno = EINVAL;
    return s_boot_clock == FROZEN ? 0 : -1;
}

}  // namespace special

}  // namespace

namespace faults {

Instead instead;

void reset() {
    for (Fault& fault : s_faults) {
        fault.calls = 0;
        fault.from = 0;
        fault.hit = fault.cut = false;
    }
    s_time = 0;
    s_part = "/modem_log";
}

void fail(Call call, int nth, int error, int times) {
    Fault& fault = s_faults[call];
    fault.from = fault.calls + nth;
    fault.last = times == FOREVER ? FOREVER : fault.from + times - 1;
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

std::string path_of(int fd) {
    char path[500] = "";
    const ssize_t len = readlink(("/proc/self/fd/" + std::to_string(fd)).c_str(), path, 499);
    return len > 0 ? path : "";
}

void set_time(time_t now) {
    s_time = now;
}

}  // namespace faults

namespace boot_clock {

void real() {
    s_boot_clock = REAL;
}

void freeze() {
    s_boot_clock = FROZEN;
}

void advance(unsigned int ms) {
    const long ns = s_boot_time.tv_nsec + static_cast<long>(ms % 1000) * 1000000;
    s_boot_time.tv_sec += static_cast<time_t>(ms / 1000) + ns / 1000000000;
    s_boot_time.tv_nsec = ns % 1000000000;
}

void fail() {
    s_boot_clock = FAILING;
}

}  // namespace boot_clock

#define WRAP(usual, NAME, name, kind, result, params, args)                         \
    extern "C" result __wrap_##name params __asm__("__wrap_" kind(#name));          \
    extern "C" result __wrap_##name params {                                        \
        if (fails(faults::NAME, ARGUMENTS args)) {                                  \
            return faults::failure<result>();                                       \
        }                                                                           \
        return faults::instead.name ? faults::instead.name args : usual::name args; \
    }
#define ARGUMENTS(...) __VA_ARGS__
#define PLAIN(NAME, name, kind, result, params, args) \
    WRAP(real, NAME, name, kind, result, params, args)
#define SPECIAL(NAME, name, kind, result, params, args) \
    WRAP(special, NAME, name, kind, result, params, args)
KEST_CALLS(PLAIN, SPECIAL)
