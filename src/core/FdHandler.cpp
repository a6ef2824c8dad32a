#include "core/FdHandler.h"

#include <unistd.h>

#include "core/Multiplexer.h"

FdHandler::FdHandler(int fd, LogController* ctrl, Multiplexer* mux)
    : m_fd(fd), m_log_ctrl(ctrl), m_multiplexer(mux) {}

FdHandler::~FdHandler() {
    // Wholly, even without a descriptor: an entry left behind would be read when the
    // poll set is built next.
    if (m_multiplexer) {
        m_multiplexer->forget(this);
    }
    close();
}

int FdHandler::add_events(int events) {
    return m_multiplexer->register_fd(this, events);
}

void FdHandler::del_events(int events) {
    m_multiplexer->unregister_fd(this, events);
}

int FdHandler::close() {
    if (m_fd < 0) {
        return 0;
    }
    const int result = ::close(m_fd);
    m_fd = -1;
    return result;
}
