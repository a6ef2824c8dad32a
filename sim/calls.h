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
    X(BIND, bind, "", int, (int fd, const sockaddr* addr, socklen_t len), (fd, addr, len)) \
    X(CLOSE, close, "", int, (int fd), (fd)) \
    X(CONNECT, connect, "", int, (int fd, const sockaddr* addr, socklen_t len), (fd, addr, len)) \
    X(FCNTL, fcntl, OFF_T, int, (int fd, int cmd, unsigned long arg), (fd, cmd, arg)) \
    X(FDOPEN, fdopen, "", FILE*, (int fd, const char* mode), (fd, mode)) \
    X(FSTAT, fstat, OFF_T, int, (int fd, struct stat* st), (fd, st)) \
    X(FSTATAT, fstatat, OFF_T, int, (int dir, const char* path, struct stat* st, int flags), (dir, path, st, flags)) \
    X(FTRUNCATE, ftruncate, OFF_T, int, (int fd, off_t len), (fd, len)) \
    X(IOCTL, ioctl, "", int, (int fd, unsigned long cmd, unsigned long arg), (fd, cmd, arg)) \
    X(LISTEN, listen, "", int, (int fd, int num), (fd, num)) \
    X(LSEEK, lseek, OFF_T, off_t, (int fd, off_t at, int from), (fd, at, from)) \
    X(LSTAT, lstat, OFF_T, int, (const char* path, struct stat* st), (path, st)) \
    X(MMAP, mmap, OFF_T, void*, (void* at, size_t len, int prot, int flags, int fd, off_t from), (at, len, prot, flags, fd, from)) \
    X(MUNMAP, munmap, "", int, (void* at, size_t len), (at, len)) \
    X(OPENDIR, opendir, "", DIR*, (const char* path), (path)) \
    X(POLL, poll, "", int, (pollfd* fds, nfds_t num, int timeout), (fds, num, timeout)) \
    X(PTHREAD_CREATE, pthread_create, "", int, (pthread_t* thread, const pthread_attr_t* attr, void* (*run)(void*), void* arg), (thread, attr, run, arg)) \
    X(PWRITE, pwrite, OFF_T, ssize_t, (int fd, const void* data, size_t len, off_t at), (fd, data, len, at)) \
    X(READ, read, "", ssize_t, (int fd, void* data, size_t len), (fd, data, len)) \
    X(READDIR, readdir, OFF_T, dirent*, (DIR* dir), (dir)) \
    X(RMDIR, rmdir, "", int, (const char* path), (path)) \
    X(SOCKET, socket, "", int, (int domain, int type, int protocol), (domain, type, protocol)) \
    X(SOCKETPAIR, socketpair, "", int, (int domain, int type, int protocol, int* pair), (domain, type, protocol, pair)) \
    X(STAT, stat, OFF_T, int, (const char* path, struct stat* st), (path, st)) \
    X(USLEEP, usleep, "", int, (useconds_t us), (us)) \
    X(SYSTEM, system, "", int, (const char* command), (command)) \
    SPECIAL(TIME, time, "", time_t, (time_t* result), (result)) \
    SPECIAL(CLOCK_GETTIME, clock_gettime, "", int, (clockid_t id, timespec* now), (id, now))
// clang-format on

namespace faults {

#define NAME_OF(NAME, name, bits, result, params, args) NAME,
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
