// SPDX-License-Identifier: Apache-2.0

#include "config/config_text.h"

#include <ctype.h>
#include <errno.h>
#include <stdlib.h>
#include <string.h>

#include "core/text.h"

namespace {

// strtoul() in base 0, limited to 32 bits whatever the width of long: a greater magnitude
// is refused instead of silently becoming another number; a minus sign wraps. Sets end to
// where the conversion stopped. Returns -1 when out of range.
int convert(const char* text, const char*& end, uint32_t& value) {
    char* stop;
    errno = 0;
    const unsigned long number = strtoul(text, &stop, 0);
    end = stop;
    if (errno == ERANGE) {
        return -1;
    }
    const char* sign = text;
    while (isspace(static_cast<unsigned char>(*sign))) {
        ++sign;
    }
    const unsigned long magnitude = *sign == '-' ? 0 - number : number;
    if (magnitude > UINT32_MAX) {
        return -1;
    }
    value = static_cast<uint32_t>(number);
    return 0;
}

// The number token at or after text, which must fill the token. Advances text behind it.
int parse_uint_field(const char*& text, uint32_t& value) {
    ConfigToken token;
    const char* end;
    if (!next_token(text, token) || convert(token.text, end, value) < 0) {
        return -1;
    }
    if (*end != '\0' && !is_separator(static_cast<uint8_t>(*end))) {
        return -1;
    }
    text = end;
    return 0;
}

}  // namespace

bool ConfigToken::is(const char* word) const {
    return strlen(word) == len && memcmp(text, word, len) == 0;
}

bool next_token(const char* text, ConfigToken& token) {
    const uint8_t* start =
        get_token(reinterpret_cast<const uint8_t*>(text), strlen(text), token.len);
    if (!start) {
        return false;
    }
    token.text = reinterpret_cast<const char*>(start);
    return true;
}

int parse_uint(const char* text, uint32_t& value) {
    const char* end;
    uint32_t number;
    if (convert(text, end, number) < 0 || !isspace(static_cast<unsigned char>(*end))) {
        return -1;
    }
    value = number;
    return 0;
}

int parse_stream_settings(const char* text, bool& enable, uint32_t& size, uint32_t& level) {
    ConfigToken state;
    if (!next_token(text, state)) {
        return -1;
    }
    enable = state.is("on");
    text = state.end();
    if (parse_uint_field(text, size) < 0) {
        return -1;
    }
    return parse_uint_field(text, level);
}
