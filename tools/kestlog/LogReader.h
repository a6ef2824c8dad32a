// SPDX-License-Identifier: Apache-2.0
// Reads a file of any size, or a pipe, from start to end through a window of fixed size. Reads no
// further than the size at opening, so that it also ends on a file that is being written.
#ifndef KESTLOG_LOGREADER_H_
#define KESTLOG_LOGREADER_H_

#include <stddef.h>
#include <stdint.h>
#include <time.h>

#include <string>
#include <vector>

struct stat;

// When a file was written to last. A file system from anywhere may say anything: what is before
// 1970 or after 9999 becomes the nearest of these, so that times can be reckoned with.
time_t modified_time(const struct stat& st);

class LogReader {
public:
    // Larger than any frame or chunk.
    static constexpr size_t WINDOW = 256 * 1024;

    LogReader() = default;
    ~LogReader();
    LogReader(const LogReader&) = delete;
    LogReader& operator=(const LogReader&) = delete;

    // Opens a regular file. When follow is true, links are followed, pipes are read to their end,
    // and "-" is standard input. False, with errno, on failure.
    bool open(const std::string& path, bool follow);

    // Of the file or, of a pipe, what has been read so far.
    uint64_t size() const { return m_piped ? m_offset + (m_end - m_start) : m_size; }
    // Goes on there, before anything was read. False, with nothing read, where the file has ended.
    bool seek(uint64_t offset);
    // Skips all that is left.
    void drain();
    time_t modified() const { return m_modified; }
    uint64_t offset() const { return m_offset; }  // of the next byte
    int error() const { return m_error; }         // errno of a failed read, else 0

    // All bytes in the window: at least want (at most WINDOW), unless the file ends before.
    // Valid until the next call.
    const uint8_t* peek(size_t want, size_t& got);
    // Skips n bytes of the window.
    void skip(size_t n);

private:
    void fill(size_t want);

    int m_fd = -1;
    int m_error = 0;
    bool m_piped = false;
    uint64_t m_size = 0;
    uint64_t m_left = 0;  // not yet read
    uint64_t m_offset = 0;
    time_t m_modified = 0;
    std::vector<uint8_t> m_window;
    size_t m_start = 0;
    size_t m_end = 0;
};

#endif  // KESTLOG_LOGREADER_H_
