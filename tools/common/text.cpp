// SPDX-License-Identifier: Apache-2.0

#include "common/text.h"

#include <stdio.h>

namespace {

bool is_printable(char c) {
    return c >= 0x20 && c < 0x7f;
}

std::string hex(const char* prefix, char c) {
    char text[8];
    snprintf(text, sizeof(text), "%s%02x", prefix, static_cast<unsigned int>(c) & 0xffu);
    return text;
}

}  // namespace

std::string escape_text(const std::string& text) {
    std::string result;
    for (char c : text) {
        if (c == '\\') {
            result += "\\\\";
        } else {
            result += is_printable(c) ? std::string(1, c) : hex("\\x", c);
        }
    }
    return result;
}

std::string json_string(const std::string& text) {
    std::string result = "\"";
    for (char c : text) {
        if (c == '"' || c == '\\') {
            result += '\\';
        }
        result += is_printable(c) ? std::string(1, c) : hex("\\u00", c);
    }
    return result + "\"";
}

bool cut_ending(std::string* text, const std::string& ending) {
    if (text->size() < ending.size() ||
        text->compare(text->size() - ending.size(), ending.size(), ending) != 0) {
        return false;
    }
    text->resize(text->size() - ending.size());
    return true;
}
