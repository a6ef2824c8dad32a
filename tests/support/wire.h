// SPDX-License-Identifier: Apache-2.0
// Bytes as the CPs send them.
#ifndef TESTS_SUPPORT_WIRE_H_
#define TESTS_SUPPORT_WIRE_H_

#include <string>
#include <vector>

#include "sim/DiagFrame.h"

inline std::string raw_frame(const std::string& body) {
    const std::vector<uint8_t> wire = DiagFrame::enclose({body.begin(), body.end()});
    return {wire.begin(), wire.end()};
}

inline std::string frame(int type, int sub_type, const std::string& payload = "",
                         uint32_t seq = 0) {
    const DiagFrame sent = {seq, static_cast<uint8_t>(type), static_cast<uint8_t>(sub_type),
                            std::vector<uint8_t>(payload.begin(), payload.end())};
    const std::vector<uint8_t> wire = sent.encode();
    return {wire.begin(), wire.end()};
}

const std::string END_TEXT = "\nmodem_memdump_finish";

// The frame that ends a dump; its header does not matter.
inline std::string end_marker() {
    return raw_frame("\x7e\x7d\x01\x02\x03\x04\x05\x06" + END_TEXT);
}

enum ChunkKind { LOG = 0x40, DUMP = 0x42, PCM = 0x43 };

// A chunk of the audio DSP as its log file holds it, written down byte by byte.
inline std::string chunk(uint32_t seq, ChunkKind kind, const std::string& data) {
    const uint32_t n = static_cast<uint32_t>(data.size());
    const uint32_t sum = n + 0x5a6a;
    const uint32_t check = ~((sum >> 16) + (sum & 0xffff));
    std::string head = "\x7e\x7e\x7e\x7e";
    for (uint32_t half : {n + 16, 0u, 0x5a5au, check, seq & 0xffff, seq >> 16, n + 8}) {
        head += static_cast<char>(half & 0xff);
        head += static_cast<char>(half >> 8 & 0xff);
    }
    return head + '\x9d' + static_cast<char>(kind) + data;
}

#endif  // TESTS_SUPPORT_WIRE_H_
