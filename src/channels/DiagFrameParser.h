// SPDX-License-Identifier: Apache-2.0
// The frames of the diag devices: 0x7E, the escaped body, 0x7E. In the body a byte
// 0x7D or 0x7E is sent as 0x7D and the byte XOR 0x20; there is no checksum. The body
// begins with a DiagHeader. Each frame carries an opening flag of its own.
#ifndef CHANNELS_DIAGFRAMEPARSER_H_
#define CHANNELS_DIAGFRAMEPARSER_H_

#include <stddef.h>
#include <stdint.h>

// Head of a frame body; little-endian on the wire, as on every CP and AP it runs on.
struct DiagHeader {
    uint32_t seq_num;
    uint16_t len;  // header and payload
    uint8_t type;
    uint8_t sub_type;
};
static_assert(sizeof(DiagHeader) == 8, "DiagHeader is 8 bytes on the wire");

class DiagFrameParser {
public:
    static constexpr size_t MAX_FRAME = 65536;
    static constexpr uint8_t FLAG = 0x7E;
    static constexpr uint8_t ESCAPE = 0x7D;

    // What becomes of a body of more than MAX_FRAME bytes. The service drops it whole; who looks
    // for damage gets its first MAX_FRAME bytes, and with them the flag that ended it.
    enum class Overlong { DROP, CUT };

    explicit DiagFrameParser(Overlong overlong = Overlong::DROP) : m_overlong(overlong) { init(); }

    // Forgets a frame in progress.
    void init();

    // Decodes from len bytes at data until a frame is complete or the input ends. True:
    // frame and frame_len give its body, valid until the next call. consumed tells how
    // many bytes were used. The state survives between calls, so that a frame may be
    // split anywhere. A body of more than MAX_FRAME bytes is dropped whole, or cut.
    bool unescape(const uint8_t* data, size_t len, uint8_t*& frame, size_t& frame_len,
                  size_t& consumed);

    // The bytes that the last frame took before it was decoded, both flags included.
    size_t raw_size() const { return m_raw_size; }

    // The bytes that a frame has taken which has not ended yet, its flag included; 0 between
    // frames.
    size_t pending() const { return m_state == HUNTING ? 0 : m_body_raw + 1; }

    // Looks at a frame without decoding more than its header, for who only counts: the bytes of
    // the frame that begins with a flag at data, both flags included, its header and the length
    // of its decoded body. 0 if the frame is not whole in len bytes, has no header or more than
    // MAX_FRAME bytes, or begins with several flags: unescape() tells then.
    static size_t measure(const uint8_t* data, size_t len, DiagHeader& header, size_t& body_len);
    // The header that a body begins with; reads up to twice its size, as its bytes may be escaped.
    static DiagHeader read_header(const uint8_t* body);

    // Escapes len bytes to dst, which has room for twice as many; the bytes written.
    static size_t escape(const uint8_t* src, size_t len, uint8_t* dst);

    // Builds a whole frame in a new buffer, which the caller frees with delete[].
    static void frame(uint8_t type, uint8_t sub_type, const uint8_t* payload, size_t payload_len,
                      uint8_t*& buf, size_t& len);

private:
    enum State : uint32_t {
        HUNTING = 0,         // before an opening flag
        AFTER_FLAG = 1,      // further flags may follow
        ESCAPE_PENDING = 2,  // 0x7D was the last byte of the previous input
        IN_FRAME = 3
    };

    void append(const uint8_t* bytes, size_t len);
    void append_escaped(uint8_t byte);
    size_t take_body(const uint8_t* data, size_t len);

    const Overlong m_overlong;
    State m_state;
    uint8_t m_frame[MAX_FRAME];
    uint32_t m_len;     // above MAX_FRAME: too long
    size_t m_body_raw;  // of the frame in progress, without its flags
    size_t m_raw_size = 0;
};

#endif  // CHANNELS_DIAGFRAMEPARSER_H_
