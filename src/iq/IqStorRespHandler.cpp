// SPDX-License-Identifier: Apache-2.0

#include "iq/IqStorRespHandler.h"

#include <errno.h>
#include <poll.h>
#include <stdint.h>
#include <sys/socket.h>
#include <unistd.h>

#include "core/log.h"
#include "core/poll_error.h"
#include "iq/WcdmaIqManager.h"

namespace {

// The thread answers within one chunk; a medium that takes longer for it is stuck.
constexpr int PATIENCE_MS = 5000;

}  // namespace

IqStorRespHandler::IqStorRespHandler(int fd, LogController* ctrl, Multiplexer* mux,
                                     WcdmaIqManager* manager)
    : FdHandler(fd, ctrl, mux, SERVES_CAPTURE), m_manager(manager) {}

void IqStorRespHandler::process(int /*events*/) {
    uint8_t response;
    ssize_t n;
    bool answered = false;
    while ((n = read(m_fd, &response, 1)) > 0) {
        answered = true;
        m_manager->process_stor_response(response);
    }
    if (n == 0 || (errno != EAGAIN && errno != EINTR)) {
        m_manager->process_thread_lost();  // destroys this
    } else if (answered) {
        note_alive();
    } else {
        note_idle("I/Q saving thread");
    }
}

int IqStorRespHandler::send_cmd(int cmd) {
    const uint8_t byte = static_cast<uint8_t>(cmd);
    return write(m_fd, &byte, 1) == 1 ? 0 : -1;
}

int IqStorRespHandler::wait_response() {
    for (;;) {
        struct pollfd pfd;
        pfd.fd = m_fd;
        pfd.events = POLLIN;
        pfd.revents = 0;
        const int ready = poll(&pfd, 1, PATIENCE_MS);
        if (ready == 0) {
            info_log("I/Q saving thread does not answer, waiting on");
            continue;
        }
        if (ready < 0) {
            if (errno != EINTR) {
                err_log("poll I/Q saving thread error");
                return -1;
            }
            continue;
        }
        uint8_t response;
        const ssize_t n = read(m_fd, &response, 1);
        if (n == 1) {
            return response;
        }
        if (n == 0 || (errno != EAGAIN && errno != EINTR)) {
            return -1;
        }
        wait_after_failed_poll(errno);
    }
}

void IqStorRespHandler::end_thread() {
    send_cmd(IQST_QUIT);
    // Should the command not get through, its end of the connection tells the thread.
    shutdown(m_fd, SHUT_WR);
    struct pollfd pfd;
    pfd.fd = m_fd;
    pfd.events = 0;  // the hang-up alone
    pfd.revents = 0;
    if (poll(&pfd, 1, PATIENCE_MS) == 0) {
        info_log("I/Q saving thread does not end, waiting on");
    }
}
