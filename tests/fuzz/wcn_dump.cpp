// SPDX-License-Identifier: Apache-2.0
// The end of the connectivity chip's dump: the marker counts in a chunk below 4096 bytes and
// nowhere else, and nothing is read behind the chunk.
#include <vector>

#include "channels/ExtWcnDumpConsumer.h"
#include "fuzz/fuzz.h"

// The first byte tells how many bytes of memory, in sixteens, come before the rest.
extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    if (size < 1) {
        return 0;
    }
    const std::string text = std::string(data[0] * 16u, '.') + fuzz_text(data + 1, size - 1);
    const std::vector<uint8_t> chunk(text.begin(), text.end());
    FUZZ_CHECK(ExtWcnDumpConsumer::ends_dump(chunk.data(), chunk.size()) ==
               (text.size() < 4096 && text.find("corbet_memdump_finish") != std::string::npos));
    return 0;
}
