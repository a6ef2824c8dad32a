// SPDX-License-Identifier: Apache-2.0
// The general logger's configuration: only the CPs known to it come out, off without the
// global switch, in the order and number of the file.
#include <vector>

#include "config/KestConfig.h"
#include "fuzz/fuzz.h"

namespace {

typedef std::vector<std::pair<CpType, bool>> Entries;

Entries read(const std::string& text) {
    static const FuzzFile file;
    file.write(text);
    KestConfig config;
    FUZZ_CHECK(config.read_config(file.path.c_str()) == 0);
    Entries entries;
    for (const KestConfig::StreamEntry* entry : config.stream_entries()) {
        entries.emplace_back(entry->type, entry->enable);
    }
    return entries;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    const std::string text = fuzz_text(data, size);
    const Entries entries = read(text);
    const Entries switched_on = read("enable\n" + text);
    FUZZ_CHECK(switched_on.size() == entries.size());
    for (size_t i = 0; i < entries.size(); ++i) {
        const CpType type = entries[i].first;
        FUZZ_CHECK(type >= CT_WCDMA && type <= CT_GNSS && switched_on[i].first == type);
        // On only by the global switch, which then is on for all.
        FUZZ_CHECK(!entries[i].second || entries == switched_on);
    }
    return 0;
}
