// SPDX-License-Identifier: Apache-2.0

#include "bench/OldLogs.h"

#include <fcntl.h>
#include <stdio.h>
#include <time.h>
#include <unistd.h>

#include <filesystem>

#include "bench/common.h"

OldLogs::OldLogs(const std::string& log_root, const std::string& set, const std::string& cp,
                 unsigned files, uint64_t size)
    : m_set_dir(log_root + "/" + set), m_cp(cp), m_files(files) {
    std::error_code error;
    std::filesystem::create_directories(m_set_dir + "/" + cp, error);
    m_made = !error;
    for (unsigned i = 0; i < files && m_made; ++i) {
        const int fd = open(path(i).c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0644);
        m_made = fd >= 0 && ftruncate(fd, static_cast<off_t>(size)) == 0;
        close(fd);
        if (!m_made) {
            fail("make", path(i));
        }
    }
}

std::string OldLogs::path(unsigned index, unsigned added) const {
    // One file a second.
    const time_t first = 1456823700;
    const time_t time = first + static_cast<time_t>(index);
    struct tm t = {};
    gmtime_r(&time, &t);
    char stamp[32];
    strftime(stamp, sizeof(stamp), "%Y-%m-%d_%H-%M-%S", &t);
    return m_set_dir + "/" + m_cp + "/" + std::to_string(m_files - 1 - index + added) + "-" + m_cp +
           "-" + stamp + ".log";
}

std::vector<std::string> OldLogs::paths(unsigned added) const {
    std::vector<std::string> all;
    for (unsigned i = 0; i < m_files; ++i) {
        all.push_back(path(i, added));
    }
    return all;
}
