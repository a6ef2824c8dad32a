// SPDX-License-Identifier: Apache-2.0
// The frames of the diag devices, as a CP writes and reads them: a flag byte, the escaped
// body (an 8-byte header and the payload) and a flag byte.
#ifndef SIM_DIAGFRAME_H_
#define SIM_DIAGFRAME_H_

#include <stddef.h>
#include <stdint.h>

#include <vector>

// What stands in the frames of the exchanges, from the co-processor's side.
constexpr uint8_t RING_BUFFER_TYPE = 0x3a;
constexpr uint8_t SLEEP_LOG_TYPE = 0x3b;
constexpr uint8_t SUB_REFUSED = 0x00;
constexpr uint8_t SUB_END = 0x01;
constexpr uint8_t SUB_DATA = 0x64;
constexpr char DUMP_REQUEST[] = "3\n";
constexpr char DUMP_END[] = "\nmodem_memdump_finish";      // of a modem, in a frame
constexpr char CHIP_DUMP_END[] = "corbet_memdump_finish";  // of the WCN chip, unframed

struct DiagFrame {
    static constexpr uint8_t FLAG = 0x7e;
    static constexpr uint8_t ESCAPE = 0x7d;
    static constexpr uint8_t ESCAPE_XOR = 0x20;
    static constexpr size_t HEADER_SIZE = 8;

    uint32_t sequence = 0;
    uint8_t type = 0;
    uint8_t sub_type = 0;
    std::vector<uint8_t> payload;

    static bool must_escape(uint8_t byte) { return byte == FLAG || byte == ESCAPE; }
    // The bytes on the wire.
    std::vector<uint8_t> encode() const;
    // A body of any content on the wire: escaped, between two flags.
    static std::vector<uint8_t> enclose(const std::vector<uint8_t>& body);
    // Takes the first whole frame from the bytes: fills *frame and removes the bytes up to
    // the frame's end. False when there is none yet; bytes in front of a flag are removed.
    // A body whose length field is wrong is skipped.
    static bool take(std::vector<uint8_t>& bytes, DiagFrame* frame);
};

#endif  // SIM_DIAGFRAME_H_
