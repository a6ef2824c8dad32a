// SPDX-License-Identifier: Apache-2.0
// The part of WcdmaIqManager that runs on the saving thread.
#include <errno.h>
#include <poll.h>
#include <sys/ioctl.h>
#include <sys/socket.h>
#include <unistd.h>

#include "core/SavedErrno.h"
#include "core/log.h"
#include "core/poll_error.h"
#include "iq/IqStorRespHandler.h"
#include "iq/WcdmaIqManager.h"
#include "iq/iq_mem.h"

namespace {

// Between two chunks the thread looks for a command.
constexpr uint32_t CHUNK_SIZE = 10u << 20;
constexpr int NO_COMMAND = -1;

}  // namespace

// The next command, if one is there: a value below 0 if not. The end of the connection, in
// whatever way, counts as IQST_QUIT.
int WcdmaIqManager::next_command() {
    uint8_t cmd;
    const ssize_t n = read(m_thread_sock, &cmd, 1);
    if (n == 1) {
        return cmd;
    }
    if (n < 0 && (errno == EAGAIN || errno == EINTR)) {
        return NO_COMMAND;
    }
    return IQST_QUIT;
}

void WcdmaIqManager::respond(int response) {
    const uint8_t byte = static_cast<uint8_t>(response);
    if (write(m_thread_sock, &byte, 1) != 1) {
        err_log("I/Q saving thread can not respond %d", response);
        // Nobody shall wait for it: the connection is over for both ends.
        shutdown(m_thread_sock, SHUT_RDWR);
    }
}

void* WcdmaIqManager::save_thread(void* param) {
    WcdmaIqManager* manager = static_cast<WcdmaIqManager*>(param);
    bool running = true;
    while (running) {
        struct pollfd pfd;
        pfd.fd = manager->m_thread_sock;
        pfd.events = POLLIN;
        pfd.revents = 0;
        poll(&pfd, 1, -1);  // after a failure it reads all the same: a command may be there
        switch (manager->next_command()) {
            case IQST_QUIT:
                running = false;
                break;
            case IQST_STOP:
                manager->respond(IQST_STOPPED);
                break;
            case IQST_SAVE:
                running = manager->process_save();
                break;
            default:
                usleep(POLL_FAILED_WAIT_US);  // the poll failed or promised too much
                break;
        }
    }
    // The end of the connection tells the loop that this thread is done.
    shutdown(manager->m_thread_sock, SHUT_RDWR);
    return nullptr;
}

// False when the thread is to end.
bool WcdmaIqManager::process_save() {
    IqBufInfo info{};
    if (ioctl(m_fd, CMD_GET_IQ_BUF_INFO, &info) < 0) {
        err_log("ioctl CMD_GET_IQ_BUF_INFO error");
        m_saved_bytes = 0;
        respond(IQST_SAVED);
        return true;
    }
    if (info.offset > IQ_MEM_SIZE || info.len > IQ_MEM_SIZE - info.offset) {
        errno = ERANGE;
        err_log("I/Q buffer at %u length %u is outside the mapping", info.offset, info.len);
        m_saved_bytes = 0;
        respond(IQST_SAVED);
        return true;
    }
    uint32_t remaining = info.len;
    const uint8_t* position = m_mem_base + info.offset;
    int command = NO_COMMAND;
    while (remaining != 0) {
        const uint32_t chunk = remaining < CHUNK_SIZE ? remaining : CHUNK_SIZE;
        const ssize_t n = m_save_file->write_raw(position, chunk);
        if (n > 0) {
            remaining -= static_cast<uint32_t>(n);
            position += n;
        }
        if (n != static_cast<ssize_t>(chunk)) {
            {
                const SavedErrno write_errno;
                m_save_error = n >= 0 ? ENOSPC : errno == EFAULT ? 0 : errno;  // 0: the driver's
                // A part of the chunk may have reached the file before the failure.
                const off_t reached = lseek(m_save_file->fd(), 0, SEEK_CUR);
                if (reached >= 0 && reached <= static_cast<off_t>(info.len)) {
                    remaining = info.len - static_cast<uint32_t>(reached);
                }
            }
            err_log("save WCDMA I/Q error, %u bytes not saved", remaining);
            break;
        }
        command = next_command();
        if (command == IQST_QUIT || command == IQST_STOP) {
            break;
        }
        command = NO_COMMAND;
    }
    m_saved_bytes = info.len - remaining;
    if (command == IQST_QUIT) {
        return false;
    }
    respond(command == IQST_STOP ? IQST_STOPPED : IQST_SAVED);
    return true;
}
