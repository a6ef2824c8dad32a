// SPDX-License-Identifier: Apache-2.0
// The faults that can be preloaded into the service: calls with the errors that they have on a
// handset.
#ifndef SIM_FAULT_KINDS_H_
#define SIM_FAULT_KINDS_H_

#include <errno.h>

#include "sim/FaultPlan.h"

struct FaultKind {
    const char* name;
    faults::Call call;
    int error;  // errno, or CUT_SHORT
};

constexpr FaultKind FAULT_KINDS[] = {
    {"open", faults::OPEN, EMFILE},
    {"open-full", faults::OPEN, ENOSPC},
    {"open-gone", faults::OPEN, ENOENT},
    {"read", faults::READ, EIO},
    {"read-short", faults::READ, CUT_SHORT},
    {"read-interrupted", faults::READ, EINTR},
    {"read-again", faults::READ, EAGAIN},
    {"write", faults::WRITE, ENOSPC},
    {"write-short", faults::WRITE, CUT_SHORT},
    {"write-interrupted", faults::WRITE, EINTR},
    {"writev", faults::WRITEV, ENOSPC},
    {"writev-short", faults::WRITEV, CUT_SHORT},
    {"writev-broken", faults::WRITEV, EIO},
    {"pwrite", faults::PWRITE, ENOSPC},
    {"ftruncate", faults::FTRUNCATE, EIO},
    {"lseek", faults::LSEEK, EIO},
    {"close", faults::CLOSE, EIO},
    {"rename", faults::RENAME, EIO},
    {"unlink", faults::UNLINK, EROFS},
    {"mkdir", faults::MKDIR, ENOSPC},
    {"rmdir", faults::RMDIR, EROFS},
    {"opendir", faults::OPENDIR, EMFILE},
    {"readdir", faults::READDIR, EIO},
    {"stat", faults::STAT, EACCES},
    {"lstat", faults::LSTAT, EIO},
    {"fstat", faults::FSTAT, EIO},
    {"fstatat", faults::FSTATAT, EIO},
    {"access", faults::ACCESS, EIO},
    {"fcntl", faults::FCNTL, EBADF},
    {"fdopen", faults::FDOPEN, ENOMEM},
    {"socket", faults::SOCKET, EMFILE},
    {"socketpair", faults::SOCKETPAIR, ENFILE},
    {"bind", faults::BIND, EADDRINUSE},
    {"listen", faults::LISTEN, EADDRINUSE},
    {"accept", faults::ACCEPT4, EMFILE},
    {"accept-aborted", faults::ACCEPT4, ECONNABORTED},
    {"connect", faults::CONNECT, ECONNREFUSED},
    {"connect-again", faults::CONNECT, EAGAIN},
    {"poll", faults::POLL, ENOMEM},
    {"poll-interrupted", faults::POLL, EINTR},
    {"pthread_create", faults::PTHREAD_CREATE, EAGAIN},
    {"mmap", faults::MMAP, ENOMEM},
    {"munmap", faults::MUNMAP, EINVAL},
    {"ioctl", faults::IOCTL, EIO},
    {"system", faults::SYSTEM, ENOMEM},
    {"usleep", faults::USLEEP, EINTR},
    {"time", faults::TIME, EFAULT},
    {"clock_gettime", faults::CLOCK_GETTIME, EINVAL},
};

#endif  // SIM_FAULT_KINDS_H_
