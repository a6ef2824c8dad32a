// SPDX-License-Identifier: Apache-2.0
// The drivers of the I/Q memory device and of the audio DSP's dump device, preloaded into
// the service's process: the C library's ioctl, mmap and read, for descriptors of these two
// nodes in the handset's root. Every other descriptor's calls go on to the C library. The
// devices have to be there when the process starts. Works from any thread; allocates
// nothing and keeps no descriptor.
#include <dlfcn.h>
#include <errno.h>
#include <fcntl.h>
#include <poll.h>
#include <stdarg.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <time.h>
#include <unistd.h>

#include <algorithm>

#include "sim/calls.h"
#include "sim/device_control.h"

namespace {

IqControl* s_iq = nullptr;
DspControl* s_dsp = nullptr;
const uint8_t* s_dsp_memory = nullptr;
char s_iq_memory_path[4096];

template <typename Function>
Function next_symbol(const char* name) {
    return reinterpret_cast<Function>(dlsym(RTLD_NEXT, name));
}

int real_ioctl(int fd, unsigned long request, void* arg) {
    static const auto function = next_symbol<int (*)(int, unsigned long, ...)>(IOCTL_CALL("ioctl"));
    return function(fd, request, arg);
}

void* real_mmap(void* addr, size_t len, int prot, int flags, int fd, off_t offset) {
    static const auto function =
        next_symbol<void* (*)(void*, size_t, int, int, int, off_t)>(FILE_CALL("mmap"));
    return function(addr, len, prot, flags, fd, offset);
}

ssize_t real_read(int fd, void* buf, size_t len) {
    static const auto function = next_symbol<ssize_t (*)(int, void*, size_t)>("read");
    return function(fd, buf, len);
}

// The file of the root, mapped; null if there is none.
void* map_file(const char* root, const char* rel, size_t size, int prot) {
    char path[4096];
    snprintf(path, sizeof path, "%s/%s", root, rel);
    const int fd = open(path, (prot & PROT_WRITE ? O_RDWR : O_RDONLY) | O_CLOEXEC);
    if (fd < 0) {
        return nullptr;
    }
    void* data = real_mmap(nullptr, size, prot, MAP_SHARED, fd, 0);
    close(fd);
    return data == MAP_FAILED ? nullptr : data;
}

__attribute__((constructor)) void find_devices() {
    const char* root = getenv("KESTMODEM_ROOT");
    if (!root || !*root) {
        return;
    }
    const int prot = PROT_READ | PROT_WRITE;
    snprintf(s_iq_memory_path, sizeof s_iq_memory_path, "%s/%s", root, IQ_MEMORY);
    s_iq = static_cast<IqControl*>(map_file(root, IQ_CONTROL, sizeof(IqControl), prot));
    s_dsp_memory =
        static_cast<const uint8_t*>(map_file(root, DSP_MEMORY, DSP_MEMORY_SIZE, PROT_READ));
    if (s_dsp_memory) {
        s_dsp = static_cast<DspControl*>(map_file(root, DSP_CONTROL, sizeof(DspControl), prot));
    }
}

// Leaves errno alone.
template <typename Control>
bool belongs_to(int fd, const Control* control) {
    const int saved_errno = errno;
    struct stat st;
    const bool same = control && fd >= 0 && fstat(fd, &st) == 0 && st.st_dev == control->node.dev &&
                      st.st_ino == control->node.ino;
    errno = saved_errno;
    return same;
}

int fail(int error, std::atomic<uint32_t>& wrong) {
    ++wrong;
    errno = error;
    return -1;
}

int64_t now_ns() {
    timespec now;
    clock_gettime(CLOCK_MONOTONIC, &now);
    return now.tv_sec * 1000000000LL + now.tv_nsec;
}

// Takes the byte that makes the device readable.
void take_ready_byte(int fd) {
    const int saved_errno = errno;
    pollfd ready = {fd, POLLIN, 0};
    char byte;
    if (poll(&ready, 1, 0) == 1 && (ready.revents & POLLIN) != 0) {
        while (real_read(fd, &byte, 1) < 0 && errno == EINTR) {
        }
    }
    errno = saved_errno;
}

int iq_ioctl(int fd, unsigned long request, void* arg) {
    switch (request) {
        case IQ_REQUEST_CHANNEL:
            s_iq->in_use = static_cast<uint32_t>(reinterpret_cast<uintptr_t>(arg));
            return 0;
        case IQ_REQUEST_BUFFER:
            if (s_iq->filled == 0) {
                return fail(EAGAIN, s_iq->wrong);
            }
            s_iq->taken_ns = now_ns();
            memcpy(arg, &s_iq->buffer, sizeof s_iq->buffer);
            return 0;
        case IQ_REQUEST_RELEASE:
            // Without a buffer (capture resumes after a pause) there is nothing to do.
            if (s_iq->filled != 0) {
                s_iq->released_ns = now_ns();
                take_ready_byte(fd);
                s_iq->filled = 0;
                ++s_iq->released;
            }
            return 0;
        default:
            return fail(ENOTTY, s_iq->wrong);
    }
}

int dsp_ioctl(int fd, unsigned long request) {
    if (request != DSP_REQUEST_DONE) {
        return fail(ENOTTY, s_dsp->wrong);
    }
    if (s_dsp->size == 0) {
        return fail(EINVAL, s_dsp->wrong);
    }
    take_ready_byte(fd);
    s_dsp->unread = s_dsp->size - s_dsp->position;
    s_dsp->size = 0;
    s_dsp->position = 0;
    ++s_dsp->completed;
    return 0;
}

// The next bytes of the dump; 0 at its end.
ssize_t dsp_read(void* buf, size_t len) {
    const uint32_t position = s_dsp->position;
    const uint32_t size = s_dsp->size;
    const size_t n = position < size ? std::min(len, static_cast<size_t>(size - position)) : 0;
    memcpy(buf, s_dsp_memory + position, n);
    s_dsp->position = position + static_cast<uint32_t>(n);
    return static_cast<ssize_t>(n);
}

void* device_mmap(void* addr, size_t len, int prot, int flags, int fd, off_t offset) {
    if ((flags & MAP_ANONYMOUS) != 0 || !belongs_to(fd, s_iq)) {
        return real_mmap(addr, len, prot, flags, fd, offset);
    }
    const int memory = open(s_iq_memory_path, O_RDONLY | O_CLOEXEC);
    if (memory < 0) {
        return MAP_FAILED;
    }
    void* data = real_mmap(addr, len, prot, flags, memory, offset);
    const int saved_errno = errno;
    close(memory);
    errno = saved_errno;
    return data;
}

}  // namespace

extern "C" {

int ioctl(int fd, unsigned long request, ...) noexcept {
    va_list args;
    va_start(args, request);
    void* arg = va_arg(args, void*);
    va_end(args);
    if (belongs_to(fd, s_iq)) {
        return iq_ioctl(fd, request, arg);
    }
    if (belongs_to(fd, s_dsp)) {
        return dsp_ioctl(fd, request);
    }
    return real_ioctl(fd, request, arg);
}

void* mmap(void* addr, size_t len, int prot, int flags, int fd, off_t offset) noexcept {
    return device_mmap(addr, len, prot, flags, fd, offset);
}

#ifndef __USE_FILE_OFFSET64  // where it is asked for, mmap has this name already
void* mmap64(void* addr, size_t len, int prot, int flags, int fd, off64_t offset) noexcept {
    return device_mmap(addr, len, prot, flags, fd, static_cast<off_t>(offset));
}
#endif

ssize_t read(int fd, void* buf, size_t len) {
    return belongs_to(fd, s_dsp) ? dsp_read(buf, len) : real_read(fd, buf, len);
}

// What a hardened build calls in place of read.
ssize_t __read_chk(int fd, void* buf, size_t len, size_t /*size*/) {
    return read(fd, buf, len);
}

}  // extern "C"
