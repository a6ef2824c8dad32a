// SPDX-License-Identifier: Apache-2.0

#include "platform/PropertyTable.h"

#include <algorithm>
#include <utility>

void PropertyTable::parse(std::string text) {
    m_text = std::move(text);
    m_entries.clear();
    std::string_view rest(m_text);
    while (!rest.empty()) {
        const size_t end = std::min(rest.find('\n'), rest.size());
        parse_line(rest.substr(0, end));
        rest.remove_prefix(std::min(end + 1, rest.size()));
    }
    // Of equal keys the last line counts: reversed, it comes first and unique keeps it.
    std::reverse(m_entries.begin(), m_entries.end());
    std::stable_sort(m_entries.begin(), m_entries.end(),
                     [](const Entry& a, const Entry& b) { return a.key < b.key; });
    m_entries.erase(std::unique(m_entries.begin(), m_entries.end(),
                                [](const Entry& a, const Entry& b) { return a.key == b.key; }),
                    m_entries.end());
}

void PropertyTable::parse_line(std::string_view line) {
    if (!line.empty() && line.back() == '\r') {
        line.remove_suffix(1);
    }
    const size_t equals = line.find('=');
    if (equals == 0 || equals == std::string_view::npos || line[0] == '#' ||
        line.find('\0') != std::string_view::npos) {
        return;
    }
    m_entries.push_back(Entry{line.substr(0, equals), line.substr(equals + 1)});
}

bool PropertyTable::find(std::string_view key, std::string_view& value) const {
    const auto it =
        std::lower_bound(m_entries.begin(), m_entries.end(), key,
                         [](const Entry& entry, std::string_view k) { return entry.key < k; });
    if (it == m_entries.end() || it->key != key) {
        return false;
    }
    value = it->value;
    return true;
}
