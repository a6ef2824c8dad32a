// SPDX-License-Identifier: Apache-2.0
// The least that a log path has to do with the bytes it has read: the file is looked for, the
// bytes are staged and written out together with what does not fit, a full file is followed by
// a new one, all older ones are renumbered, and what the quota does not allow is deleted. It
// checks nothing else and handles no failure.
#ifndef BENCH_FLOORLOG_H_
#define BENCH_FLOORLOG_H_

#include <stddef.h>
#include <stdint.h>

#include <deque>
#include <memory>
#include <string>

class FloorLog {
public:
    static constexpr size_t STAGING = 65536;

    // Calls of each kind so far.
    struct Calls {
        unsigned long access = 0;
        unsigned long staged = 0;  // bytes
        unsigned long writev = 0;
        unsigned long open = 0;
        unsigned long rename = 0;
        unsigned long unlink = 0;
    };

    // Its files are in this directory, an existing one without logs. Sizes are in bytes.
    FloorLog(const std::string& dir, uint64_t file_size, uint64_t quota);
    ~FloorLog();
    FloorLog(const FloorLog&) = delete;
    FloorLog& operator=(const FloorLog&) = delete;

    void write(const uint8_t* data, size_t len);
    const Calls& calls() const { return m_calls; }

    // The name of the file with this number; 0 is the newest.
    static std::string file_path(const std::string& dir, unsigned number);

private:
    void write_out(const uint8_t* data, size_t len);
    void start_file();
    void trim();
    void rename_file(unsigned from, unsigned to);

    const std::string m_dir;
    const uint64_t m_file_size;
    const uint64_t m_quota;
    const std::string m_current;  // always number 0
    const std::unique_ptr<uint8_t[]> m_staging;
    size_t m_staged = 0;
    int m_fd = -1;
    std::deque<uint64_t> m_sizes;  // the oldest first
    uint64_t m_total = 0;
    Calls m_calls;
};

#endif  // BENCH_FLOORLOG_H_
