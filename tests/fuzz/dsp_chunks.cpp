// The audio DSP's chunks: what was written is read back whole, and a cut is told.
#include <string.h>

#include <vector>

#include "channels/AgDspLogHandler.h"
#include "fuzz/scan.h"

namespace {

constexpr char NAME[] = "1-agdsp-2016-03-01_09-15-00.log";
constexpr size_t HEADER_LEN = 20;
constexpr size_t LARGEST = 32748;

struct Chunk {
    uint8_t type;
    std::string kind;
    std::string data;
};

// Each chunk is a byte for its kind, one for its length and that many bytes, repeated to
// the largest chunk when the length is 255.
std::vector<Chunk> make_chunks(const std::string& text) {
    static const Chunk KINDS[] = {{AgDspLogHandler::DLT_LOG, "log", ""},
                                  {AgDspLogHandler::DLT_PCM, "pcm", ""},
                                  {AgDspLogHandler::DLT_DUMP, "dump", ""}};
    std::vector<Chunk> chunks;
    for (size_t at = 0; at + 2 <= text.size();) {
        Chunk chunk = KINDS[static_cast<uint8_t>(text[at]) % 3];
        const size_t len = static_cast<uint8_t>(text[at + 1]);
        const std::string part = text.substr(at + 2, len);
        chunk.data = part;
        while (len == 255 && !part.empty() && chunk.data.size() < LARGEST) {
            chunk.data += part.substr(0, LARGEST - chunk.data.size());
        }
        chunks.push_back(chunk);
        at += 2 + len;
    }
    return chunks;
}

std::string header(const Chunk& chunk, uint32_t seq_num) {
    const DspChunkHeader header = make_dsp_chunk_header(chunk.data.size(), chunk.type, seq_num);
    return std::string(reinterpret_cast<const char*>(&header), sizeof(header));
}

bool same(const ScannedPiece& piece, const Chunk& chunk) {
    return piece.kind == chunk.kind && piece.data == chunk.data;
}

size_t accounted(const Scanned& scan) {
    size_t bytes = scan.report.other;
    for (const ScannedPiece& piece : scan.pieces) {
        bytes += HEADER_LEN + piece.data.size();
    }
    return bytes;
}

void check_whole(const std::string& log, const std::vector<Chunk>& chunks, uint32_t seq_num) {
    const Scanned scan = fuzz_scan(NAME, log);
    FUZZ_CHECK(scan.pieces.size() == chunks.size() && accounted(scan) == log.size());
    FUZZ_CHECK(scan.report.other == 0 && scan.report.findings.size() == (log.empty() ? 1u : 0u));
    for (size_t i = 0; i < chunks.size(); ++i) {
        FUZZ_CHECK(same(scan.pieces[i], chunks[i]) &&
                   scan.pieces[i].seq_num == static_cast<uint32_t>(seq_num + i));
    }
}

void check_cut(const std::string& log, const std::vector<Chunk>& chunks, size_t len) {
    const Scanned scan = fuzz_scan(NAME, log.substr(0, len));
    size_t end = 0;
    size_t num = 0;
    while (num < chunks.size() && end + HEADER_LEN + chunks[num].data.size() <= len) {
        end += HEADER_LEN + chunks[num++].data.size();
    }
    FUZZ_CHECK(scan.pieces.size() == num && scan.report.other == len - end);
    FUZZ_CHECK(scan.report.damaged == (end < len));
    FUZZ_CHECK(end == len || (scan.report.findings.size() == 1 &&
                              strcmp(scan.report.findings[0].code, "cut") == 0));
}

}  // namespace

// Two bytes tell where the log is cut, the fourth begins the sequence.
extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    if (size < 4) {
        return 0;
    }
    const uint32_t seq_num = 0xffffff80u + data[3];
    const std::vector<Chunk> chunks = make_chunks(fuzz_text(data + 4, size - 4));
    std::string log;
    for (const Chunk& chunk : chunks) {
        log += header(chunk, seq_num + static_cast<uint32_t>(&chunk - chunks.data())) + chunk.data;
    }
    check_whole(log, chunks, seq_num);
    if (!log.empty()) {
        const size_t at = (data[0] | static_cast<size_t>(data[1]) << 8) % log.size();
        check_cut(log, chunks, at);
    }
    return 0;
}
