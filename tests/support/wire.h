// SPDX-License-Identifier: Apache-2.0
// Bytes as the CPs send them.
#ifndef TESTS_SUPPORT_WIRE_H_
#define TESTS_SUPPORT_WIRE_H_

#include <string>

inline std::string escaped(const std::string& body) {
    std::string out;
    for (char c : body) {
        if (c == '\x7d' || c == '\x7e') {
            out += '\x7d';
            c = static_cast<char>(c ^ 0x20);
        }
        out += c;
    }
    return out;
}

inline std::string raw_frame(const std::string& body) {
    return "\x7e" + escaped(body) + "\x7e";
}

inline std::string frame(int type, int sub_type, const std::string& payload = "") {
    std::string body(4, '\0');
    for (size_t value : {(payload.size() + 8) & 0xff, (payload.size() + 8) >> 8,
                         static_cast<size_t>(type), static_cast<size_t>(sub_type)}) {
        body += static_cast<char>(value);
    }
    return raw_frame(body + payload);
}

const std::string END_TEXT = "\nmodem_memdump_finish";

// The frame that ends a dump; its header does not matter.
inline std::string end_marker() {
    return raw_frame("\x7e\x7d\x01\x02\x03\x04\x05\x06" + END_TEXT);
}

#endif  // TESTS_SUPPORT_WIRE_H_
