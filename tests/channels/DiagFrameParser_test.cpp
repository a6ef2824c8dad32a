// SPDX-License-Identifier: Apache-2.0

#include "channels/DiagFrameParser.h"

#include <gtest/gtest.h>
#include <string.h>

#include <memory>
#include <string>
#include <vector>

#include "support/TestRoot.h"

namespace {

typedef std::vector<std::string> Strings;

class DiagFrameParserTest : public testing::Test {
protected:
    // The frames in the pieces, fed one after the other as reads would be.
    Strings decode(const Strings& pieces) {
        Strings frames;
        for (const std::string& piece : pieces) {
            const uint8_t* data = reinterpret_cast<const uint8_t*>(piece.data());
            for (size_t pos = 0, used = 0; pos < piece.size(); pos += used) {
                uint8_t* frame = nullptr;
                size_t len = 99;
                if (parser->unescape(data + pos, piece.size() - pos, frame, len, used)) {
                    EXPECT_EQ(piece[pos + used - 1], '\x7e');
                    raw_size = parser->raw_size();
                    frames.emplace_back(reinterpret_cast<char*>(frame), len);
                } else {
                    EXPECT_EQ(frame, nullptr);
                    EXPECT_EQ(used, piece.size() - pos);
                }
            }
        }
        return frames;
    }
    static std::string build(uint8_t type, uint8_t sub_type, const std::string& payload) {
        uint8_t* buf = nullptr;
        size_t len = 0;
        DiagFrameParser::frame(type, sub_type, reinterpret_cast<const uint8_t*>(payload.data()),
                               payload.size(), buf, len);
        const std::string wire(reinterpret_cast<char*>(buf), len);
        delete[] buf;
        return wire;
    }

    size_t raw_size = 0;  // of the last frame
    std::unique_ptr<DiagFrameParser> parser = std::make_unique<DiagFrameParser>();
};

TEST_F(DiagFrameParserTest, DecodesTheSameWhereverTheInputIsSplit) {
    // In ASCII the flag is '~', the escape '}', and "}^" and "}]" stand for them in a body.
    const struct {
        const char* what;
        std::string input;
        Strings frames;
        size_t raw_size;  // of the last one
    } cases[] = {
        {"escapes, next to each other and at both ends", "~}^a}]}^}]~", {"~a}~}"}, 11},
        {"the byte after an escape is never a flag", "~a}~b~", {"a^b"}, 6},
        {"repeated flags", "~~~body~", {"body"}, 6},
        {"garbage before the first flag", "x}yz~body~", {"body"}, 6},
        {"a closing flag does not open the next frame", "~one~two~", {"one"}, 5},
        {"in step after a lost opening flag", "~1~2~~3~", {"1", "3"}, 3},
        {"garbage between frames", "~one~xx}~two~", {"one", "two"}, 5},
        {"unfinished", "~one~~two", {"one"}, 5},
    };
    for (const auto& c : cases) {
        for (size_t split = 0; split <= c.input.size(); ++split) {
            parser->init();  // forgets the frame in progress
            EXPECT_EQ(decode({c.input.substr(0, split), c.input.substr(split)}), c.frames)
                << c.what << ", split at " << split;
            EXPECT_EQ(raw_size, c.raw_size) << c.what << ", split at " << split;
        }
    }
}

TEST_F(DiagFrameParserTest, DropsAnOverlongFrameWholeAndStaysInStep) {
    for (const char* byte : {"x", "}]"}) {
        for (size_t len : {65536u, 65537u, 200000u}) {
            std::string input = "~";
            for (size_t i = 0; i < len; ++i) {
                input += byte;
            }
            input += "~~next~";
            Strings pieces;
            for (size_t at = 0; at < input.size(); at += 32767) {
                pieces.push_back(input.substr(at, 32767));
            }
            const Strings frames = decode(pieces);
            ASSERT_EQ(frames.size(), len > 65536 ? 1u : 2u) << len;
            EXPECT_TRUE(len > 65536 || frames[0] == std::string(len, *byte)) << len;
            EXPECT_EQ(frames.back(), "next") << len;
        }
    }
}

// Every end that four letters can make of a frame.
TEST_F(DiagFrameParserTest, MeasuresWhatItWouldDecode) {
    size_t measured = 0;
    for (size_t i = 0; i < 65536; ++i) {
        std::string input = "~abcd";
        for (size_t rest = i, n = 0; n < 8; ++n, rest /= 4) {
            input += "~}xy"[rest % 4];
        }
        const uint8_t* const data = reinterpret_cast<const uint8_t*>(input.data());
        DiagHeader header;
        size_t body_len;
        const size_t size = DiagFrameParser::measure(data, input.size(), header, body_len);
        parser->init();
        uint8_t* frame;
        size_t len;
        size_t used;
        const bool found = parser->unescape(data, input.size(), frame, len, used);
        if (size == 0) {
            EXPECT_TRUE(!found || len < sizeof(header) || input.find("}~") < used) << input;
            continue;
        }
        ++measured;
        ASSERT_TRUE(found) << input;
        EXPECT_TRUE(size == used && body_len == len) << input;
        EXPECT_EQ(memcmp(&header, frame, sizeof(header)), 0) << input;
    }
    EXPECT_GT(measured, 5000u);
}

TEST_F(DiagFrameParserTest, BuildsFramesWithEscapes) {
    EXPECT_EQ(build(0x7E, 0x7D, ""), std::string("\x7e\0\0\0\0\x08\0\x7d\x5e\x7d\x5d\x7e", 12));
    EXPECT_EQ(build(1, 2, "}a~"), std::string("\x7e\0\0\0\0\x0b\0\1\2}]a}^\x7e", 15));
}

}  // namespace
