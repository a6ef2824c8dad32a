// SPDX-License-Identifier: Apache-2.0

#include "bench/feeding.h"

#include <errno.h>
#include <fcntl.h>
#include <sched.h>
#include <sys/ioctl.h>
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

std::vector<uint8_t> log_text(size_t len) {
    constexpr size_t LINE = 100;
    std::vector<uint8_t> text(len);
    for (size_t i = 0; i < len; ++i) {
        text[i] = static_cast<uint8_t>(i % LINE == LINE - 1 ? '\n' : ' ' + i * 7 % 95);
    }
    return text;
}

bool feed(int fd, uint64_t size, size_t block, const std::function<void(uint64_t)>& each_mib) {
    const std::vector<uint8_t> data = log_text(block);
    for (uint64_t fed = 0; fed < size;) {
        const size_t len = static_cast<size_t>(std::min<uint64_t>(block, size - fed));
        if (!write_all(fd, data.data(), len)) {
            return false;
        }
        if ((fed + len) / MIB > fed / MIB) {
            each_mib((fed + len) / MIB);
        }
        fed += len;
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
