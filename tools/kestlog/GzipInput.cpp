// SPDX-License-Identifier: Apache-2.0

#include "kestlog/GzipInput.h"

#include <errno.h>
#include <fcntl.h>
#include <string.h>
#include <unistd.h>

namespace {

constexpr size_t PIECE = 256 * 1024;
constexpr uint8_t MAGIC[] = {0x1f, 0x8b};
constexpr int GZIP_ONLY = 16 + MAX_WBITS;  // zlib's way to say it

}  // namespace

GzipInput::~GzipInput() {
    if (m_fd > STDIN_FILENO) {
        close(m_fd);
    }
    if (m_compressed) {
        inflateEnd(&m_stream);
    }
}

bool GzipInput::is_gzip(const std::string& path) {
    uint8_t magic[sizeof(MAGIC)] = {};
    const int fd = ::open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK);
    const bool good = fd >= 0 && ::read(fd, magic, sizeof(magic)) == sizeof(magic);
    if (fd >= 0) {
        close(fd);
    }
    return good && memcmp(magic, MAGIC, sizeof(MAGIC)) == 0;
}

bool GzipInput::open(const std::string& path) {
    m_fd = path == "-" ? STDIN_FILENO : ::open(path.c_str(), O_RDONLY | O_CLOEXEC);
    m_in.resize(PIECE);
    m_out.resize(PIECE);
    if (m_fd < 0 || !fill()) {
        return false;
    }
    m_compressed = m_stream.avail_in >= sizeof(MAGIC) &&
                   memcmp(m_stream.next_in, MAGIC, sizeof(MAGIC)) == 0 &&
                   inflateInit2(&m_stream, GZIP_ONLY) == Z_OK;
    m_inside = m_compressed;
    return true;
}

// Reads until there is a piece, or the end. False with errno and error() set.
bool GzipInput::fill() {
    size_t len = 0;
    for (ssize_t n = 1; n != 0 && len < PIECE;) {
        n = ::read(m_fd, m_in.data() + len, PIECE - len);
        if (n < 0 && errno != EINTR) {
            if (len > 0) {
                break;  // what came before the fault counts; the next reading meets it again
            }
            m_error = strerror(errno);
            return false;
        }
        len += n > 0 ? static_cast<size_t>(n) : 0;
    }
    m_offset += len;
    m_stream.next_in = m_in.data();
    m_stream.avail_in = static_cast<uInt>(len);
    return true;
}

ssize_t GzipInput::read(const void** data) {
    if (!m_error.empty()) {
        return -1;
    }
    if (m_compressed) {
        *data = m_out.data();
        return inflate_some();
    }
    if (m_stream.avail_in == 0 && !fill()) {
        return -1;
    }
    const ssize_t len = static_cast<ssize_t>(m_stream.avail_in);
    *data = m_stream.next_in;
    m_stream.avail_in = 0;
    return len;
}

ssize_t GzipInput::inflate_some() {
    m_stream.next_out = m_out.data();
    m_stream.avail_out = static_cast<uInt>(PIECE);
    while (m_stream.avail_out > 0 && m_error.empty()) {
        if (m_stream.avail_in == 0 && (!fill() || m_stream.avail_in == 0)) {
            if (m_inside && m_error.empty()) {
                m_error = "gzip: unexpected end of file";
            }
            break;
        }
        // Another member may follow, and zeros that fill a block of a tape.
        if (!m_inside && (*m_stream.next_in != MAGIC[0] || inflateReset(&m_stream) != Z_OK)) {
            break;
        }
        const int result = inflate(&m_stream, Z_NO_FLUSH);
        m_inside = result != Z_STREAM_END;
        if (result != Z_OK && result != Z_STREAM_END && result != Z_BUF_ERROR) {
            m_error = std::string("gzip: ") + (m_stream.msg ? m_stream.msg : "damaged");
        }
    }
    const size_t len = PIECE - m_stream.avail_out;
    return len == 0 && !m_error.empty() ? -1 : static_cast<ssize_t>(len);
}
