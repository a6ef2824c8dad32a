// The connectivity chip's dump: the marker ends it in a chunk below 4096 bytes and nowhere
// else, and the file is all chunks before that one.
#include "channels/ExtWcnDumpConsumer.h"
#include "fuzz/Exchange.h"

namespace {

const std::string MARKER = "corbet_memdump_finish";

DataConsumer* make(const char* cp_name, CpStorage* storage) {
    struct tm time {};
    time.tm_year = 116;
    time.tm_mday = 1;
    return new ExtWcnDumpConsumer(cp_name, storage, time);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    static Exchange exchange(CT_WCN);
    const std::vector<std::string> chunks = fuzz_chunks(fuzz_text(data, size), MARKER);
    std::string memory;
    bool ended = false;
    for (const std::string& chunk : chunks) {
        ended = chunk.size() < 4096 && chunk.find(MARKER) != std::string::npos;
        if (ended) {
            break;
        }
        memory += chunk;
    }
    exchange.run(make, chunks);
    FUZZ_CHECK(exchange.outcome() == (ended ? DataConsumer::LPR_SUCCESS : Exchange::GOES_ON));
    FUZZ_CHECK(exchange.stored() && exchange.content() == memory);
    return 0;
}
