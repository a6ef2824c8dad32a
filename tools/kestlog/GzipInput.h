// SPDX-License-Identifier: Apache-2.0
// The bytes of a file that gzip has compressed, or of any other as they stand. The sum that gzip
// puts behind the data is checked, which libarchive leaves out: of a tar with a wrong byte it
// would give wrong files without a word. Owned by what unpacks an archive.
#ifndef KESTLOG_GZIPINPUT_H_
#define KESTLOG_GZIPINPUT_H_

#include <stdint.h>
#include <sys/types.h>
#include <zlib.h>

#include <string>
#include <vector>

class GzipInput {
public:
    GzipInput() = default;
    ~GzipInput();
    GzipInput(const GzipInput&) = delete;
    GzipInput& operator=(const GzipInput&) = delete;

    // Whether the file begins as gzip's do; false also when it cannot be read.
    static bool is_gzip(const std::string& path);

    // "-" is standard input. False with errno set.
    bool open(const std::string& path);
    bool is_open() const { return m_fd >= 0; }
    // The next bytes, valid until the next call: their number, 0 at the end, -1 with error() set.
    // What stands before an error is given first.
    ssize_t read(const void** data);
    const std::string& error() const { return m_error; }
    // Bytes of the file so far.
    uint64_t offset() const { return m_offset; }

private:
    bool fill();
    ssize_t inflate_some();

    int m_fd = -1;
    bool m_compressed = false;
    bool m_inside = false;  // a compressed member has begun, and not ended
    z_stream m_stream{};
    std::vector<uint8_t> m_in;
    std::vector<uint8_t> m_out;
    uint64_t m_offset = 0;
    std::string m_error;
};

#endif  // KESTLOG_GZIPINPUT_H_
