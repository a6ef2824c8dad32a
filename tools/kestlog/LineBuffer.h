// SPDX-License-Identifier: Apache-2.0
// Lines for standard output, several million a second: printf would take longer than reading
// what they are about.
#ifndef KESTLOG_LINEBUFFER_H_
#define KESTLOG_LINEBUFFER_H_

#include <stddef.h>
#include <stdint.h>
#include <string.h>

#include <string_view>
#include <vector>

#include "kestlog/NumberColumn.h"

class LineBuffer {
public:
    static constexpr size_t SLACK = 128;

    // Adds at most SLACK bytes to the buffer, which is used through it alone as long as it lives:
    // it looks for room once.
    class Short {
    public:
        explicit Short(LineBuffer& out) : m_out(out), m_to(out.room()) {}
        ~Short() { m_out.wrote(m_to); }
        Short(const Short&) = delete;
        Short& operator=(const Short&) = delete;

        // A literal: of a length that the compiler knows.
        template <size_t N>
        void add(const char (&text)[N]) {
            static_assert(N <= SLACK, "a short text");
            memcpy(m_to, text, N - 1);
            m_to += N - 1;
        }
        void add(NumberColumn& column, uint64_t number) { m_to = column.write(number, m_to); }
        // Two hexadecimal digits.
        void add_hex(uint8_t byte) {
            static const char DIGITS[] = "0123456789abcdef";
            *m_to++ = DIGITS[byte >> 4];
            *m_to++ = DIGITS[byte & 15];
        }

    private:
        LineBuffer& m_out;
        char* m_to;
    };

    LineBuffer() : m_bytes(SIZE + SLACK) {}
    ~LineBuffer() { flush(); }
    LineBuffer(const LineBuffer&) = delete;
    LineBuffer& operator=(const LineBuffer&) = delete;

    void add(std::string_view text) {
        if (m_len + text.size() > SIZE) {
            add_long(text);
            return;
        }
        memcpy(m_bytes.data() + m_len, text.data(), text.size());
        m_len += text.size();
    }
    template <size_t N>
    void add(const char (&text)[N]) {
        Short(*this).add(text);
    }
    void add(uint64_t number);  // in decimal
    void add_hex(uint8_t byte) { Short(*this).add_hex(byte); }
    // Ends a line. False once the output cannot be written any more.
    bool end_line() {
        add("\n");
        return m_good;
    }
    void flush();

private:
    static constexpr size_t SIZE = 64 * 1024;  // and SLACK behind it

    char* room() {
        if (m_len > SIZE) {
            flush();
        }
        return m_bytes.data() + m_len;
    }
    void wrote(const char* end) { m_len = static_cast<size_t>(end - m_bytes.data()); }
    void add_long(std::string_view text);

    std::vector<char> m_bytes;
    size_t m_len = 0;
    bool m_good = true;
};

#endif  // KESTLOG_LINEBUFFER_H_
