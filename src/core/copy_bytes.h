// SPDX-License-Identifier: Apache-2.0
// The one loop that copies from a descriptor to another.
#ifndef CORE_COPY_BYTES_H_
#define CORE_COPY_BYTES_H_

#include <stddef.h>
#include <stdint.h>

// Copies up to limit bytes, or until src ends, through the caller's buffer. copied counts what
// reached dst, also before a failure. 0; with errno -1 when src cannot be read, or
// COPY_NOT_TAKEN when dst cannot be written, ENOSPC when it took less than it was given.
constexpr int COPY_NOT_TAKEN = -2;
int copy_bytes(int src, int dst, uint8_t* buffer, size_t buffer_size, uint64_t limit,
               uint64_t& copied);

#endif  // CORE_COPY_BYTES_H_
