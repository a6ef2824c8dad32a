// SPDX-License-Identifier: Apache-2.0
// The I/Q memory device: what its driver promises.
#ifndef IQ_IQ_MEM_H_
#define IQ_IQ_MEM_H_

#include <stddef.h>
#include <stdint.h>

// Length of the mapping of the device, which holds every buffer that it reports.
constexpr size_t IQ_MEM_SIZE = 128u << 20;

constexpr unsigned long CMD_SET_IQ_CH_TYPE = 0x80;  // int by value: 1 in use, 0 not in use
constexpr unsigned long CMD_GET_IQ_BUF_INFO = 0;    // IqBufInfo*: where the filled buffer lies
constexpr unsigned long CMD_RELEASE_IQ_BUF = 0x82;  // the driver may fill the next buffer

struct IqBufInfo {
    uint32_t offset;  // of the data, from the start of the mapping
    uint32_t len;     // of the data
};
static_assert(sizeof(IqBufInfo) == 8, "the driver fills in 8 bytes");

#endif  // IQ_IQ_MEM_H_
