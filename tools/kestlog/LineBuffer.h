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

class LineBuffer {
public:
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
    // A literal: of a length that the compiler knows.
    template <size_t N>
    void add(const char (&text)[N]) {
        make_room();
        static_assert(N <= SLACK, "a short text");
        memcpy(m_bytes.data() + m_len, text, N - 1);
        m_len += N - 1;
    }
    // In decimal, with blanks before it up to the width, or after it when that is negative.
    void add(uint64_t number, int width = 0);
    // Two hexadecimal digits.
    void add_hex(uint8_t byte) {
        static const char DIGITS[] = "0123456789abcdef";
        make_room();
        m_bytes[m_len++] = DIGITS[byte >> 4];
        m_bytes[m_len++] = DIGITS[byte & 15];
    }
    // Ends a line. False once the output cannot be written any more.
    bool end_line() {
        add("\n");
        return m_good;
    }
    void flush();

private:
    static constexpr size_t SIZE = 64 * 1024;
    static constexpr size_t SLACK = 64;  // room behind SIZE for what is short

    void make_room() {
        if (m_len > SIZE) {
            flush();
        }
    }
    void add_long(std::string_view text);

    std::vector<char> m_bytes;
    size_t m_len = 0;
    bool m_good = true;
};

#endif  // KESTLOG_LINEBUFFER_H_
