// SPDX-License-Identifier: Apache-2.0

#include "core/text.h"

#include <gtest/gtest.h>

#include <memory>
#include <string>

namespace {

// An exact copy on the heap, so that a sanitizer sees a read outside the range.
class Bytes {
public:
    explicit Bytes(const std::string& text) : m_size(text.size()), m_data(new uint8_t[m_size]) {
        text.copy(reinterpret_cast<char*>(m_data.get()), m_size);
    }
    const uint8_t* data() const { return m_data.get(); }
    size_t size() const { return m_size; }

private:
    size_t m_size;
    std::unique_ptr<uint8_t[]> m_data;
};

}  // namespace

TEST(Text, FindBytes) {
    const struct {
        std::string text, pattern;
        int at;
    } table[] = {
        {"Modem Assert", "Assert", 6},
        {"", "A", -1},
        {"abc", "", -1},
        {std::string("a\0b\0c", 5), std::string("\0c", 2), 3},
    };
    for (const auto& row : table) {
        const Bytes text(row.text);
        const uint8_t* const found =
            find_bytes(text.data(), text.size(), row.pattern.data(), row.pattern.size());
        EXPECT_EQ(found ? found - text.data() : -1, row.at) << row.text;
    }
}

TEST(Text, NumbersAndWords) {
    const struct {
        const char* text;
        int whole;       // result of parse_number
        int leading;     // result of parse_leading_number
        uint32_t value;  // of those that succeed
        size_t digits;
    } table[] = {
        {"", 0, -1, 0, 0},
        {"007", 0, 0, 7, 3},
        {"12x", -1, 0, 12, 2},
        {"-1", -1, -1, 0, 0},
        {":", -1, -1, 0, 0},
        {"4294967295", 0, 0, 4294967295u, 10},
        {"42949672950", -1, -1, 0, 0},  // another digit after the largest value
        {"4294967296", 0, 0, 0, 10},    // other values wrap
    };
    EXPECT_TRUE(token_equals(Bytes("ON").data(), 2, "ON"));
    EXPECT_FALSE(token_equals(Bytes("ON").data(), 2, "ONE"));
    EXPECT_FALSE(token_equals(Bytes(std::string("ON\0", 3)).data(), 3, "ON"));
    const uint32_t untouched = 77;
    for (const auto& row : table) {
        const Bytes text(row.text);
        uint32_t value = untouched;
        EXPECT_EQ(parse_number(text.data(), text.size(), value), row.whole) << row.text;
        EXPECT_EQ(value, row.whole ? untouched : row.value) << row.text;
        size_t digits = untouched;
        value = untouched;
        EXPECT_EQ(parse_leading_number(text.data(), text.size(), value, digits), row.leading)
            << row.text;
        EXPECT_EQ(value, row.leading ? untouched : row.value) << row.text;
        EXPECT_EQ(digits, row.leading ? untouched : row.digits) << row.text;
    }
}
