// SPDX-License-Identifier: Apache-2.0

#include "core/FdHandler.h"

#include <unistd.h>

#include "core/Multiplexer.h"
#include "core/log.h"

FdHandler::FdHandler(int fd, LogController* ctrl, Multiplexer* mux, Service service)
    : m_fd(fd),
      m_log_ctrl(ctrl),
      m_multiplexer(mux),
      m_service(service),
      m_rest_timer(mux ? &mux->timer_mgr() : nullptr, on_rest_over, this) {}

FdHandler::~FdHandler() {
    // Remove the whole registration even when no descriptor is open: build_poll_set() would
    // otherwise read this destroyed object.
    if (m_multiplexer) {
        m_multiplexer->forget(this);
    }
    close();
}

int FdHandler::add_events(int events) {
    end_hold();
    return m_multiplexer->register_fd(this, events);
}

void FdHandler::poll_when_room(int events, const char* what) {
    end_hold();
    if (m_multiplexer->register_when_room(this, events) < 0) {
        errno = ENOBUFS;
        err_log("no room to poll %s, waiting for it", what);
    }
}

void FdHandler::del_events(int events) {
    m_multiplexer->unregister_fd(this, events);
}

void FdHandler::hold_events() {
    m_held = true;
    m_multiplexer->pass_over(this);
}

void FdHandler::end_hold() {
    if (m_held) {
        m_held = false;
        m_multiplexer->rest_changed();
    }
}

int FdHandler::close() {
    if (m_fd < 0) {
        return 0;
    }
    const int result = ::close(m_fd);
    m_fd = -1;
    return result;
}

void FdHandler::note_idle(const char* what) {
    if (m_idle_wakeups < IDLE_LIMIT) {
        ++m_idle_wakeups;
    }
    if (m_idle_wakeups < IDLE_LIMIT || resting()) {
        return;
    }
    if (m_rest_timer.start(REST_MS) < 0) {
        return;  // no clock, no rest: nothing would end it
    }
    m_multiplexer->rest_changed();
    if (!m_rest_logged) {
        m_rest_logged = true;
        info_log("%s gave nothing %u times in a row, left alone for %u ms at a time", what,
                 IDLE_LIMIT, REST_MS);
    }
}

void FdHandler::on_rest_over(void* handler) {
    static_cast<FdHandler*>(handler)->m_multiplexer->rest_changed();
}

void FdHandler::end_rest() {
    m_idle_wakeups = 0;
    m_rest_logged = false;
    if (resting()) {
        m_rest_timer.stop();
        m_multiplexer->rest_changed();
    }
}
