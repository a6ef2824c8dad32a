// SPDX-License-Identifier: Apache-2.0

#include "channels/DeviceFileHandler.h"

#include <errno.h>
#include <fcntl.h>
#include <poll.h>
#include <unistd.h>

#include "core/log.h"

DeviceFileHandler::DeviceFileHandler(const android::String8& path, size_t capacity,
                                     LogController* ctrl, Multiplexer* mux)
    : FdHandler(-1, ctrl, mux), m_own_fd(true), m_path(path), m_buf(capacity) {}

DeviceFileHandler::DeviceFileHandler(int fd, size_t capacity, LogController* ctrl, Multiplexer* mux)
    : FdHandler(fd, ctrl, mux), m_own_fd(false), m_buf(capacity) {}

DeviceFileHandler::~DeviceFileHandler() {
    if (!m_own_fd && m_fd >= 0) {
        del_events(POLLIN | POLLOUT);
        m_fd = -1;
    }
}

int DeviceFileHandler::open() {
    m_fd = ::open(m_path.string(), O_RDWR | O_NONBLOCK | O_NOCTTY | O_CLOEXEC);
    return m_fd;
}

bool DeviceFileHandler::is_news(FailureKind kind, int detail) {
    if (m_failure == kind && m_failure_detail == detail) {
        return false;
    }
    m_failure = kind;
    m_failure_detail = detail;
    return true;
}

void DeviceFileHandler::note_nothing() {
    note_idle(m_own_fd ? m_path.string() : "diag device");
}

void DeviceFileHandler::process(int events) {
    if (!(events & POLLIN)) {
        if (is_news(UNEXPECTED_EVENT, events)) {
            err_log("file %s unexpected event %#x", m_path.string(),
                    static_cast<unsigned int>(events));
        }
        note_nothing();
        return;
    }
    for (int reads = 0; reads < MAX_READS; ++reads) {
        const size_t used = m_buf.data_start + m_buf.data_len;
        const ssize_t n = read(m_fd, m_buf.buffer.get() + used, m_buf.capacity - used);
        if (n <= 0) {
            if (n == 0 && is_news(READ_NOTHING, 0)) {
                err_log("read %s return 0", m_path.string());
            } else if (n < 0 && errno != EAGAIN && errno != ENODATA && is_news(READ_ERROR, errno)) {
                err_log("read %s error", m_path.string());
            }
            if (reads == 0) {
                note_nothing();
            }
            return;
        }
        m_failure = NONE;
        note_alive();
        m_buf.data_len += static_cast<size_t>(n);
        if (process_data(m_buf)) {
            return;  // this object may be gone
        }
    }
}
