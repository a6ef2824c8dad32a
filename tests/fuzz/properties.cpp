// SPDX-License-Identifier: Apache-2.0
// "default.prop": exactly the lines that set a property count, the last one of a key, and
// whatever stands before a good line does not hide it.
#include <map>
#include <sstream>

#include "fuzz/fuzz.h"
#include "platform/PropertyTable.h"

namespace {

typedef std::map<std::string, std::string> Properties;

Properties read_lines(const std::string& text) {
    Properties properties;
    std::istringstream in(text);
    for (std::string line; std::getline(in, line);) {
        if (!line.empty() && line.back() == '\r') {
            line.pop_back();
        }
        const size_t equals = line.find('=');
        if (equals != std::string::npos && equals != 0 && line[0] != '#' &&
            line.find('\0') == std::string::npos) {
            properties[line.substr(0, equals)] = line.substr(equals + 1);
        }
    }
    return properties;
}

bool has(const PropertyTable& table, const std::string& key, const std::string& value) {
    std::string_view found;
    return table.find(key, found) && found == value;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    const std::string text = fuzz_text(data, size);
    const Properties properties = read_lines(text);

    PropertyTable table;
    table.parse(text);
    std::string_view found;
    FUZZ_CHECK(!table.find("", found));
    for (const auto& property : properties) {
        const auto& [key, value] = property;
        FUZZ_CHECK(has(table, key, value));
        FUZZ_CHECK(table.find(key + "x", found) == (properties.count(key + "x") == 1));
    }

    table.parse(text + "\nlast=one\n");
    FUZZ_CHECK(has(table, "last", "one"));
    for (const auto& [key, value] : properties) {
        FUZZ_CHECK(key == "last" || has(table, key, value));
    }
    return 0;
}
