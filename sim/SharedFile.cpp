// SPDX-License-Identifier: Apache-2.0

#include "sim/SharedFile.h"

#include <errno.h>
#include <fcntl.h>
#include <sys/mman.h>
#include <unistd.h>

bool SharedFile::create(const std::string& path, size_t size) {
    remove();
    const int fd = open(path.c_str(), O_RDWR | O_CREAT | O_TRUNC | O_CLOEXEC, 0600);
    if (fd < 0) {
        return false;
    }
    m_path = path;
    void* data = MAP_FAILED;
    // With its blocks: a write through the mapping that finds no room would be a bus error.
    errno = posix_fallocate(fd, 0, static_cast<off_t>(size));
    if (errno == 0) {
        data = mmap(nullptr, size, PROT_READ | PROT_WRITE, MAP_SHARED, fd, 0);
    }
    const int error = errno;
    close(fd);
    if (data == MAP_FAILED) {
        errno = error;
        return false;
    }
    m_data = static_cast<uint8_t*>(data);
    m_size = size;
    return true;
}

void SharedFile::remove() {
    if (m_data) {
        munmap(m_data, m_size);
        m_data = nullptr;
    }
    if (!m_path.empty()) {
        unlink(m_path.c_str());
        m_path.clear();
    }
}
