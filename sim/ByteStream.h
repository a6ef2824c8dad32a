// SPDX-License-Identifier: Apache-2.0
// Bytes that are read one after the other.
#ifndef SIM_BYTESTREAM_H_
#define SIM_BYTESTREAM_H_

#include <stddef.h>
#include <stdint.h>

class ByteStream {
public:
    virtual ~ByteStream() = default;
    // Up to len further bytes; 0 at the end.
    virtual size_t read(uint8_t* dst, size_t len) = 0;
};

#endif  // SIM_BYTESTREAM_H_
