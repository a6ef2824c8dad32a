// SPDX-License-Identifier: Apache-2.0

#include "sim/SimLogDevice.h"

#include <errno.h>
#include <fcntl.h>
#include <sys/ioctl.h>
#include <sys/stat.h>
#include <unistd.h>

bool SimLogDevice::create(const std::string& path, bool terminal) {
    remove();
    m_is_terminal = terminal;
    if (terminal) {
        m_path = path;
        return m_terminal.create(path);
    }
    if (mkfifo(path.c_str(), 0600) != 0) {
        return false;
    }
    m_path = path;
    m_fd = open(path.c_str(), O_RDWR | O_NONBLOCK | O_CLOEXEC);
    return m_fd >= 0;
}

void SimLogDevice::remove() {
    if (m_is_terminal) {
        m_terminal.remove();
        m_path.clear();
    }
    leave_to_writer();
    if (!m_path.empty()) {
        unlink(m_path.c_str());
        m_path.clear();
    }
}

void SimLogDevice::leave_to_writer() {
    if (m_fd >= 0) {
        close(m_fd);
        m_fd = -1;
    }
}

ssize_t SimLogDevice::feed(const void* data, size_t len) {
    if (m_is_terminal) {
        return static_cast<ssize_t>(m_terminal.write_some(data, len, 0));
    }
    const ssize_t n = write(m_fd, data, len);
    return n < 0 && (errno == EAGAIN || errno == EINTR) ? 0 : n;
}

size_t SimLogDevice::pending() const {
    if (m_is_terminal) {
        return m_terminal.pending();
    }
    int n = 0;
    return m_fd >= 0 && ioctl(m_fd, FIONREAD, &n) == 0 ? static_cast<size_t>(n) : 0;
}

bool SimLogDevice::wait_drained(int timeout_ms) const {
    for (; pending() > 0; --timeout_ms) {
        if (timeout_ms <= 0) {
            return false;
        }
        usleep(1000);
    }
    return true;
}
