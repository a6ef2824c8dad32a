// SPDX-License-Identifier: Apache-2.0

#include "config/ConfigReader.h"

#include <errno.h>
#include <sys/stat.h>
#include <unistd.h>

#include "core/SavedErrno.h"
#include "core/open_file.h"

namespace {

// A thousand times what anybody needs. All of it is read while the loop waits.
constexpr off_t MAX_CONFIG_SIZE = 1 << 20;

}  // namespace

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
    struct stat st;
    if (fstat(fd, &st) == 0) {
        errno = st.st_size > MAX_CONFIG_SIZE ? EFBIG : 0;
        m_file = errno == 0 ? fdopen(fd, "r") : nullptr;
    }
    if (!m_file) {
        const SavedErrno open_errno;
        close(fd);
        return -1;
    }
    return 0;
}

const char* ConfigReader::next_line() {
    if (!fgets(m_line, sizeof(m_line), m_file)) {
        return nullptr;
    }
    if (ftello(m_file) > MAX_CONFIG_SIZE) {  // it grows while it is read
        m_too_large = true;
        errno = EFBIG;
        return nullptr;
    }
    ++m_number;
    return m_line;
}
