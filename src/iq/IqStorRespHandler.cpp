#include "iq/IqStorRespHandler.h"

#include <errno.h>
#include <poll.h>
#include <stdint.h>
#include <unistd.h>

#include "core/log.h"
#include "iq/WcdmaIqManager.h"

namespace {

// The thread answers within one chunk; a medium that takes longer for it is stuck.
constexpr int PATIENCE_MS = 5000;

}  // namespace

IqStorRespHandler::IqStorRespHandler(int fd, LogController* ctrl, Multiplexer* mux,
                                     WcdmaIqManager* manager)
    : FdHandler(fd, ctrl, mux), m_manager(manager) {}

void IqStorRespHandler::process(int /*events*/) {
    uint8_t response;
    while (read(m_fd, &response, 1) > 0) {
        m_manager->process_stor_response(response);
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
    }
}
