// SPDX-License-Identifier: Apache-2.0

#include "sim/byte_text.h"

#include <stdint.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>

#include <algorithm>

namespace {

const size_t MAX_BYTES = 16 << 20;
const size_t LINE_WIDTH = 72;
const size_t MIN_RUN = 16;
const char FLAG = '~';

// Each escape letter and the byte that it stands for.
const char ESCAPES[] = "n\nr\rt\t\"\"\\\\";

// Takes what follows a backslash at *pos.
bool parse_escape(const std::string& text, size_t* pos, char* byte) {
    const char letter = text[*pos];
    if (letter == 'x') {
        unsigned value;
        int len = 0;
        if (sscanf(text.c_str() + *pos, "x%2x%n", &value, &len) != 1 || len != 3) {
            return false;
        }
        *byte = static_cast<char>(value);
        *pos += 3;
        return true;
    }
    for (const char* escape = ESCAPES; *escape; escape += 2) {
        if (letter == *escape) {
            *byte = escape[1];
            ++*pos;
            return true;
        }
    }
    return false;
}

// Takes the piece whose opening quote is at *pos, without its count.
bool parse_piece(const std::string& text, size_t* pos, std::string* piece) {
    for (++*pos; *pos < text.size() && text[*pos] != '"';) {
        char byte = text[(*pos)++];
        if (byte == '\\' && (*pos == text.size() || !parse_escape(text, pos, &byte))) {
            return false;
        }
        piece->push_back(byte);
    }
    return (*pos)++ < text.size();
}

std::string show_byte(char byte) {
    for (const char* escape = ESCAPES; *escape; escape += 2) {
        if (byte == escape[1]) {
            return {'\\', *escape};
        }
    }
    if (byte >= ' ' && byte <= '~') {
        return {byte};
    }
    char hex[5];
    snprintf(hex, sizeof hex, "\\x%02x", static_cast<uint8_t>(byte));
    return hex;
}

std::string counted(const std::string& shown, size_t count) {
    return '"' + shown + '"' + (count > 1 ? "*" + std::to_string(count) : "");
}

// The pieces of a text that is being shown.
class Lines {
public:
    explicit Lines(std::vector<std::string>& out) : m_out(out) {}

    void add(const std::string& shown) {
        if (m_line.size() + shown.size() > LINE_WIDTH) {
            end_line();
        }
        m_line += shown;
    }
    void end_line() {
        if (m_line.empty()) {
            return;
        }
        if (m_line == m_last) {
            ++m_count;
        } else {
            start_group(m_line);
        }
        m_line.clear();
    }
    void add_run(const std::string& shown, size_t count) {
        finish();
        m_out.push_back(counted(shown, count));
    }
    void finish() {
        end_line();
        start_group("");
    }

private:
    // Hands out the line that may have been repeated.
    void start_group(const std::string& next) {
        if (!m_last.empty()) {
            m_out.push_back(counted(m_last, m_count));
        }
        m_last = next;
        m_count = 1;
    }

    std::vector<std::string>& m_out;
    std::string m_line;
    std::string m_last;
    size_t m_count = 0;
};

}  // namespace

bool parse_bytes(const std::string& text, std::string* bytes, std::string* reason) {
    bytes->clear();
    for (size_t pos = 0; (pos = text.find_first_not_of(' ', pos)) != std::string::npos;) {
        const size_t start = pos;
        std::string piece;
        if (text[pos] != '"' || !parse_piece(text, &pos, &piece)) {
            *reason = "not a quoted piece of bytes: " + text.substr(start);
            return false;
        }
        unsigned long count = 1;
        if (pos < text.size() && text[pos] == '*') {
            char* end;
            count = strtoul(text.c_str() + pos + 1, &end, 10);
            pos = static_cast<size_t>(end - text.c_str());
        }
        if (count < 1 || count > MAX_BYTES || bytes->size() + piece.size() * count > MAX_BYTES) {
            *reason = "not a count, or too many bytes: " + text.substr(start);
            return false;
        }
        for (; count > 0; --count) {
            *bytes += piece;
        }
    }
    return true;
}

std::vector<std::string> show_bytes(const std::string& bytes) {
    std::vector<std::string> out;
    Lines lines(out);
    for (size_t pos = 0, run; pos < bytes.size(); pos += run) {
        const char byte = bytes[pos];
        run = std::min(bytes.find_first_not_of(byte, pos), bytes.size()) - pos;
        if (run >= MIN_RUN) {
            lines.add_run(show_byte(byte), run);
            continue;
        }
        if (byte == FLAG && run > 2) {
            lines.end_line();
        }
        for (size_t i = 0; i < run; ++i) {
            lines.add(show_byte(byte));
            if (byte == '\n' || (byte == FLAG && run == 2 && i == 0)) {
                lines.end_line();
            }
        }
    }
    lines.finish();
    return out;
}

std::string show_bytes_line(const std::string& bytes) {
    std::string line;
    for (const std::string& piece : show_bytes(bytes)) {
        line += (line.empty() ? "" : " ") + piece;
    }
    return line;
}

std::string show_name(const std::string& name) {
    std::string text;
    for (const char byte : name) {
        text += show_byte(byte);
    }
    return text;
}
