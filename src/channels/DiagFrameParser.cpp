// SPDX-License-Identifier: Apache-2.0

#include "channels/DiagFrameParser.h"

#include <string.h>

#include <algorithm>

namespace {

constexpr uint8_t ESCAPE_XOR = 0x20;

bool is_special(uint8_t byte) {
    return byte == DiagFrameParser::FLAG || byte == DiagFrameParser::ESCAPE;
}

}  // namespace

void DiagFrameParser::init() {
    m_state = HUNTING;
    m_len = 0;
    m_body_raw = 0;
}

void DiagFrameParser::append(const uint8_t* bytes, size_t len) {
    if (m_len + len <= MAX_FRAME) {
        memcpy(m_frame + m_len, bytes, len);
        m_len += static_cast<uint32_t>(len);
    } else if (m_len <= MAX_FRAME) {
        memcpy(m_frame + m_len, bytes, MAX_FRAME - m_len);
        m_len = MAX_FRAME + 1;
    }
}

void DiagFrameParser::append_escaped(uint8_t byte) {
    byte ^= ESCAPE_XOR;
    append(&byte, 1);
}

// Decodes bytes of a body that has no flag in it; the bytes used, which is all but a last
// escape that is taken with the next input.
size_t DiagFrameParser::take_body(const uint8_t* data, size_t len) {
    size_t pos = 0;
    while (pos < len) {
        const void* const found = memchr(data + pos, ESCAPE, len - pos);
        const size_t plain =
            found ? static_cast<size_t>(static_cast<const uint8_t*>(found) - data) : len;
        append(data + pos, plain - pos);
        if (!found) {
            break;
        }
        if (plain + 1 == len) {
            return plain;
        }
        append_escaped(data[plain + 1]);
        pos = plain + 2;
    }
    return len;
}

bool DiagFrameParser::unescape(const uint8_t* data, size_t len, uint8_t*& frame, size_t& frame_len,
                               size_t& consumed) {
    frame = nullptr;
    frame_len = 0;
    size_t pos = 0;
    while (pos < len) {
        switch (m_state) {
            case HUNTING: {
                const void* const flag = memchr(data + pos, FLAG, len - pos);
                if (!flag) {
                    consumed = len;
                    return false;
                }
                pos = static_cast<size_t>(static_cast<const uint8_t*>(flag) - data) + 1;
                m_state = AFTER_FLAG;
                break;
            }
            case AFTER_FLAG:
                if (data[pos] == FLAG) {
                    ++pos;
                } else {
                    m_state = IN_FRAME;
                }
                break;
            case ESCAPE_PENDING:
                m_state = IN_FRAME;
                append_escaped(data[pos++]);
                ++m_body_raw;
                break;
            case IN_FRAME: {
                const void* const flag = memchr(data + pos, FLAG, len - pos);
                const size_t end =
                    flag ? static_cast<size_t>(static_cast<const uint8_t*>(flag) - data) : len;
                const size_t used = take_body(data + pos, end - pos);
                const bool escape = used < end - pos;
                m_body_raw += end - pos;
                pos = end;
                if (escape) {
                    m_state = ESCAPE_PENDING;  // what follows is no flag, whatever it is
                } else if (flag) {
                    const size_t body_len = m_len;
                    m_raw_size = m_body_raw + 2;
                    ++pos;
                    init();
                    if (body_len > MAX_FRAME && m_overlong == Overlong::DROP) {
                        break;
                    }
                    frame = m_frame;
                    frame_len = std::min(body_len, MAX_FRAME);
                    consumed = pos;
                    return true;
                }
                break;
            }
        }
    }
    consumed = len;
    return false;
}

size_t DiagFrameParser::measure(const uint8_t* data, size_t len, DiagHeader& header,
                                size_t& body_len) {
    const void* const flag = len > 1 && data[0] == FLAG
                                 ? memchr(data + 1, FLAG, std::min(len - 1, MAX_FRAME * 2 + 1))
                                 : nullptr;
    if (!flag) {
        return 0;
    }
    const uint8_t* const body = data + 1;
    const size_t raw = static_cast<size_t>(static_cast<const uint8_t*>(flag) - body);
    const uint8_t* const end = body + raw;
    size_t escapes = 0;
    const uint8_t* pos = body;
    const uint8_t* first = end;  // escape
    while (const void* const found = memchr(pos, ESCAPE, static_cast<size_t>(end - pos))) {
        first = escapes++ ? first : static_cast<const uint8_t*>(found);
        pos = static_cast<const uint8_t*>(found) + 2;
        if (pos > end) {
            return 0;  // the flag is escaped
        }
    }
    body_len = raw - escapes;
    if (body_len < sizeof(header) || body_len > MAX_FRAME) {
        return 0;
    }
    if (first >= body + sizeof(header)) {
        memcpy(&header, body, sizeof(header));
    } else {
        header = read_header(body);
    }
    return raw + 2;
}

DiagHeader DiagFrameParser::read_header(const uint8_t* body) {
    uint8_t head[sizeof(DiagHeader)];
    for (uint8_t& byte : head) {
        const bool escaped = *body == ESCAPE;
        body += escaped;
        byte = escaped ? *body ^ ESCAPE_XOR : *body;
        ++body;
    }
    DiagHeader header;
    memcpy(&header, head, sizeof(header));
    return header;
}

size_t DiagFrameParser::escape(const uint8_t* src, size_t len, uint8_t* dst) {
    size_t n = 0;
    for (size_t i = 0; i < len; ++i) {
        if (is_special(src[i])) {
            dst[n++] = ESCAPE;
            dst[n++] = src[i] ^ ESCAPE_XOR;
        } else {
            dst[n++] = src[i];
        }
    }
    return n;
}

void DiagFrameParser::frame(uint8_t type, uint8_t sub_type, const uint8_t* payload,
                            size_t payload_len, uint8_t*& buf, size_t& len) {
    DiagHeader header;
    header.seq_num = 0;
    header.len = static_cast<uint16_t>(sizeof(header) + payload_len);
    header.type = type;
    header.sub_type = sub_type;
    uint8_t raw[sizeof(header)];
    memcpy(raw, &header, sizeof(header));

    buf = new uint8_t[(payload_len + sizeof(header)) * 2 + 2];
    len = 0;
    buf[len++] = FLAG;
    len += escape(raw, sizeof(raw), buf + len);
    if (payload && payload_len > 0) {
        len += escape(payload, payload_len, buf + len);
    }
    buf[len++] = FLAG;
}
