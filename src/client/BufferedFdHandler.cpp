// SPDX-License-Identifier: Apache-2.0

#include "client/BufferedFdHandler.h"

#include <errno.h>
#include <unistd.h>

BufferedFdHandler::BufferedFdHandler(int fd, LogController* ctrl, Multiplexer* mux, size_t capacity)
    : FdHandler(fd, ctrl, mux, SERVES_CONTROL),
      m_capacity(capacity),
      m_buffer(new uint8_t[capacity]) {}

BufferedFdHandler::~BufferedFdHandler() = default;

void BufferedFdHandler::process(int /*events*/) {
    // Into a full buffer this reads nothing and returns 0, as at the end of the stream.
    const ssize_t n = read(m_fd, m_buffer.get() + m_data_len, m_capacity - m_data_len);
    if (n == 0) {
        process_conn_closed();
    } else if (n > 0) {
        m_data_len += static_cast<size_t>(n);
        process_data();
    } else if (errno == EAGAIN || errno == EINTR) {
        note_idle("connection");
    } else {
        process_conn_error(errno);
    }
}
