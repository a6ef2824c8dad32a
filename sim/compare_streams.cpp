// SPDX-License-Identifier: Apache-2.0

#include "sim/compare_streams.h"

#include <stdio.h>

#include <algorithm>
#include <vector>

StreamDifference compare_streams(ByteStream& original, ByteStream& copy, uint64_t fed) {
    std::vector<uint8_t> expected(64 << 10);
    std::vector<uint8_t> found(expected.size());
    StreamDifference result;
    bool same = true;
    for (size_t n; (n = copy.read(found.data(), found.size())) > 0; result.written += n) {
        size_t have = 0;
        const size_t want = static_cast<size_t>(
            std::min<uint64_t>(n, fed > result.written ? fed - result.written : 0));
        for (size_t m = 1; same && have < want && m > 0; have += m) {
            m = original.read(expected.data() + have, want - have);
        }
        if (same) {
            const auto end = found.begin() + static_cast<std::ptrdiff_t>(have);
            const auto differs = std::mismatch(found.begin(), end, expected.begin()).first;
            result.same += static_cast<uint64_t>(differs - found.begin());
            same = result.same == result.written + n;
        }
    }
    result.equal = same && result.written == fed;
    return result;
}

std::string StreamDifference::text(const std::string& name, uint64_t fed) const {
    char line[256];
    snprintf(line, sizeof line, "%-12s %12llu bytes fed, %12llu written: ", name.c_str(),
             static_cast<unsigned long long>(fed), static_cast<unsigned long long>(written));
    return line + (equal             ? "equal"
                   : written == 0    ? "nothing was written"
                   : same == written ? "the end is missing"
                                     : "DIFFERENT from byte " + std::to_string(same) + " on");
}
