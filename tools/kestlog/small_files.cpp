// SPDX-License-Identifier: Apache-2.0

#include "kestlog/small_files.h"

#include <cutils/properties.h>
#include <errno.h>

#include <algorithm>

#include "kestlog/FileName.h"
#include "kestlog/LogReader.h"

namespace {

std::string version_text(const std::string& text) {
    return text.substr(0, text.find_last_not_of("\r\n") + 1);
}

}  // namespace

std::string read_small(const std::string& path, size_t most, int* error) {
    LogReader in;
    if (!in.open(path, false)) {
        *error = errno;
        return "";
    }
    const std::string text = peek_small(in, most);
    *error = in.error();
    return text;
}

std::string peek_small(LogReader& in, size_t most) {
    size_t got;
    const uint8_t* const data = in.peek(most, got);
    return std::string(data, data + std::min(got, most));
}

std::string read_version(const std::string& path, int* error) {
    return version_text(read_small(path, PROPERTY_VALUE_MAX, error));
}

std::string peek_version(LogReader& in) {
    return version_text(peek_small(in, PROPERTY_VALUE_MAX));
}

std::string version_path(const std::string& dir, const std::string& cp) {
    return dir + cp + VERSION_ENDING;
}
