// SPDX-License-Identifier: Apache-2.0
// Where the frames of a log end, found 64 bytes at a time: to look for each flag and each escape
// on its own takes longer than to read the bytes. For whoever goes through a file from its start to
// its end and only counts. Owned by the scan of that file.
#ifndef KESTLOG_FRAMEINDEX_H_
#define KESTLOG_FRAMEINDEX_H_

#include <stddef.h>
#include <stdint.h>
#include <string.h>

#include <vector>

#include "channels/DiagFrameParser.h"

class FrameIndex {
public:
    // What DiagFrameParser::measure() says of the frame at data, which is at this offset of the
    // file; len bytes are there. Offsets must not fall from call to call.
    size_t measure(const uint8_t* data, size_t len, uint64_t offset, DiagHeader& header,
                   size_t& body_len) {
        if ((offset == m_next && m_at < m_count) || seek(data, len, offset)) {
            const End end = m_ends[m_at++];
            const uint64_t size = m_base + end.flag + 1 - offset;
            const uint32_t escapes = end.escapes - m_escapes;
            m_escapes = end.escapes;
            m_next = offset + size;
            if (size <= len && is_plain(data, size, escapes)) {
                memcpy(&header, data + 1, sizeof(header));
                body_len = static_cast<size_t>(size) - 2 - escapes;
                return static_cast<size_t>(size);
            }
        }
        return DiagFrameParser::measure(data, len, header, body_len);
    }

private:
    // Of a frame that is followed by the opening flag of the next one.
    struct End {
        uint32_t flag;     // the closing one, from m_base on
        uint32_t escapes;  // before it, and ODD for what needs a closer look
    };
    static constexpr uint32_t ODD = 65536;

    static bool is_plain(const uint8_t* data, uint64_t size, uint32_t escapes) {
        if (size < sizeof(DiagHeader) + 2 + escapes || data[size - 2] == DiagFrameParser::ESCAPE) {
            return false;
        }
        // No byte of the header is an escape: none is 0 after the XOR.
        constexpr uint64_t ONES = 0x0101010101010101;
        uint64_t head;
        memcpy(&head, data + 1, sizeof(head));
        head ^= DiagFrameParser::ESCAPE * ONES;
        return ((head - ONES) & ~head & (ONES << 7)) == 0;
    }

    static bool usable();
    bool seek(const uint8_t* data, size_t len, uint64_t offset);
    void build(const uint8_t* data, size_t len);

    std::vector<End> m_ends;  // in the block that was looked at last
    size_t m_count = 0;
    size_t m_at = 0;
    uint64_t m_base = 0;     // offset of the block
    uint64_t m_end = 0;      // where the next block is due
    uint64_t m_next = 0;     // offset of the frame that ends at m_at
    uint32_t m_escapes = 0;  // before it
};

#endif  // KESTLOG_FRAMEINDEX_H_
