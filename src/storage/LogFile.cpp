// SPDX-License-Identifier: Apache-2.0

#include "storage/LogFile.h"

#include <errno.h>
#include <fcntl.h>
#include <stdio.h>
#include <string.h>
#include <sys/uio.h>
#include <unistd.h>

#include "core/SavedErrno.h"
#include "core/copy_bytes.h"
#include "core/log.h"
#include "core/open_file.h"
#include "storage/CpDirectory.h"
#include "storage/CpSetDirectory.h"
#include "storage/paths.h"

LogFile::LogFile(const android::String8& name, CpDirectory* dir, LogType type, uint32_t size)
    : m_dir(dir), m_name(name), m_type(type), m_size(size), m_counted(size) {}

LogFile::LogFile(const android::String8& name, CpDirectory* dir, const struct tm& t)
    : m_dir(dir),
      m_name(name),
      m_type(LT_LOG),
      m_time(LogTime::from_tm(t)),
      m_size(0),
      m_counted(0) {}

LogFile::~LogFile() {
    if (m_destroy_hook) {
        m_destroy_hook(m_destroy_client);
    }
    close();
}

MediaStorage* LogFile::media() const {
    return m_dir->set()->media();
}

int LogFile::open(int more_flags) {
    if (m_fd >= 0) {
        return -1;
    }
    // A link on a card must not lead the writing out of the log tree.
    m_fd = ::open(JoinedPath(m_dir->path(), m_name).string(),
                  O_RDWR | O_CREAT | O_NOFOLLOW | O_CLOEXEC | more_flags, 0644);
    if (m_fd < 0) {
        return -1;
    }
    m_buffer.reset(new uint8_t[BUFFER_SIZE]);
    m_capacity = BUFFER_SIZE;
    m_staged = 0;
    return 0;
}

int LogFile::close() {
    if (m_fd < 0) {
        return 0;
    }
    if (write_out() < 0) {
        err_log("what was staged of %s is lost", m_name.string());
    }
    ::close(m_fd);
    m_fd = -1;
    m_buffer.reset();
    m_capacity = 0;
    return 0;
}

int LogFile::write_out() {
    if (m_fd < 0 || m_staged == 0) {
        return 0;
    }
    const size_t dropped = m_staged - write_some(m_buffer.get(), m_staged);
    m_staged = 0;
    if (dropped == 0) {
        return 0;
    }
    shrink(dropped);
    return -1;
}

void LogFile::grow(uint64_t len) {
    m_size += static_cast<uint32_t>(len);
    m_counted += len;
    m_dir->add_size(len);
}

void LogFile::shrink(uint64_t len) {
    m_size -= static_cast<uint32_t>(len);
    m_counted -= len;
    m_dir->dec_size(len);
}

void LogFile::set_size(uint32_t size) {
    m_size = size;
    m_counted += size;
    m_dir->add_size(size);
}

void LogFile::found(uint64_t bytes) {
    m_size = static_cast<uint32_t>(bytes);
    m_counted = bytes;
}

ssize_t LogFile::write(const void* data, size_t len) {
    if (m_fd < 0) {
        return -1;
    }
    if (m_staged + len < m_capacity) {
        memcpy(m_buffer.get() + m_staged, data, len);
        m_staged += len;
        grow(len);
        return static_cast<ssize_t>(len);
    }
    ssize_t n;
    if (m_staged == 0) {
        n = write_data(data, len);
        if (n > 0) {
            grow(static_cast<size_t>(n));
        }
    } else {
        n = write_staged_with(data, len);
    }
    if (n < 0) {
        const bool full = errno == ENOSPC;
        err_log("write file failed");
        return full ? FULL : n;
    }
    return n;
}

// One writev of what is staged and the new data; the number of new bytes that went
// out, 0 when not even all of the staged ones did, negative on failure.
ssize_t LogFile::write_staged_with(const void* data, size_t len) {
    struct iovec pieces[2];
    pieces[0].iov_base = m_buffer.get();
    pieces[0].iov_len = m_staged;
    pieces[1].iov_base = const_cast<void*>(data);
    pieces[1].iov_len = len;
    const ssize_t n = writev(m_fd, pieces, 2);
    if (n <= 0) {
        return n;
    }
    const size_t written = static_cast<size_t>(n);
    if (written < m_staged) {
        m_staged -= written;
        memmove(m_buffer.get(), m_buffer.get() + written, m_staged);
        return 0;
    }
    const size_t taken = written - m_staged;
    m_staged = 0;
    grow(taken);
    return static_cast<ssize_t>(taken);
}

ssize_t LogFile::write_data(const void* data, size_t len) {
    if (m_fd < 0) {
        err_log("write file not opened");
        return -1;
    }
    return write_some(data, len) == len ? static_cast<ssize_t>(len) : -1;
}

// Writes until everything is out or a write fails; the bytes that went out.
size_t LogFile::write_some(const void* data, size_t len) {
    const uint8_t* const bytes = static_cast<const uint8_t*>(data);
    size_t done = 0;
    while (done < len) {
        const ssize_t n = ::write(m_fd, bytes + done, len - done);
        if (n < 0) {
            break;
        }
        if (n == 0) {
            // Nothing was taken and no reason given: trying again could go on for ever.
            errno = EIO;
            break;
        }
        done += static_cast<size_t>(n);
    }
    return done;
}

ssize_t LogFile::write_raw(const void* data, size_t len) {
    const ssize_t n = write_data(data, len);
    return n < 0 && errno == ENOSPC ? FULL : n;
}

int LogFile::copy(const char* source) {
    if (m_fd < 0) {
        return -1;
    }
    const int src = open_to_read(source, Links::FOLLOW);
    if (src < 0) {
        err_log("open %s error", source);
        return -1;
    }
    uint64_t copied;
    int result = copy_bytes(src, m_fd, m_buffer.get(), m_capacity, MAX_COPY, copied);
    if (copied == MAX_COPY) {
        errno = EFBIG;
        result = -1;
    }
    result = result == COPY_NOT_TAKEN ? NOT_TAKEN : result;
    const SavedErrno keep;
    grow(copied);
    ::close(src);
    return result;
}

int LogFile::remove(const android::String8& dir_path) {
    const JoinedPath path(dir_path, m_name);
    if (unlink(path.string()) < 0 && errno != ENOENT) {
        err_log("delete %s error", path.string());
        m_stuck = true;
        return -1;
    }
    return 0;
}

void LogFile::discard() {
    m_dir->remove_file(this);
}

bool LogFile::exists() const {
    return access(JoinedPath(m_dir->path(), m_name).string(), R_OK | W_OK) == 0 ||
           !means_vanished(errno);
}
