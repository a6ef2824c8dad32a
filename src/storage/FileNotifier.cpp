// SPDX-License-Identifier: Apache-2.0

#include "storage/FileNotifier.h"

#include <fcntl.h>
#include <poll.h>

#include "core/system_paths.h"

FileNotifier::FileNotifier(LogController* ctrl, Multiplexer* mux, const char* path)
    : FdHandler(-1, ctrl, mux), m_path(system_path(path)) {}

void FileNotifier::set_callback(void* client, notify_callback callback) {
    m_client = client;
    m_callback = callback;
}

int FileNotifier::open() {
    if (m_fd >= 0) {
        return 0;
    }
    // Non-blocking: a FIFO would hold up the service until somebody writes to it.
    m_fd = ::open(m_path.string(), O_RDONLY | O_NONBLOCK | O_NOCTTY | O_CLOEXEC);
    if (m_fd < 0) {
        return -1;
    }
    note_alive();  // an earlier descriptor's record does not count
    poll_when_room(POLLIN, m_path.string());
    return 0;
}

void FileNotifier::close() {
    if (m_fd >= 0) {
        del_events(POLLIN);
        FdHandler::close();
    }
}

void FileNotifier::note_read(bool got_data) {
    if (got_data) {
        note_alive();
    } else {
        note_idle(m_path.string());
    }
}

void FileNotifier::process(int) {
    if (m_callback) {
        m_callback(this, m_client);
    } else {
        note_read(false);
    }
}
