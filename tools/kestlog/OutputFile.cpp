// SPDX-License-Identifier: Apache-2.0

#include "kestlog/OutputFile.h"

#include <errno.h>
#include <fcntl.h>
#include <string.h>
#include <unistd.h>

#include "kestlog/ExitStatus.h"
#include "kestlog/Report.h"

bool OutputFile::note_error(bool good) {
    if (!good && m_error == 0) {
        m_error = errno;
    }
    return good;
}

bool OutputFile::open(const std::string& path, bool force) {
    m_path = path;
    if (path == "-") {
        m_file = stdout;
        return true;
    }
    // Deleted first, not overwritten: an old file may be a link to anything.
    if (force && unlink(path.c_str()) < 0 && errno != ENOENT) {
        return note_error(false);
    }
    const int fd = ::open(path.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0644);
    m_file = fd < 0 ? nullptr : fdopen(fd, "wb");
    return note_error(m_file != nullptr);
}

bool OutputFile::write(const void* data, size_t len) {
    return note_error(fwrite(data, 1, len, m_file) == len);
}

bool OutputFile::close() {
    FILE* const file = m_file;
    if (!file || file == stdout) {
        m_file = nullptr;
        return note_error(!file || (fflush(file) == 0 && !ferror(file)));
    }
    if (!note_error(fflush(file) == 0 && !ferror(file))) {
        discard();
        return false;
    }
    m_file = nullptr;
    return note_error(fclose(file) == 0);
}

void OutputFile::discard() {
    if (m_file && m_file != stdout) {
        fclose(m_file);
        unlink(m_path.c_str());
    }
    m_file = nullptr;
}

int OutputFile::failed() const {
    return failure(ES_OUTPUT, (m_path == "-" ? "standard output" : m_path) + ": " +
                                  strerror(m_error) +
                                  (m_error == EEXIST ? "; use --force to replace it" : ""));
}
