// SPDX-License-Identifier: Apache-2.0

#include "bench/FloorLog.h"

#include <fcntl.h>
#include <stdio.h>
#include <string.h>
#include <sys/uio.h>
#include <unistd.h>

FloorLog::FloorLog(const std::string& dir, uint64_t file_size, uint64_t quota)
    : m_dir(dir),
      m_file_size(file_size),
      m_quota(quota),
      m_current(file_path(dir, 0)),
      m_staging(new uint8_t[STAGING]) {}

FloorLog::~FloorLog() {
    if (m_fd >= 0) {
        write_out(nullptr, 0);
        ::close(m_fd);
    }
}

std::string FloorLog::file_path(const std::string& dir, unsigned number) {
    return dir + "/" + std::to_string(number) + "-cp_gnss-2016-03-01_09-15-00.log";
}

void FloorLog::write(const uint8_t* data, size_t len) {
    if (m_fd < 0) {
        start_file();
    } else {
        ++m_calls.access;
        access(m_current.c_str(), R_OK | W_OK);
    }
    m_sizes.back() += len;
    m_total += len;
    const bool full = m_sizes.back() >= m_file_size;
    if (m_staged + len < STAGING && !full) {
        memcpy(m_staging.get() + m_staged, data, len);
        m_staged += len;
        m_calls.staged += len;
        return;
    }
    write_out(data, len);
    if (full) {
        ::close(m_fd);
        m_fd = -1;
    }
    if (m_total > m_quota) {
        trim();
    }
}

void FloorLog::write_out(const uint8_t* data, size_t len) {
    const struct iovec pieces[] = {{m_staging.get(), m_staged}, {const_cast<uint8_t*>(data), len}};
    ++m_calls.writev;
    if (writev(m_fd, pieces, 2) < 0) {
        perror("writev");
    }
    m_staged = 0;
}

// The oldest file is spared: it shows how the log began. It takes the number of the next one.
void FloorLog::trim() {
    const unsigned oldest = static_cast<unsigned>(m_sizes.size() - 1);
    ++m_calls.unlink;
    unlink(file_path(m_dir, oldest - 1).c_str());
    rename_file(oldest, oldest - 1);
    m_total -= m_sizes[1];
    m_sizes.erase(m_sizes.begin() + 1);
}

void FloorLog::start_file() {
    for (unsigned number = static_cast<unsigned>(m_sizes.size()); number-- > 0;) {
        rename_file(number, number + 1);
    }
    m_sizes.push_back(0);
    ++m_calls.open;
    m_fd = open(m_current.c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0644);
}

void FloorLog::rename_file(unsigned from, unsigned to) {
    ++m_calls.rename;
    rename(file_path(m_dir, from).c_str(), file_path(m_dir, to).c_str());
}
