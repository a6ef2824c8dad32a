// SPDX-License-Identifier: Apache-2.0

#include "kestlog/LogReader.h"

#include <errno.h>
#include <fcntl.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>

#include "kestlog/Progress.h"

time_t modified_time(const struct stat& st) {
    constexpr int64_t LAST = 253402214400;  // a day before the year 10000: zones differ
    return static_cast<time_t>(std::clamp<int64_t>(st.st_mtime, 0, LAST));
}

LogReader::~LogReader() {
    if (m_fd >= 0) {
        close(m_fd);
    }
}

bool LogReader::open(const std::string& path, bool follow) {
    // Non-blocking: opening a FIFO must not wait for a writer.
    m_fd =
        follow && path == "-"
            ? fcntl(STDIN_FILENO, F_DUPFD_CLOEXEC, 0)
            : ::open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK | (follow ? 0 : O_NOFOLLOW));
    struct stat st;
    if (m_fd < 0 || fstat(m_fd, &st) < 0) {
        return false;
    }
    m_piped = follow && (S_ISFIFO(st.st_mode) || S_ISSOCK(st.st_mode) || path == "-") &&
              !S_ISREG(st.st_mode);
    if (S_ISDIR(st.st_mode) || !(S_ISREG(st.st_mode) || m_piped)) {
        errno = S_ISDIR(st.st_mode) ? EISDIR : EINVAL;
        return false;
    }
    if (m_piped && path != "-") {
        fcntl(m_fd, F_SETFL, 0);  // its writer may be slow
    }
    const off_t start = m_piped ? 0 : std::max<off_t>(lseek(m_fd, 0, SEEK_CUR), 0);
    m_size = static_cast<uint64_t>(std::max<off_t>(st.st_size - start, 0));
    m_left = m_piped ? UINT64_MAX : m_size;
    m_modified = modified_time(st);
    m_window.resize(WINDOW);
    return true;
}

bool LogReader::seek(uint64_t offset) {
    if (m_piped || offset >= m_size || lseek(m_fd, static_cast<off_t>(offset), SEEK_SET) < 0) {
        return false;
    }
    m_offset = offset;
    m_left = m_size - offset;
    return true;
}

void LogReader::drain() {
    for (size_t got; peek(1, got), got > 0;) {
        skip(got);
    }
}

const uint8_t* LogReader::peek(size_t want, size_t& got) {
    if (m_end - m_start < want && m_left > 0) {
        fill(want);
    }
    got = m_end - m_start;
    return m_window.data() + m_start;
}

void LogReader::fill(size_t want) {
    memmove(m_window.data(), m_window.data() + m_start, m_end - m_start);
    m_end -= m_start;
    m_start = 0;
    while (m_end < want && m_left > 0) {
        const size_t room = static_cast<size_t>(std::min<uint64_t>(WINDOW - m_end, m_left));
        const ssize_t n = read(m_fd, m_window.data() + m_end, room);
        if (n < 0 && errno == EINTR) {
            continue;
        }
        if (n <= 0) {  // 0: it has become shorter
            m_error = n < 0 ? errno : 0;
            m_left = 0;
            break;
        }
        m_end += static_cast<size_t>(n);
        m_left -= static_cast<uint64_t>(n);
        Progress::advance(static_cast<uint64_t>(n));
    }
}

void LogReader::skip(size_t n) {
    m_start += n;
    m_offset += n;
}
