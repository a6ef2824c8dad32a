// SPDX-License-Identifier: Apache-2.0

#include "bench/feeding.h"

#include <errno.h>
#include <fcntl.h>
#include <sched.h>
#include <signal.h>
#include <sys/ioctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <vector>

#include "bench/common.h"

int open_writer(const std::string& fifo, ChildProcess& reader) {
    for (int waited = 0; waited < START_TIMEOUT_MS && reader.alive(); ++waited) {
        const int fd = open(fifo.c_str(), O_WRONLY | O_NONBLOCK | O_CLOEXEC);
        if (fd >= 0) {
            fcntl(fd, F_SETFL, 0);
            return fd;
        }
        sleep_ms(1);
    }
    fail("no reader of", fifo);
    return -1;
}

void wait_idle(const ChildProcess& program, int ms) {
    for (std::string state; state != program.run_state();) {
        state = program.run_state();
        sleep_ms(ms);
    }
}

bool end(ChildProcess& program) {
    program.signal(SIGKILL);
    return program.wait() && WIFSIGNALED(program.status()) && WTERMSIG(program.status()) == SIGKILL;
}

bool write_all(int fd, const uint8_t* data, size_t len) {
    while (len > 0) {
        const ssize_t n = write(fd, data, len);
        if (n < 0 && (errno != EINTR || g_interrupted)) {
            return fail("write to", "the FIFO");
        }
        if (n > 0) {
            data += n;
            len -= static_cast<size_t>(n);
        }
    }
    return true;
}

bool feed(int fd, uint64_t size, size_t block, const std::function<void(uint64_t)>& trim) {
    std::vector<uint8_t> data(block);
    for (size_t i = 0; i < block; ++i) {
        data[i] = static_cast<uint8_t>(i * 167 >> 3);
    }
    uint64_t next_trim = FILE_MIB * MIB;
    for (uint64_t fed = 0; fed < size;) {
        const size_t len = static_cast<size_t>(std::min<uint64_t>(block, size - fed));
        if (!write_all(fd, data.data(), len)) {
            return false;
        }
        fed += len;
        if (fed >= next_trim) {
            trim(fed);
            next_trim += FILE_MIB * MIB;
        }
    }
    return true;
}

bool wait_empty(int fd, ChildProcess& reader) {
    for (int unread = 1; unread > 0;) {
        if (ioctl(fd, FIONREAD, &unread) < 0 || g_interrupted || !reader.alive()) {
            return false;
        }
        if (unread > 0) {
            sched_yield();
        }
    }
    return true;
}
