// SPDX-License-Identifier: Apache-2.0

#include "sim/RecordedStream.h"

#include <errno.h>
#include <fcntl.h>
#include <string.h>
#include <unistd.h>

#include <algorithm>

#include "sim/byte_text.h"

void RecordedStream::close_file() {
    if (m_fd >= 0) {
        close(m_fd);
        m_fd = -1;
    }
}

size_t RecordedStream::read(uint8_t* dst, size_t len) {
    for (; m_file < m_cp.files.size(); ++m_file, m_done = 0, close_file()) {
        const RecordedFile& file = m_cp.files[m_file];
        const size_t want = static_cast<size_t>(std::min<uint64_t>(len, file.size - m_done));
        if (want == 0) {
            continue;
        }
        if (m_fd < 0) {
            m_fd = open(file.path.c_str(), O_RDONLY | O_NONBLOCK | O_NOFOLLOW | O_CLOEXEC);
        }
        ssize_t n;
        do {
            n = m_fd < 0 ? -1 : pread(m_fd, dst, want, static_cast<off_t>(file.head + m_done));
        } while (n < 0 && m_fd >= 0 && errno == EINTR);
        if (n > 0) {
            m_done += static_cast<uint64_t>(n);
            m_position += static_cast<uint64_t>(n);
            return static_cast<size_t>(n);
        }
        m_problems.push_back(
            show_name(file.path) + ": the last " + std::to_string(file.size - m_done) +
            " bytes cannot be read: " + (n < 0 ? strerror(errno) : "the file became shorter"));
        m_position += file.size - m_done;
    }
    return 0;
}
