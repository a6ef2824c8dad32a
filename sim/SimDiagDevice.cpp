// SPDX-License-Identifier: Apache-2.0

#include "sim/SimDiagDevice.h"

#include <errno.h>
#include <fcntl.h>
#include <poll.h>
#include <stdlib.h>
#include <sys/ioctl.h>
#include <termios.h>
#include <unistd.h>

#include <chrono>

namespace {

using Clock = std::chrono::steady_clock;

// True when the event comes before the deadline.
bool wait_for(int fd, short event, Clock::time_point deadline) {
    const auto left =
        std::chrono::duration_cast<std::chrono::milliseconds>(deadline - Clock::now()).count();
    pollfd p = {fd, event, 0};
    return left > 0 && poll(&p, 1, static_cast<int>(left)) > 0;
}

}  // namespace

bool SimDiagDevice::create(const std::string& path) {
    remove();
    char slave[64];
    m_master = posix_openpt(O_RDWR | O_NOCTTY | O_NONBLOCK | O_CLOEXEC);
    if (m_master < 0 || grantpt(m_master) != 0 || unlockpt(m_master) != 0 ||
        ptsname_r(m_master, slave, sizeof slave) != 0) {
        return false;
    }
    m_slave = open(slave, O_RDWR | O_NOCTTY | O_CLOEXEC);
    termios mode;
    if (m_slave < 0 || tcgetattr(m_slave, &mode) != 0) {
        return false;
    }
    cfmakeraw(&mode);
    if (tcsetattr(m_slave, TCSANOW, &mode) != 0 || symlink(slave, path.c_str()) != 0) {
        return false;
    }
    m_path = path;
    return true;
}

void SimDiagDevice::remove() {
    for (int* fd : {&m_master, &m_slave}) {
        if (*fd >= 0) {
            close(*fd);
            *fd = -1;
        }
    }
    if (!m_path.empty()) {
        unlink(m_path.c_str());
        m_path.clear();
    }
}

std::vector<uint8_t> SimDiagDevice::read_request(size_t min, int timeout_ms) const {
    const auto deadline = Clock::now() + std::chrono::milliseconds(timeout_ms);
    std::vector<uint8_t> request;
    uint8_t buf[4096];
    for (;;) {
        const ssize_t n = read(m_master, buf, sizeof buf);
        if (n > 0) {
            request.insert(request.end(), buf, buf + n);
        } else if (request.size() >= min || !wait_for(m_master, POLLIN, deadline)) {
            return request;
        }
    }
}

bool SimDiagDevice::write_reply(const void* data, size_t len, int timeout_ms) const {
    return write_some(data, len, timeout_ms) == len;
}

size_t SimDiagDevice::write_some(const void* data, size_t len, int timeout_ms) const {
    const auto deadline = Clock::now() + std::chrono::milliseconds(timeout_ms);
    const char* bytes = static_cast<const char*>(data);
    size_t done = 0;
    while (done < len) {
        const ssize_t n = write(m_master, bytes + done, len - done);
        if (n > 0) {
            done += static_cast<size_t>(n);
        } else if ((n < 0 && errno != EAGAIN && errno != EINTR) ||
                   !wait_for(m_master, POLLOUT, deadline)) {
            break;
        }
    }
    return done;
}

size_t SimDiagDevice::pending() const {
    int n = 0;
    return m_slave >= 0 && ioctl(m_slave, FIONREAD, &n) == 0 ? static_cast<size_t>(n) : 0;
}

void SimDiagDevice::discard() const {
    tcflush(m_slave, TCIFLUSH);
}
