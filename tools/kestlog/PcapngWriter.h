// SPDX-License-Identifier: Apache-2.0
// Writes a pcapng capture: one section, its interfaces, then packets. Their link type is
// USER0, their times are whole seconds, and no packet is cut. Texts must be UTF-8.
#ifndef KESTLOG_PCAPNGWRITER_H_
#define KESTLOG_PCAPNGWRITER_H_

#include <stddef.h>
#include <stdint.h>

#include <string>

#include "kestlog/OutputFile.h"

class PcapngWriter {
public:
    // Writes to out, which stays the caller's and is open as long as the writer is used.
    explicit PcapngWriter(OutputFile* out) : m_out(*out) {}

    // Begins the capture, with a comment on all of it.
    void begin(const std::string& comment);
    // Interfaces count from 0. All are added before the first packet: not every program takes
    // one later.
    void add_interface(const std::string& name, const std::string& description);
    // Seconds since 1970. The queue numbers the sources within an interface.
    void add_packet(uint32_t interface, uint32_t queue, int64_t seconds, const uint8_t* data,
                    size_t len);
    // Adds to the comment on the last packet. What is beyond the limit of a comment is left out.
    void comment(const std::string& text);
    // Writes what is left. False after any failed write; the OutputFile knows why.
    bool finish();
    bool good() const { return m_good; }

private:
    void begin_block(uint32_t type);
    void put(const void* data, size_t len);
    void put32(uint32_t value) { put(&value, sizeof(value)); }
    void option(uint16_t code, const void* data, size_t len);
    void option(uint16_t code, const std::string& text) { option(code, text.data(), text.size()); }
    void end_block();
    void end_packet();

    OutputFile& m_out;
    std::string m_block;  // the one being made; a packet's stays open for its comment
    std::string m_comment;
    uint32_t m_queue = 0;
    bool m_packet_open = false;
    bool m_good = true;
};

#endif  // KESTLOG_PCAPNGWRITER_H_
