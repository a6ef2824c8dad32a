// SPDX-License-Identifier: Apache-2.0

#include "sim/StreamCheck.h"

#include <string.h>

#include <algorithm>

uint64_t StreamCheck::add_file(const uint8_t* data, size_t len, bool trimmed) {
    static const uint8_t RECORD_MAGIC[] = {0x78, 0x56, 0x34, 0x12};
    if (len == 0) {
        return UINT64_MAX;
    }
    ++(trimmed ? m_result.trimmed_files : m_result.files);
    size_t at = 0;
    if (len >= RECORD_SIZE && memcmp(data, RECORD_MAGIC, sizeof RECORD_MAGIC) == 0) {
        ++m_result.records;
        at = RECORD_SIZE;
    }
    uint64_t first = UINT64_MAX;
    uint64_t previous = 0;
    while (at < len) {
        size_t block;
        uint64_t pos;
        if (!m_stream.locate(data + at, len - at, &block, &pos)) {
            m_result.foreign += len - at;
            break;
        }
        // A piece may begin and end inside a block.
        const size_t before = m_stream.match_back(pos, data + at + block, block);
        const size_t behind = m_stream.match(pos, data + at + block, len - at - block);
        const Piece piece = {pos - before, before + behind, trimmed};
        m_result.foreign += block - before;
        if (first == UINT64_MAX) {
            first = piece.start;
        } else if (piece.start < previous) {
            ++m_result.misordered;
        }
        previous = piece.start;
        m_pieces.push_back(piece);
        at += block + behind;
    }
    return first;
}

StreamCheck::Result StreamCheck::result(uint64_t fed, uint64_t unread) const {
    std::vector<Piece> pieces = m_pieces;
    std::sort(pieces.begin(), pieces.end(),
              [](const Piece& a, const Piece& b) { return a.start < b.start; });
    Result r = m_result;
    r.fed = fed;
    r.unread = unread;
    uint64_t covered = 0;
    for (const Piece& p : pieces) {
        const uint64_t end = p.start + p.len;
        (p.trimmed ? r.trimmed : r.kept) += p.len;
        if (p.start > covered) {
            r.first_lost = r.lost == 0 ? covered : r.first_lost;
            r.lost += p.start - covered;
            r.gaps.push_back({covered, p.start});
        } else if (p.start < covered) {
            r.first_doubled = r.doubled == 0 ? p.start : r.first_doubled;
            r.doubled += std::min(end, covered) - p.start;
        }
        covered = std::max(covered, end);
    }
    // More than was taken from the device cannot come from this stream.
    const uint64_t taken = fed - unread;
    r.foreign += covered > taken ? covered - taken : 0;
    r.tail = covered < taken ? taken - covered : 0;
    return r;
}

std::string StreamCheck::Result::text() const {
    const auto bytes = [](uint64_t n) { return std::to_string(n) + " bytes"; };
    std::string s = ok() ? "OK:   " : "FAIL: ";
    s += bytes(fed) + " fed, " + bytes(kept) + " in " + std::to_string(files) + " files";
    if (trimmed_files > 0) {
        s += ", trimmed by quota: " + bytes(trimmed) + " in " + std::to_string(trimmed_files) +
             " files";
    }
    s += ", lost " + std::to_string(lost);
    if (lost > 0) {
        s += " (the first at position " + std::to_string(first_lost) + ")";
    }
    s += ", doubled " + std::to_string(doubled);
    if (doubled > 0) {
        s += " (the first at position " + std::to_string(first_doubled) + ")";
    }
    if (foreign > 0) {
        s += ", foreign " + bytes(foreign);
    }
    if (misordered > 0) {
        s += ", out of order " + std::to_string(misordered) + " times";
    }
    if (tail >= BUFFER_SIZE) {
        s += ", missing at the end " + bytes(tail) + " (more than the service buffers)";
    } else if (tail > 0) {
        s += ", still in the service's buffer when it was stopped: " + bytes(tail) +
             " (up to 65535 allowed)";
    }
    if (unread > 0) {
        s += ", left unread in the device: " + bytes(unread);
    }
    return s;
}
