// SPDX-License-Identifier: Apache-2.0

#include "config/ConfigReader.h"

#include <unistd.h>

#include "core/SavedErrno.h"
#include "core/open_file.h"

ConfigReader::~ConfigReader() {
    if (m_file) {
        fclose(m_file);
    }
}

int ConfigReader::open(const char* path) {
    const int fd = open_to_read(path, Links::REFUSE);
    if (fd < 0) {
        return -1;
    }
    m_file = fdopen(fd, "r");
    if (!m_file) {
        const SavedErrno fdopen_errno;
        close(fd);
        return -1;
    }
    return 0;
}

const char* ConfigReader::next_line() {
    if (!fgets(m_line, sizeof(m_line), m_file)) {
        return nullptr;
    }
    ++m_number;
    return m_line;
}
