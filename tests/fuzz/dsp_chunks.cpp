// SPDX-License-Identifier: Apache-2.0
// The audio DSP's chunk header: a chunk that the service writes is read back whole, and one
// that is cut is told.
#include "channels/DspChunkHeader.h"
#include "fuzz/scan.h"

namespace {

constexpr uint8_t KINDS[] = {0, 2, 3};  // log, dump, PCM

}  // namespace

// Two bytes tell where the chunk is cut, one its kind and one its number.
extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    if (size < 4) {
        return 0;
    }
    const std::string body = fuzz_text(data + 4, size - 4);
    const DspChunkHeader header = make_dsp_chunk_header(body.size(), KINDS[data[2] % 3], data[3]);
    const std::string chunk =
        fuzz_text(reinterpret_cast<const uint8_t*>(&header), sizeof(header)) + body;

    const Scanned whole = fuzz_scan("1-agdsp-2016-03-01_09-15-00.log", chunk);
    FUZZ_CHECK(whole.pieces.size() == 1 && !whole.report.damaged && whole.report.other == 0);
    FUZZ_CHECK(whole.pieces[0].data == body && whole.pieces[0].seq_num == data[3]);

    const size_t len = (data[0] | static_cast<size_t>(data[1]) << 8) % chunk.size();
    const Scanned cut = fuzz_scan("1-agdsp-2016-03-01_09-15-00.log", chunk.substr(0, len));
    FUZZ_CHECK(cut.pieces.empty() && cut.report.other == len && cut.report.damaged == (len > 0));
    return 0;
}
