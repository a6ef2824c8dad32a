// SPDX-License-Identifier: Apache-2.0

#include "kestlog/option_numbers.h"

#include <stdlib.h>

#include <algorithm>
#include <charconv>

namespace {

constexpr double LEAST_RATE = 1e-6;
constexpr double MAX_HERTZ = 1e12;  // of SigMF's core namespace

bool parse_whole(const std::string& text, uint64_t* value) {
    const bool hex = text.compare(0, 2, "0x") == 0 || text.compare(0, 2, "0X") == 0;
    const char* const first = text.data() + (hex ? 2 : 0);
    const char* const last = text.data() + text.size();
    const auto [end, error] = std::from_chars(first, last, *value, hex ? 16 : 10);
    return error == std::errc() && end == last;
}

bool wrong(const CommandLine& line, const char* option, const std::string& what, int* status) {
    *status = line.usage_error("--" + std::string(option) + ": '" + line.value(option, "") +
                               "' is not " + what);
    return false;
}

}  // namespace

bool read_whole(const CommandLine& line, const char* option, uint64_t least, uint64_t most,
                uint64_t* value, int* status) {
    uint64_t number;
    if (!line.has(option)) {
        return true;
    }
    if (!parse_whole(line.value(option, ""), &number) || number < least || number > most) {
        return wrong(line, option,
                     "a number from " + std::to_string(least) + " to " + std::to_string(most),
                     status);
    }
    *value = number;
    return true;
}

bool read_type(const CommandLine& line, const char* option, int* value, int* status) {
    uint64_t number = 0;
    if (!read_whole(line, option, 0, UINT8_MAX, &number, status)) {
        return false;
    }
    *value = line.has(option) ? static_cast<int>(number) : *value;
    return true;
}

bool read_hertz(const CommandLine& line, const char* option, bool positive, double* value,
                int* status) {
    const std::string text = line.value(option, "");
    char* end;
    const double number = strtod(text.c_str(), &end);
    if (!line.has(option)) {
        return true;
    }
    if (text.empty() || *end || !(number >= (positive ? LEAST_RATE : 0) && number <= MAX_HERTZ)) {
        return wrong(
            line, option,
            positive ? "a number of Hz above 0, up to 1e12" : "a number of Hz from 0 to 1e12",
            status);
    }
    *value = number;
    return true;
}

bool check_word(const CommandLine& line, const char* option, const Args& words, int* status) {
    if (std::find(words.begin(), words.end(), line.value(option, "")) != words.end()) {
        return true;
    }
    std::string list;
    for (const std::string& word : words) {
        list += (list.empty() ? "" : ", ") + word;
    }
    *status = line.usage_error("--" + std::string(option) + ": give one of " + list);
    return false;
}
