// Reads a file front to back through a window of fixed size, however large the file is.
// What the file held when it was opened is all that is read, so that one that is being
// written comes to an end.
#ifndef KESTLOG_LOGREADER_H_
#define KESTLOG_LOGREADER_H_

#include <stddef.h>
#include <stdint.h>
#include <time.h>

#include <string>
#include <vector>

class LogReader {
public:
    // More than any frame or chunk takes.
    static constexpr size_t WINDOW = 256 * 1024;

    LogReader() = default;
    ~LogReader();
    LogReader(const LogReader&) = delete;
    LogReader& operator=(const LogReader&) = delete;

    // Opens a regular file; a link only with follow. False with errno.
    bool open(const std::string& path, bool follow);

    uint64_t size() const { return m_size; }
    time_t modified() const { return m_modified; }
    uint64_t offset() const { return m_offset; }  // of the next byte
    int error() const { return m_error; }         // errno of a failed read, else 0

    // All bytes in the window, at least want of them unless the file ends before; want
    // is at most WINDOW. Valid until the next call.
    const uint8_t* peek(size_t want, size_t& got);
    // Passes over n bytes of the window.
    void skip(size_t n);

private:
    int m_fd = -1;
    int m_error = 0;
    uint64_t m_size = 0;
    uint64_t m_left = 0;  // not yet read
    uint64_t m_offset = 0;
    time_t m_modified = 0;
    std::vector<uint8_t> m_window;
    size_t m_start = 0;
    size_t m_end = 0;
};

#endif  // KESTLOG_LOGREADER_H_
