// SPDX-License-Identifier: Apache-2.0

#include "kestlog/PcapngWriter.h"

#include <string.h>

namespace {

// Numbers have the byte order of the machine; readers see that from the section's magic.
constexpr uint32_t SECTION = 0x0a0d0d0a;
constexpr uint32_t INTERFACE = 1;
constexpr uint32_t PACKET = 6;
constexpr uint32_t BYTE_ORDER_MAGIC = 0x1a2b3c4d;
constexpr uint16_t VERSION[2] = {1, 0};
constexpr uint32_t LINK_TYPE = 147;  // USER0; 16 bits, and 16 reserved ones that are 0
constexpr uint32_t NO_LIMIT = 0;     // of the bytes of a packet

// Options of a block.
constexpr uint16_t OPT_END = 0;
constexpr uint16_t OPT_COMMENT = 1;
constexpr uint16_t SECTION_PROGRAM = 4;
constexpr uint16_t INTERFACE_NAME = 2;
constexpr uint16_t INTERFACE_DESCRIPTION = 3;
constexpr uint16_t INTERFACE_RESOLUTION = 9;
constexpr uint16_t PACKET_QUEUE = 6;

constexpr uint8_t SECONDS = 0;  // a resolution of 10^-0

constexpr size_t MAX_COMMENT = 4000;

}  // namespace

void PcapngWriter::put(const void* data, size_t len) {
    m_block.append(static_cast<const char*>(data), len);
    m_block.append((4 - len % 4) % 4, '\0');
}

void PcapngWriter::option(uint16_t code, const void* data, size_t len) {
    const uint16_t head[2] = {code, static_cast<uint16_t>(len)};
    put(head, sizeof(head));
    put(data, len);
}

void PcapngWriter::begin_block(uint32_t type) {
    m_block.clear();
    put32(type);
    put32(0);  // the length, once it is known
}

void PcapngWriter::end_block() {
    option(OPT_END, nullptr, 0);
    const uint32_t len = static_cast<uint32_t>(m_block.size() + sizeof(len));
    memcpy(&m_block[sizeof(len)], &len, sizeof(len));
    put32(len);
    m_good = m_good && m_out.write(m_block.data(), m_block.size());
}

void PcapngWriter::begin(const std::string& text) {
    const int64_t unknown_length = -1;
    begin_block(SECTION);
    put32(BYTE_ORDER_MAGIC);
    put(VERSION, sizeof(VERSION));
    put(&unknown_length, sizeof(unknown_length));
    option(SECTION_PROGRAM, "kestlog " KEST_VERSION);
    option(OPT_COMMENT, text);
    end_block();
}

void PcapngWriter::add_interface(const std::string& name, const std::string& description) {
    begin_block(INTERFACE);
    put32(LINK_TYPE);
    put32(NO_LIMIT);
    option(INTERFACE_NAME, name);
    option(INTERFACE_DESCRIPTION, description);
    option(INTERFACE_RESOLUTION, &SECONDS, sizeof(SECONDS));
    end_block();
}

void PcapngWriter::add_packet(uint32_t interface, uint32_t queue, int64_t seconds,
                              const uint8_t* data, size_t len) {
    end_packet();
    const uint64_t time = static_cast<uint64_t>(seconds);
    begin_block(PACKET);
    put32(interface);
    put32(static_cast<uint32_t>(time >> 32));
    put32(static_cast<uint32_t>(time));
    put32(static_cast<uint32_t>(len));  // in the capture
    put32(static_cast<uint32_t>(len));  // as it was
    put(data, len);
    m_queue = queue;
    m_packet_open = true;
}

void PcapngWriter::comment(const std::string& text) {
    if (m_comment.size() + text.size() <= MAX_COMMENT) {
        m_comment += (m_comment.empty() ? "" : "; ") + text;
    }
}

void PcapngWriter::end_packet() {
    if (!m_packet_open) {
        return;
    }
    m_packet_open = false;
    option(PACKET_QUEUE, &m_queue, sizeof(m_queue));
    if (!m_comment.empty()) {
        option(OPT_COMMENT, m_comment);
        m_comment.clear();
    }
    end_block();
}

bool PcapngWriter::finish() {
    end_packet();
    return m_good;
}
