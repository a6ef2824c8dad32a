// SPDX-License-Identifier: Apache-2.0
// The properties in the text of a "default.prop": its grammar apart from the file. See
// cutils/properties.h for what a line may be.
#ifndef PLATFORM_PROPERTYTABLE_H_
#define PLATFORM_PROPERTYTABLE_H_

#include <string>
#include <string_view>
#include <vector>

class PropertyTable {
public:
    PropertyTable() = default;
    PropertyTable(const PropertyTable&) = delete;
    PropertyTable& operator=(const PropertyTable&) = delete;

    // Replaces what was read before. Any bytes may come.
    void parse(std::string text);

    // The value of a key, or false. The view is valid until the next parse.
    bool find(std::string_view key, std::string_view& value) const;

private:
    struct Entry {
        std::string_view key;
        std::string_view value;
    };

    void parse_line(std::string_view line);

    std::string m_text;            // what the entries point into
    std::vector<Entry> m_entries;  // sorted by key, each key once
};

#endif  // PLATFORM_PROPERTYTABLE_H_
