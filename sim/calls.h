// SPDX-License-Identifier: Apache-2.0
// The calls of the C library that can be made to fail: in a test program, which is linked so
// that they come to faults.cpp first, and in the real program, by a preloaded library.
#ifndef SIM_CALLS_H_
#define SIM_CALLS_H_

#include <dirent.h>
#include <poll.h>
#include <pthread.h>
#include <stddef.h>
#include <stdio.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/uio.h>
#include <time.h>

#include <type_traits>

// The C library's symbol of a call. Where off_t or time_t would have 32 bits and was asked to have
// 64, its headers give some calls another one. Nothing else knows these names.
#define PLAIN_CALL(name) name
#if defined(__USE_TIME_BITS64) && __TIMESIZE == 32
#define FILE_CALL(name) name "64"
#define STAT_CALL(name) "__" name "64_time64"
#define FCNTL_CALL(name) "__" name "_time64"
#define IOCTL_CALL(name) "__" name "_time64"
#define TIME_CALL(name) "__" name "64"
#elif defined(__USE_FILE_OFFSET64)
#define FILE_CALL(name) name "64"
#define STAT_CALL(name) name "64"
#define FCNTL_CALL(name) name "64"
#define IOCTL_CALL(name) name
#define TIME_CALL(name) name
#else
#define FILE_CALL(name) name
#define STAT_CALL(name) name
#define FCNTL_CALL(name) name
#define IOCTL_CALL(name) name
#define TIME_CALL(name) name
#endif

// The only list of these calls, which tests/CMakeLists.txt has preprocessed. The mode of an open
// and the argument of an ioctl are passed on whether they were given or not. SPECIAL calls have
// more to them than that they are counted and fail.
// clang-format off
#define KEST_CALLS(X, SPECIAL) \
    SPECIAL(WRITE, write, PLAIN_CALL, ssize_t, (int fd, const void* data, size_t len), (fd, data, len)) \
    SPECIAL(WRITEV, writev, PLAIN_CALL, ssize_t, (int fd, const iovec* pieces, int num), (fd, pieces, num)) \
    X(OPEN, open, FILE_CALL, int, (const char* path, int flags, mode_t mode), (path, flags, mode)) \
    X(MKDIR, mkdir, PLAIN_CALL, int, (const char* path, mode_t mode), (path, mode)) \
    X(RENAME, rename, PLAIN_CALL, int, (const char* from, const char* to), (from, to)) \
    X(UNLINK, unlink, PLAIN_CALL, int, (const char* path), (path)) \
    X(ACCESS, access, PLAIN_CALL, int, (const char* path, int mode), (path, mode)) \
    X(ACCEPT4, accept4, PLAIN_CALL, int, (int fd, sockaddr* addr, socklen_t* len, int flags), (fd, addr, len, flags)) \
    X(BIND, bind, PLAIN_CALL, int, (int fd, const sockaddr* addr, socklen_t len), (fd, addr, len)) \
    X(CLOSE, close, PLAIN_CALL, int, (int fd), (fd)) \
    X(CONNECT, connect, PLAIN_CALL, int, (int fd, const sockaddr* addr, socklen_t len), (fd, addr, len)) \
    X(FCNTL, fcntl, FCNTL_CALL, int, (int fd, int cmd, unsigned long arg), (fd, cmd, arg)) \
    X(FDOPEN, fdopen, PLAIN_CALL, FILE*, (int fd, const char* mode), (fd, mode)) \
    X(FSTAT, fstat, STAT_CALL, int, (int fd, struct stat* st), (fd, st)) \
    X(FSTATAT, fstatat, STAT_CALL, int, (int dir, const char* path, struct stat* st, int flags), (dir, path, st, flags)) \
    X(FTRUNCATE, ftruncate, FILE_CALL, int, (int fd, off_t len), (fd, len)) \
    X(IOCTL, ioctl, IOCTL_CALL, int, (int fd, unsigned long cmd, unsigned long arg), (fd, cmd, arg)) \
    X(LISTEN, listen, PLAIN_CALL, int, (int fd, int num), (fd, num)) \
    X(LSEEK, lseek, FILE_CALL, off_t, (int fd, off_t at, int from), (fd, at, from)) \
    X(LSTAT, lstat, STAT_CALL, int, (const char* path, struct stat* st), (path, st)) \
    X(MMAP, mmap, FILE_CALL, void*, (void* at, size_t len, int prot, int flags, int fd, off_t from), (at, len, prot, flags, fd, from)) \
    X(MUNMAP, munmap, PLAIN_CALL, int, (void* at, size_t len), (at, len)) \
    X(OPENDIR, opendir, PLAIN_CALL, DIR*, (const char* path), (path)) \
    X(POLL, poll, PLAIN_CALL, int, (pollfd* fds, nfds_t num, int timeout), (fds, num, timeout)) \
    X(PTHREAD_CREATE, pthread_create, PLAIN_CALL, int, (pthread_t* thread, const pthread_attr_t* attr, void* (*run)(void*), void* arg), (thread, attr, run, arg)) \
    X(PWRITE, pwrite, FILE_CALL, ssize_t, (int fd, const void* data, size_t len, off_t at), (fd, data, len, at)) \
    X(READ, read, PLAIN_CALL, ssize_t, (int fd, void* data, size_t len), (fd, data, len)) \
    X(READDIR, readdir, FILE_CALL, dirent*, (DIR* dir), (dir)) \
    X(RMDIR, rmdir, PLAIN_CALL, int, (const char* path), (path)) \
    X(SOCKET, socket, PLAIN_CALL, int, (int domain, int type, int protocol), (domain, type, protocol)) \
    X(SOCKETPAIR, socketpair, PLAIN_CALL, int, (int domain, int type, int protocol, int* pair), (domain, type, protocol, pair)) \
    X(STAT, stat, STAT_CALL, int, (const char* path, struct stat* st), (path, st)) \
    X(USLEEP, usleep, PLAIN_CALL, int, (useconds_t us), (us)) \
    X(SYSTEM, system, PLAIN_CALL, int, (const char* command), (command)) \
    SPECIAL(TIME, time, TIME_CALL, time_t, (time_t* result), (result)) \
    SPECIAL(CLOCK_GETTIME, clock_gettime, TIME_CALL, int, (clockid_t id, timespec* now), (id, now))
// clang-format on

namespace faults {

#define NAME_OF(NAME, name, kind, result, params, args) NAME,
enum Call { KEST_CALLS(NAME_OF, NAME_OF) NUM_CALLS };
#undef NAME_OF

// What a call gives that has failed; errno tells more.
template <typename Result>
Result failure() {
    if constexpr (std::is_same_v<Result, void*>) {
        return reinterpret_cast<Result>(-1);  // mmap
    } else if constexpr (std::is_pointer_v<Result>) {
        return nullptr;
    } else {
        return static_cast<Result>(-1);
    }
}

}  // namespace faults

#endif  // SIM_CALLS_H_
