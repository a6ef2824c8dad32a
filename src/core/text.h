// SPDX-License-Identifier: Apache-2.0
// Helpers on byte ranges: a pointer and a length, never NUL-terminated text, for the parsers of
// requests, messages, file names and configuration lines. None reads a byte outside its range.
#ifndef CORE_TEXT_H_
#define CORE_TEXT_H_

#include <stddef.h>
#include <stdint.h>

// Token separators: space, tab, line feed, carriage return.
bool is_separator(uint8_t c);

// The next token: skips separators, then takes the run of other bytes. Returns its
// start and stores its length, or returns null when only separators remain.
const uint8_t* get_token(const uint8_t* text, size_t len, size_t& token_len);

// True when the token is exactly the given NUL-terminated word.
bool token_equals(const uint8_t* token, size_t len, const char* word);

// First position where the pattern occurs, or null. An empty pattern is never found.
const uint8_t* find_bytes(const uint8_t* text, size_t len, const void* pattern, size_t pattern_len);

// Leading decimal number: the first byte must be a digit (else -1); digits are read while
// present. The value is kept in 32 bits and wraps; -1 also when it already is 4294967295 before
// another digit. Stores how many digits were read.
int parse_leading_number(const uint8_t* text, size_t len, uint32_t& value, size_t& digits);

#endif  // CORE_TEXT_H_
