// SPDX-License-Identifier: Apache-2.0
// Compares what was fed with what the service wrote of it.
#ifndef SIM_COMPARE_STREAMS_H_
#define SIM_COMPARE_STREAMS_H_

#include <string>

#include "sim/ByteStream.h"

struct StreamDifference {
    bool equal = false;
    uint64_t same = 0;     // bytes up to the first difference
    uint64_t written = 0;  // all bytes that were written

    // One line for people.
    std::string text(const std::string& name, uint64_t fed) const;
};

// The copy must be the first fed bytes of the original, no less and no more.
StreamDifference compare_streams(ByteStream& original, ByteStream& copy, uint64_t fed);

#endif  // SIM_COMPARE_STREAMS_H_
