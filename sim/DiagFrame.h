// SPDX-License-Identifier: Apache-2.0
// The frames of the diag devices, as a CP writes and reads them: a flag byte, the escaped
// body (an 8-byte header and the payload) and a flag byte.
#ifndef SIM_DIAGFRAME_H_
#define SIM_DIAGFRAME_H_

#include <stddef.h>
#include <stdint.h>

#include <vector>

struct DiagFrame {
    uint32_t sequence = 0;
    uint8_t type = 0;
    uint8_t sub_type = 0;
    std::vector<uint8_t> payload;

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
