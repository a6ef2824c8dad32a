// SPDX-License-Identifier: Apache-2.0
// Checks one CP's log against the stream that was fed. The contents of its files are
// added in any order; every file says by its content which part of the stream it holds.
// The result tells apart what the quota trimmed (deleted files that were still read),
// what is lost, what is there twice and what is not of the stream at all.
#ifndef SIM_STREAMCHECK_H_
#define SIM_STREAMCHECK_H_

#include <stddef.h>
#include <stdint.h>

#include <string>
#include <vector>

#include "sim/SimStream.h"

class StreamCheck {
public:
    static constexpr size_t RECORD_SIZE = 16;       // time record at the head of a modem file
    static constexpr uint64_t BUFFER_SIZE = 65536;  // of the service, for each log file

    struct Gap {
        uint64_t start;
        uint64_t end;
    };
    struct Result {
        std::vector<Gap> gaps;  // what is lost, in order
        uint64_t fed = 0;
        uint64_t kept = 0;     // bytes of the stream in files that are there
        uint64_t trimmed = 0;  // bytes of the stream in files that were deleted
        uint64_t lost = 0;     // missing between bytes that are there
        uint64_t doubled = 0;  // there more than once
        uint64_t foreign = 0;  // not of the stream
        uint64_t tail = 0;     // read by the service, missing behind the last byte there
        uint64_t unread = 0;   // fed, but still in the device
        uint64_t first_lost = 0;
        uint64_t first_doubled = 0;
        unsigned files = 0;
        unsigned trimmed_files = 0;
        unsigned records = 0;     // files that begin with a time record
        unsigned misordered = 0;  // pieces that stand in front of older ones

        // Nothing lost, doubled, strange or out of order; the tail may be as long as what
        // the service holds in its buffer when it is stopped.
        bool ok() const {
            return lost == 0 && doubled == 0 && foreign == 0 && misordered == 0 &&
                   tail < BUFFER_SIZE;
        }
        // One line for people.
        std::string text() const;
    };

    explicit StreamCheck(const SimStream& stream) : m_stream(stream) {}

    // Adds one file's content (an empty file does not count); trimmed when the file is no
    // longer there. Gives the stream position of its first byte, UINT64_MAX without one.
    uint64_t add_file(const uint8_t* data, size_t len, bool trimmed);
    // The number order of the files of a directory does not follow the stream.
    void add_misordered() { ++m_result.misordered; }
    // Of the bytes fed, the last unread ones never left the device.
    Result result(uint64_t fed, uint64_t unread = 0) const;

private:
    struct Piece {
        uint64_t start;
        uint64_t len;
        bool trimmed;
    };

    const SimStream m_stream;
    std::vector<Piece> m_pieces;
    Result m_result;
};

#endif  // SIM_STREAMCHECK_H_
