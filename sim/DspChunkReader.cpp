// SPDX-License-Identifier: Apache-2.0

#include "sim/DspChunkReader.h"

#include <string.h>

#include <algorithm>

namespace {

// The largest chunk and the header behind it fit, wherever they begin.
const size_t MIN_AHEAD = DspHeader::SIZE + DspHeader::MAX_DATA + DspHeader::SIZE;
const size_t READ_STEP = 256 << 10;

}  // namespace

// False when nothing is left.
bool DspChunkReader::fill() {
    if (!m_ended && unread() < MIN_AHEAD) {
        m_bytes.erase(m_bytes.begin(), m_bytes.begin() + static_cast<std::ptrdiff_t>(m_at));
        m_at = 0;
        while (m_bytes.size() < MIN_AHEAD) {
            const size_t old = m_bytes.size();
            m_bytes.resize(old + READ_STEP);
            const size_t n = m_stream.read(m_bytes.data() + old, READ_STEP);
            m_bytes.resize(old + n);
            if (n == 0) {
                m_ended = true;
                break;
            }
        }
    }
    return unread() > 0;
}

bool DspChunkReader::header_at(size_t offset, DspHeader* header) const {
    return unread() >= offset + DspHeader::SIZE && header->read(m_bytes.data() + m_at + offset) &&
           header->right_form && header->right_sum && header->source != DspSource::UNKNOWN;
}

// Offset of the first header that begins in the range; its end if there is none.
size_t DspChunkReader::find_header(size_t from, size_t to) const {
    DspHeader header;
    const uint8_t* bytes = m_bytes.data() + m_at;
    for (; from < to; ++from) {
        const void* flag = memchr(bytes + from, 0x7E, to - from);
        if (!flag) {
            return to;
        }
        from = static_cast<size_t>(static_cast<const uint8_t*>(flag) - bytes);
        if (header_at(from, &header)) {
            return from;
        }
    }
    return to;
}

bool DspChunkReader::next(DspSource* source, std::vector<uint8_t>* data) {
    while (fill()) {
        DspHeader header;
        DspHeader behind;
        if (!header_at(0, &header)) {
            // One that is not whole yet is looked at again.
            const size_t skip = find_header(1, unread() - (m_ended ? 0 : DspHeader::SIZE - 1));
            m_foreign += skip;
            m_at += skip;
            continue;
        }
        const size_t whole = DspHeader::SIZE + header.data_size;
        size_t end = std::min(whole, unread());
        // The next header stands where this chunk ends, or in it when it is cut. Data may look
        // like a header: one in a chunk counts only when there is none where it has to be.
        if (whole != unread() && !header_at(whole, &behind)) {
            end = find_header(DspHeader::SIZE, end);
        }
        if (end < whole) {
            ++m_cut;
            m_missing += whole - end;
        }
        const uint8_t* chunk = m_bytes.data() + m_at;
        data->assign(chunk + DspHeader::SIZE, chunk + end);
        m_at += end;
        if (!data->empty()) {
            *source = header.source;
            return true;
        }
    }
    return false;
}

std::vector<std::string> DspChunkReader::problems() const {
    std::vector<std::string> lines = m_stream.problems();
    if (m_cut > 0) {
        lines.push_back("agdsp: " + std::to_string(m_cut) + " chunks are cut off, " +
                        std::to_string(m_missing) + " bytes of them are missing");
    }
    if (m_foreign > 0) {
        lines.push_back("agdsp: " + std::to_string(m_foreign) + " bytes belong to no chunk");
    }
    return lines;
}

size_t DspSourceStream::read(uint8_t* dst, size_t len) {
    DspSource source = m_source;
    while (m_at == m_data.size()) {
        m_at = 0;
        if (!m_reader.next(&source, &m_data)) {
            m_data.clear();
            return 0;
        }
        m_at = source == m_source ? 0 : m_data.size();
    }
    const size_t n = std::min(len, m_data.size() - m_at);
    memcpy(dst, m_data.data() + m_at, n);
    m_at += n;
    return n;
}
