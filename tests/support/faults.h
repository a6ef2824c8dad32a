// SPDX-License-Identifier: Apache-2.0
// The C library as the tests see it. Every test program is linked so that the calls listed
// here come to faults.cpp first: the Nth call can be made to fail or to transfer less, calls
// are counted, and a test can put a function of its own in the place of one.
#ifndef TESTS_SUPPORT_FAULTS_H_
#define TESTS_SUPPORT_FAULTS_H_

#include <poll.h>
#include <pthread.h>
#include <stddef.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/uio.h>
#include <time.h>

#include <functional>
#include <limits>
#include <string>
#include <vector>

// The other name of a call with an off_t, where that was asked to have 64 bits.
#ifdef _FILE_OFFSET_BITS
#define OFF_T "64"
#else
#define OFF_T ""
#endif

// The only list of these calls; tests/CMakeLists.txt reads it. The mode of an open and the
// argument of an ioctl are passed on whether they were given or not. SPECIAL calls have more
// to them than that they are counted and fail.
// clang-format off
#define KEST_CALLS(X, SPECIAL) \
    SPECIAL(WRITE, write, "", ssize_t, (int fd, const void* data, size_t len), (fd, data, len)) \
    SPECIAL(WRITEV, writev, "", ssize_t, (int fd, const iovec* pieces, int num), (fd, pieces, num)) \
    X(OPEN, open, OFF_T, int, (const char* path, int flags, mode_t mode), (path, flags, mode)) \
    X(MKDIR, mkdir, "", int, (const char* path, mode_t mode), (path, mode)) \
    X(RENAME, rename, "", int, (const char* from, const char* to), (from, to)) \
    X(UNLINK, unlink, "", int, (const char* path), (path)) \
    X(ACCESS, access, "", int, (const char* path, int mode), (path, mode)) \
    X(ACCEPT4, accept4, "", int, (int fd, sockaddr* addr, socklen_t* len, int flags), (fd, addr, len, flags)) \
    X(CLOSE, close, "", int, (int fd), (fd)) \
    X(CONNECT, connect, "", int, (int fd, const sockaddr* addr, socklen_t len), (fd, addr, len)) \
    X(FSTAT, fstat, OFF_T, int, (int fd, struct stat* st), (fd, st)) \
    X(FTRUNCATE, ftruncate, OFF_T, int, (int fd, off_t len), (fd, len)) \
    X(IOCTL, ioctl, "", int, (int fd, unsigned long cmd, unsigned long arg), (fd, cmd, arg)) \
    X(MMAP, mmap, OFF_T, void*, (void* at, size_t len, int prot, int flags, int fd, off_t from), (at, len, prot, flags, fd, from)) \
    X(MUNMAP, munmap, "", int, (void* at, size_t len), (at, len)) \
    X(POLL, poll, "", int, (pollfd* fds, nfds_t num, int timeout), (fds, num, timeout)) \
    X(PTHREAD_CREATE, pthread_create, "", int, (pthread_t* thread, const pthread_attr_t* attr, void* (*run)(void*), void* arg), (thread, attr, run, arg)) \
    X(PWRITE, pwrite, OFF_T, ssize_t, (int fd, const void* data, size_t len, off_t at), (fd, data, len, at)) \
    X(READ, read, "", ssize_t, (int fd, void* data, size_t len), (fd, data, len)) \
    X(SOCKETPAIR, socketpair, "", int, (int domain, int type, int protocol, int* pair), (domain, type, protocol, pair)) \
    X(STAT, stat, OFF_T, int, (const char* path, struct stat* st), (path, st)) \
    X(USLEEP, usleep, "", int, (useconds_t us), (us)) \
    SPECIAL(SYSTEM, system, "", int, (const char* command), (command)) \
    SPECIAL(TIME, time, "", time_t, (time_t* result), (result)) \
    SPECIAL(CLOCK_GETTIME, clock_gettime, "", int, (clockid_t id, timespec* now), (id, now))
// clang-format on

// The C library's own.
namespace real {
#define DECLARE(NAME, name, bits, result, params, args) \
    result name params __asm__("__real_" #name bits);
KEST_CALLS(DECLARE, DECLARE)
#undef DECLARE
}  // namespace real

namespace faults {

#define NAME_OF(NAME, name, bits, result, params, args) NAME,
enum Call { KEST_CALLS(NAME_OF, NAME_OF) NUM_CALLS };
#undef NAME_OF

constexpr int FOREVER = std::numeric_limits<int>::max();

// Everything works again, all counters are 0, time() is the real one.
void reset();
// The nth call from now on (1: the next one) and the times - 1 after it fail with error.
void fail(Call call, int nth, int error, int times = 1);
// Only calls on paths with this part in them count from now on; "/modem_log" after a reset.
// Of calls on descriptors those above standard error count.
void only_on(const char* part);
// The next call of write or writev transfers at most max bytes.
void shorten(Call call, size_t max);
// Calls of the kind since the last reset.
int calls(Call call);
// Whether the failure asked for last has happened.
bool hit(Call call);
// What time() returns from now on; 0: the real time; -1: it fails.
void set_time(time_t now);
// The commands given to system() since the last reset; they are really run.
const std::vector<std::string>& commands();

// Functions of the test's that run instead, as long as they are set.
struct Instead {
#define MEMBER(NAME, name, bits, result, params, args) std::function<result params> name;
    KEST_CALLS(MEMBER, MEMBER)
#undef MEMBER
};
extern Instead instead;

}  // namespace faults

// The clock of the timers, CLOCK_BOOTTIME: moved by hand, so that time-outs of seconds pass
// at once. Every other clock stays real.
namespace boot_clock {

// Runs with the real time, the state at first.
void real();
// Stands still, at a time just before a full second.
void freeze();
// Moves the standing clock on.
void advance(unsigned int ms);
// Cannot be read: EINVAL.
void fail();

}  // namespace boot_clock

#endif  // TESTS_SUPPORT_FAULTS_H_
