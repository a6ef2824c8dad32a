// SPDX-License-Identifier: Apache-2.0

#include "core/text.h"

#include <string.h>

namespace {

bool is_digit(uint8_t c) {
    return c >= '0' && c <= '9';
}

}  // namespace

bool is_separator(uint8_t c) {
    return c == ' ' || c == '\t' || c == '\n' || c == '\r';
}

const uint8_t* get_token(const uint8_t* text, size_t len, size_t& token_len) {
    const uint8_t* const end = text + len;
    while (text < end && is_separator(*text)) {
        ++text;
    }
    if (text == end) {
        return nullptr;
    }
    const uint8_t* stop = text;
    while (stop < end && !is_separator(*stop)) {
        ++stop;
    }
    token_len = static_cast<size_t>(stop - text);
    return text;
}

bool token_equals(const uint8_t* token, size_t len, const char* word) {
    return strlen(word) == len && memcmp(token, word, len) == 0;
}

const uint8_t* find_bytes(const uint8_t* text, size_t len, const void* pattern,
                          size_t pattern_len) {
    if (pattern_len == 0 || len < pattern_len) {
        return nullptr;
    }
    return static_cast<const uint8_t*>(memmem(text, len, pattern, pattern_len));
}

int parse_leading_number(const uint8_t* text, size_t len, uint32_t& value, size_t& digits) {
    uint32_t number = 0;
    size_t n = 0;
    for (; n < len && is_digit(text[n]); ++n) {
        if (number == UINT32_MAX) {
            return -1;
        }
        number = number * 10 + static_cast<uint32_t>(text[n] - '0');
    }
    if (n == 0) {
        return -1;
    }
    value = number;
    digits = n;
    return 0;
}
