// SPDX-License-Identifier: Apache-2.0
// The header before each chunk in the audio DSP's log files: it tells the chunk's kind
// and length, so that a decoder can separate log, PCM and dump data. 20 bytes,
// little-endian.
#ifndef CHANNELS_DSPCHUNKHEADER_H_
#define CHANNELS_DSPCHUNKHEADER_H_

#include <stddef.h>
#include <stdint.h>

constexpr uint8_t DSP_CHUNK_FLAG = 0x7E;  // each of the header's first four bytes
constexpr uint8_t DSP_CHUNK_TYPE = 0x9D;
constexpr uint8_t DSP_CHUNK_SUB_TYPE = 0x40;  // ORed to the kind

// Kinds of chunks. Nothing has kind 1.
constexpr uint8_t DSP_CHUNK_LOG = 0;
constexpr uint8_t DSP_CHUNK_DUMP = 2;
constexpr uint8_t DSP_CHUNK_PCM = 3;

struct DspChunkHeader {
    uint8_t flags[4];   // DSP_CHUNK_FLAG
    uint16_t len;       // data length + 16
    uint16_t reserved;  // 0
    uint16_t mark;      // 0x5A5A
    uint16_t checksum;  // of len and mark
    uint32_t seq_num;   // one sequence over all kinds
    uint16_t diag_len;  // data length + 8
    uint8_t type;       // DSP_CHUNK_TYPE
    uint8_t sub_type;   // DSP_CHUNK_SUB_TYPE and the kind
};
constexpr size_t DSP_CHUNK_HEADER_LEN = 20;
static_assert(sizeof(DspChunkHeader) == DSP_CHUNK_HEADER_LEN, "20 bytes on the medium");

// The most data bytes of a chunk: what one read takes. A dump is read to its end, so its last chunk
// has fewer and the others have as many.
constexpr size_t DSP_CHUNK_MAX_DATA = 32768 - DSP_CHUNK_HEADER_LEN;

constexpr uint16_t DSP_CHUNK_MARK = 0x5A5A;

// The checksum field for a chunk of that many data bytes.
uint16_t dsp_chunk_checksum(size_t data_len);

// The header of a chunk.
DspChunkHeader make_dsp_chunk_header(size_t data_len, uint8_t kind, uint32_t seq_num);

#endif  // CHANNELS_DSPCHUNKHEADER_H_
