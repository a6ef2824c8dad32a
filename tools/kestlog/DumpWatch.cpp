// SPDX-License-Identifier: Apache-2.0

#include "kestlog/DumpWatch.h"

#include <string.h>

#include "channels/DspChunkHeader.h"
#include "kestlog/FileScan.h"

void DumpWatch::read(LogReader& in, uint64_t* known, const Visitor& visit) {
    if (!in.seek(*known)) {
        return;
    }
    for (DspChunkHeader header;; *known = in.offset()) {
        size_t got;
        size_t len;
        const uint8_t* const data = in.peek(sizeof(header), got);
        if (got < sizeof(header)) {
            return;
        }
        memcpy(&header, data, sizeof(header));
        if (chunk_fault(header, &len)) {
            *known = UINT64_MAX;
            return;
        }
        in.peek(sizeof(header) + len, got);
        if (got < sizeof(header) + len) {
            return;
        }
        in.skip(sizeof(header) + len);
        if (chunk_kind(header) != CK_DUMP) {
            continue;
        }
        // Numbers that go back are those of a new run of the service.
        if (!m_begun || static_cast<int32_t>(header.seq_num - m_seq) < 0) {
            m_bytes = 0;
            visit(false, 0);
        }
        m_seq = header.seq_num;
        m_bytes += len;
        m_begun = len == DSP_CHUNK_MAX_DATA;
        if (!m_begun) {
            visit(true, m_bytes);
        }
    }
}
