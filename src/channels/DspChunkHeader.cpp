// SPDX-License-Identifier: Apache-2.0

#include "channels/DspChunkHeader.h"

#include <string.h>

namespace {

constexpr size_t LEN_EXTRA = 16;      // what follows the length field's own group
constexpr size_t DIAG_LEN_EXTRA = 8;  // the part of the header that a diag frame has too

}  // namespace

uint16_t dsp_chunk_checksum(size_t data_len) {
    const uint32_t sum = static_cast<uint32_t>(data_len + LEN_EXTRA) + DSP_CHUNK_MARK;
    const uint32_t folded = (sum >> 16) + (sum & 0xFFFF);
    return static_cast<uint16_t>(~folded & 0xFFFF);
}

DspChunkHeader make_dsp_chunk_header(size_t data_len, uint8_t kind, uint32_t seq_num) {
    DspChunkHeader header;
    memset(header.flags, DSP_CHUNK_FLAG, sizeof(header.flags));
    header.len = static_cast<uint16_t>(data_len + LEN_EXTRA);
    header.reserved = 0;
    header.mark = DSP_CHUNK_MARK;
    header.checksum = dsp_chunk_checksum(data_len);
    header.seq_num = seq_num;
    header.diag_len = static_cast<uint16_t>(data_len + DIAG_LEN_EXTRA);
    header.type = DSP_CHUNK_TYPE;
    header.sub_type = static_cast<uint8_t>(kind | DSP_CHUNK_SUB_TYPE);
    return header;
}
