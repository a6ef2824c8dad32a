#include "storage/FileNotifier.h"

#include <errno.h>
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
    m_fd = ::open(m_path.string(), O_RDONLY | O_CLOEXEC);
    if (m_fd < 0) {
        return -1;
    }
    if (add_events(POLLIN) < 0) {
        // Open but never polled would be a silent failure: let the owner report it.
        FdHandler::close();
        errno = ENOBUFS;
        return -1;
    }
    return 0;
}

void FileNotifier::close() {
    if (m_fd >= 0) {
        del_events(POLLIN);
        FdHandler::close();
    }
}

void FileNotifier::process(int) {
    if (m_callback) {
        m_callback(this, m_client);
    }
}
