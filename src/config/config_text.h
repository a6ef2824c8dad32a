// SPDX-License-Identifier: Apache-2.0
// What the readers of the two configuration files share: tokens, number fields and the
// arguments that stream lines have in common.
//
// A line is text in a buffer of CONFIG_LINE_SIZE bytes, as fgets() leaves it: it ends at
// its first NUL, so no function here reads past the buffer.
#ifndef CONFIG_CONFIG_TEXT_H_
#define CONFIG_CONFIG_TEXT_H_

#include <stddef.h>
#include <stdint.h>

// A longer line is read in pieces, each a line of its own.
constexpr size_t CONFIG_LINE_SIZE = 1024;

// A token of a line: start and length, not terminated.
struct ConfigToken {
    const char* text;
    size_t len;

    bool is(const char* word) const;
    const char* end() const { return text + len; }
};

// Finds the next token at or after text. False when none is left.
bool next_token(const char* text, ConfigToken& token);

// The number that is all of a line's argument text: decimal, octal or hexadecimal, any
// white space before it and at least one after it (a number cut off by the end of the
// file or of the line buffer is not taken for the whole). Text that does not begin with
// a number gives 0. Returns -1 on a bad end or a number beyond 32 bits.
int parse_uint(const char* text, uint32_t& value);

// The state, size and level of a stream line, from text on. The state is true exactly for
// "on"; what follows the level is ignored. Returns -1 when one is missing or malformed.
int parse_stream_settings(const char* text, bool& enable, uint32_t& size, uint32_t& level);

#endif  // CONFIG_CONFIG_TEXT_H_
