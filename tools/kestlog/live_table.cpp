// SPDX-License-Identifier: Apache-2.0

#include "kestlog/live_table.h"

#include <stdio.h>

#include "common/text.h"

namespace {

std::string row(const std::string& cp, const LiveTree::Sum& sum, int64_t ms) {
    char text[256];
    snprintf(text, sizeof(text), "%-12.64s %8llu %12s %12s/s  %.100s", escape_text(cp).c_str(),
             static_cast<unsigned long long>(sum.files), size_text(sum.size).c_str(),
             size_text(sum.grown * 1000 / static_cast<uint64_t>(ms)).c_str(),
             escape_text(sum.newest).c_str());
    return text;
}

}  // namespace

std::vector<std::string> live_table(const std::map<std::string, LiveTree::Sum>& sums, int64_t ms) {
    std::vector<std::string> rows = {
        "CP              FILES         SIZE           RATE  NEWEST LOG"};
    LiveTree::Sum all;
    for (const auto& [cp, sum] : sums) {
        rows.push_back(row(cp, sum, ms));
        all.files += sum.files;
        all.size += sum.size;
        all.grown += sum.grown;
    }
    rows.push_back(row("all", all, ms));
    return rows;
}
