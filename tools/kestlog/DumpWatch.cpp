// SPDX-License-Identifier: Apache-2.0

#include "kestlog/DumpWatch.h"

#include <string.h>

#include <algorithm>

#include "kestlog/FileScan.h"

void DumpWatch::read(LogReader& in, const std::string& dir, uint64_t* known, const Visitor& visit) {
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
            const uint64_t skipped = skip_to_chunk(in);
            if (in.peek(1, got), got == 0) {
                // A chunk may begin in the last bytes.
                *known = in.offset() - std::min<uint64_t>(skipped, sizeof(header) - 1);
                return;
            }
            continue;
        }
        in.peek(sizeof(header) + len, got);
        if (got < sizeof(header) + len) {
            return;
        }
        in.skip(sizeof(header) + len);
        take(header, dir, len, visit);
    }
}

void DumpWatch::take(const DspChunkHeader& header, const std::string& dir, size_t len,
                     const Visitor& visit) {
    const bool of_dump = chunk_kind(header) == CK_DUMP;
    const int32_t missing = m_follows ? static_cast<int32_t>(header.seq_num - m_next) : 0;
    // Numbers that go back are those of a new run of the service, as are others in a new set.
    // What another kind follows behind a gap has ended in the gap.
    const bool anew = missing < 0 || (missing > 0 && (dir != m_dir || !of_dump));
    m_begun = m_begun && !anew;
    m_follows = true;
    m_next = header.seq_num + 1;
    m_dir = dir;
    if (!of_dump) {
        return;
    }
    if (!m_begun) {
        m_bytes = 0;
        visit(false, 0);
    }
    m_bytes += len;
    m_begun = len == DSP_CHUNK_MAX_DATA;
    if (!m_begun) {
        visit(true, m_bytes);
    }
}
