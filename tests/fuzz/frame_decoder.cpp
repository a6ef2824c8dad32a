// SPDX-License-Identifier: Apache-2.0
// The decoder of diag frames: how the bytes are split over reads does not matter, what
// was framed comes out as it was, and no garbage makes a later frame unreadable.
#include <string.h>

#include <algorithm>
#include <memory>
#include <vector>

#include "channels/DiagFrameParser.h"
#include "fuzz/fuzz.h"

namespace {

typedef std::vector<uint8_t> Bytes;
constexpr uint8_t FLAG = 0x7E;

// The frames in it when it comes in such pieces.
std::vector<Bytes> feed(const Bytes& in, size_t piece) {
    std::unique_ptr<DiagFrameParser> parser(new DiagFrameParser);
    std::vector<Bytes> frames;
    for (size_t start = 0; start < in.size(); start += piece) {
        // Each piece ends where its memory does, for a sanitizer to watch.
        const size_t size = std::min(piece, in.size() - start);
        const Bytes part(in.data() + start, in.data() + start + size);
        for (size_t pos = 0, consumed = 0; pos < size; pos += consumed) {
            uint8_t* frame;
            size_t len;
            if (parser->unescape(part.data() + pos, size - pos, frame, len, consumed)) {
                FUZZ_CHECK(len > 0 && len <= DiagFrameParser::MAX_FRAME);
                frames.emplace_back(frame, frame + len);
            } else {
                FUZZ_CHECK(pos + consumed == size && !frame && !len);
            }
            FUZZ_CHECK(consumed > 0 && consumed <= size - pos);
        }
    }
    return frames;
}

void check_round_trip(const Bytes& in) {
    Bytes wire(2 * in.size() + 2);
    const size_t len = DiagFrameParser::escape(in.data(), in.size(), wire.data() + 1);
    FUZZ_CHECK(!memchr(wire.data() + 1, FLAG, len));
    wire[0] = wire[len + 1] = FLAG;
    wire.resize(len + 2);
    FUZZ_CHECK(feed(wire, wire.size()) == std::vector<Bytes>(!in.empty(), in));
}

// The frames are the same in pieces; after whatever came, three flags let the next be read.
void check_pieces(Bytes in, size_t piece) {
    const std::vector<Bytes> whole = feed(in, in.size());
    const uint8_t payload[] = "a~}\0";
    uint8_t* wire;
    size_t len;
    DiagFrameParser::frame(1, 2, payload, sizeof(payload), wire, len);
    in.insert(in.end(), 3, FLAG);
    in.insert(in.end(), wire, wire + len);
    delete[] wire;
    const std::vector<Bytes> frames = feed(in, piece);
    FUZZ_CHECK(frames.size() > whole.size());
    FUZZ_CHECK(std::equal(whole.begin(), whole.end(), frames.begin()));
    FUZZ_CHECK(frames.back().size() == sizeof(DiagHeader) + sizeof(payload));
    FUZZ_CHECK(!memcmp(frames.back().data() + sizeof(DiagHeader), payload, sizeof(payload)));
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    Bytes in(data, data + size);
    // 0xFF at the start: what follows is repeated past the limit of a frame.
    if (size > 1 && data[0] == 0xFF) {
        in.clear();
        while (in.size() < DiagFrameParser::MAX_FRAME + 1) {
            in.insert(in.end(), data + 1, data + size);
        }
    }
    check_pieces(in, in.size() > 256 ? 997 : 1 + in.size() % 3);
    check_round_trip(Bytes(data, data + std::min<size_t>(size, DiagFrameParser::MAX_FRAME)));
    return 0;
}
