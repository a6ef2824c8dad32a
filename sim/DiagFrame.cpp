// SPDX-License-Identifier: Apache-2.0

#include "sim/DiagFrame.h"

#include <algorithm>

std::vector<uint8_t> DiagFrame::enclose(const std::vector<uint8_t>& body) {
    std::vector<uint8_t> out = {FLAG};
    out.reserve(body.size() + body.size() / 16 + 2);
    for (uint8_t byte : body) {
        if (must_escape(byte)) {
            out.push_back(ESCAPE);
            byte ^= ESCAPE_XOR;
        }
        out.push_back(byte);
    }
    out.push_back(FLAG);
    return out;
}

std::vector<uint8_t> DiagFrame::encode() const {
    const size_t size = HEADER_SIZE + payload.size();
    std::vector<uint8_t> body;
    for (int shift = 0; shift < 32; shift += 8) {
        body.push_back(static_cast<uint8_t>(sequence >> shift));
    }
    body.push_back(static_cast<uint8_t>(size));
    body.push_back(static_cast<uint8_t>(size >> 8));
    body.push_back(type);
    body.push_back(sub_type);
    body.insert(body.end(), payload.begin(), payload.end());
    return enclose(body);
}

bool DiagFrame::take(std::vector<uint8_t>& bytes, DiagFrame* frame) {
    for (;;) {
        auto start = std::find(bytes.begin(), bytes.end(), FLAG);
        while (start != bytes.end() && start + 1 != bytes.end() && start[1] == FLAG) {
            ++start;
        }
        bytes.erase(bytes.begin(), start);
        const auto end =
            bytes.empty() ? bytes.end() : std::find(bytes.begin() + 1, bytes.end(), FLAG);
        if (end == bytes.end()) {
            return false;
        }
        std::vector<uint8_t> body;
        for (auto it = bytes.begin() + 1; it != end; ++it) {
            const bool escaped = *it == ESCAPE && it + 1 != end;
            body.push_back(escaped ? static_cast<uint8_t>(*++it ^ ESCAPE_XOR) : *it);
        }
        bytes.erase(bytes.begin(), end + 1);
        if (body.size() >= HEADER_SIZE &&
            static_cast<size_t>(body[4] | body[5] << 8) == (body.size() & 0xffff)) {
            frame->sequence = static_cast<uint32_t>(body[0]) | static_cast<uint32_t>(body[1]) << 8 |
                              static_cast<uint32_t>(body[2]) << 16 |
                              static_cast<uint32_t>(body[3]) << 24;
            frame->type = body[6];
            frame->sub_type = body[7];
            frame->payload.assign(body.begin() + HEADER_SIZE, body.end());
            return true;
        }
    }
}
