// SPDX-License-Identifier: Apache-2.0
// What a CP has logged, read from its log files as one stream: without time records. Reads
// block by block, so a tree of any size needs no memory.
#ifndef SIM_RECORDEDSTREAM_H_
#define SIM_RECORDEDSTREAM_H_

#include <string>
#include <vector>

#include "sim/ByteStream.h"
#include "sim/RecordedCard.h"

class RecordedStream : public ByteStream {
public:
    // The CP must outlive the stream.
    explicit RecordedStream(const RecordedCp& cp) : m_cp(cp) {}
    ~RecordedStream() override { close_file(); }
    RecordedStream(const RecordedStream&) = delete;
    RecordedStream& operator=(const RecordedStream&) = delete;

    size_t read(uint8_t* dst, size_t len) override;
    // Bytes read so far, with those that a file of the card no longer has.
    uint64_t position() const { return m_position; }
    // A line for people for each file that cannot be read, or not to its end.
    const std::vector<std::string>& problems() const { return m_problems; }

private:
    void close_file();

    const RecordedCp& m_cp;
    size_t m_file = 0;    // index of the current file
    uint64_t m_done = 0;  // bytes of it
    int m_fd = -1;
    uint64_t m_position = 0;
    std::vector<std::string> m_problems;
};

#endif  // SIM_RECORDEDSTREAM_H_
