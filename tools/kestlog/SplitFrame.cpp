// SPDX-License-Identifier: Apache-2.0

#include "kestlog/SplitFrame.h"

#include <fcntl.h>
#include <string.h>
#include <unistd.h>

#include <algorithm>

namespace {

// The longest frame in a file.
constexpr size_t MAX_RAW = 2 * DiagFrameParser::MAX_FRAME + 2;
// Most frames end within so many bytes of the next file.
constexpr size_t FIRST_LOOK = 4096;

// Bytes of a file, again; fewer when it has become shorter or cannot be read.
std::string read_at(const TreeFile& file, Links links, uint64_t offset, size_t len) {
    std::string bytes(len, '\0');
    const int fd = open_to_read(file.path().c_str(), links);
    size_t got = 0;
    for (ssize_t n; fd >= 0 && got < len; got += static_cast<size_t>(n)) {
        n = pread(fd, &bytes[got], len - got, static_cast<off_t>(offset + got));
        if (n <= 0) {
            break;
        }
    }
    if (fd >= 0) {
        close(fd);
    }
    bytes.resize(got);
    return bytes;
}

// What the file begins with behind its time record, up to the first flag; "" without one. A flag
// at once that is not followed by another opens a frame of the file's own.
std::string read_head(const TreeFile& file, Links links) {
    for (const size_t len : {FIRST_LOOK, MAX_RAW}) {
        const std::string bytes = read_at(file, links, 0, len);
        bool cut;
        const size_t record = time_record_len(reinterpret_cast<const uint8_t*>(bytes.data()),
                                              bytes.size(), file.name, &cut);
        const size_t flag = bytes.find(static_cast<char>(DiagFrameParser::FLAG), record);
        if (flag != std::string::npos) {
            const bool opens = flag == record && flag + 1 < bytes.size() &&
                               bytes[flag + 1] != static_cast<char>(DiagFrameParser::FLAG);
            return opens ? "" : bytes.substr(record, flag + 1 - record);
        }
        if (bytes.size() < len) {
            break;
        }
    }
    return "";
}

}  // namespace

bool SplitFrame::join(const TreeFile& file, uint64_t from, uint64_t size, const TreeFile& next,
                      Links links) {
    if (size <= from || size - from > MAX_RAW) {
        return false;
    }
    std::string bytes = read_at(file, links, from, static_cast<size_t>(size - from));
    const size_t tail = bytes.size();
    const std::string head = read_head(next, links);
    bytes += head;
    size_t used;
    m_parser.init();
    if (head.empty() ||
        !m_parser.unescape(reinterpret_cast<const uint8_t*>(bytes.data()), bytes.size(), m_body,
                           m_len, used) ||
        m_len < sizeof(m_header) || used <= tail || m_parser.raw_size() > used) {
        return false;
    }
    memcpy(&m_header, m_body, sizeof(m_header));
    if (m_header.len != m_len) {
        return false;
    }
    m_begin = from + used - m_parser.raw_size();
    m_heads[&next] = used - tail;
    return true;
}

size_t SplitFrame::take_head(const TreeFile& file) {
    const auto found = m_heads.find(&file);
    const size_t head = found == m_heads.end() ? 0 : found->second;
    if (head > 0) {
        m_heads.erase(found);
    }
    return head;
}

void SplitFrame::end_file(const TreeFile& file, uint64_t size, const TreeFile* next,
                          const PieceVisitor& visit, FileReport* report, Links links) {
    const size_t head = take_head(file);
    const uint64_t start = (report->has_record ? sizeof(TimeSyncRecord) : 0) + head;
    report->other -= std::min<uint64_t>(report->other, head);
    if (!next || report->chunked ||
        !join(file, std::max(report->tail, start), size, *next, links)) {
        return;
    }
    const uint64_t raw = size - m_begin;
    const size_t payload = m_len - sizeof(m_header);
    ++report->frames;
    report->payload += payload;
    report->other -= std::min(report->other, raw);
    if (visit) {
        visit({m_begin, static_cast<size_t>(raw), m_header.seq_num, m_header.len, m_header.type,
               m_header.sub_type, m_body + sizeof(m_header), payload, true, nullptr});
    }
}
