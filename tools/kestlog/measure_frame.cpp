// SPDX-License-Identifier: Apache-2.0

#include "kestlog/measure_frame.h"

#include <string.h>

#ifdef __x86_64__
#include <immintrin.h>

#define WITH_AVX2 __attribute__((target("avx2,bmi,popcnt")))

namespace {

constexpr size_t WORD = 32;         // bytes that are looked at together
constexpr size_t BLOCK = 8 * WORD;  // what is looked at in vain where no frame is
constexpr uint32_t HEADER = (1 << sizeof(DiagHeader)) - 1;

// As most processors of the last ten years can; on the others memchr looks for each special byte.
const bool USABLE = __builtin_cpu_supports("avx2") && __builtin_cpu_supports("bmi") &&
                    __builtin_cpu_supports("popcnt");

WITH_AVX2 inline __m256i places(const uint8_t* bytes, uint8_t wanted) {
    return _mm256_cmpeq_epi8(_mm256_loadu_si256(reinterpret_cast<const __m256i*>(bytes)),
                             _mm256_set1_epi8(static_cast<char>(wanted)));
}

WITH_AVX2 inline uint32_t bits(__m256i bytes) {
    return static_cast<uint32_t>(_mm256_movemask_epi8(bytes));
}

WITH_AVX2 inline size_t count(uint32_t of) {
    return static_cast<size_t>(__builtin_popcount(of));
}

bool is_escape(uint8_t byte) {
    return byte == DiagFrameParser::ESCAPE;
}

// The escapes in these bytes, of which WORD more can be read; false where there is a flag, or an
// escape that is escaped.
WITH_AVX2 inline bool count_escapes(const uint8_t* data, size_t len, size_t* escapes) {
    __m256i odd = _mm256_setzero_si256();
    size_t at = 0;
    *escapes = 0;
    for (; at + WORD <= len; at += WORD) {
        const __m256i found = places(data + at, DiagFrameParser::ESCAPE);
        const __m256i next = places(data + at + 1, DiagFrameParser::ESCAPE);
        odd = _mm256_or_si256(odd, places(data + at, DiagFrameParser::FLAG));
        odd = _mm256_or_si256(odd, _mm256_and_si256(found, next));
        *escapes += count(bits(found));
        if (at % BLOCK == BLOCK - WORD && bits(odd)) {
            return false;
        }
    }
    const uint32_t rest = (uint32_t{1} << (len - at)) - 1;
    const uint32_t found = bits(places(data + at, DiagFrameParser::ESCAPE)) & rest;
    const uint32_t flags = bits(places(data + at, DiagFrameParser::FLAG)) & rest;
    *escapes += count(found);
    return (bits(odd) | flags | (found & found << 1)) == 0;
}

// The size of a frame that is as long as its header says, where that can be told with a look at
// each byte; else 0.
WITH_AVX2 size_t plain_size(const uint8_t* data, size_t len, DiagHeader& header) {
    if (len < 1 + WORD || data[0] != DiagFrameParser::FLAG) {
        return 0;
    }
    if (bits(places(data + 1, DiagFrameParser::ESCAPE)) & HEADER) {
        header = DiagFrameParser::read_header(data + 1);
    } else {
        memcpy(&header, data + 1, sizeof(header));
    }
    size_t escapes;
    if (header.len < sizeof(header) || 1 + header.len + WORD > len ||
        !count_escapes(data + 1, header.len, &escapes)) {
        return 0;
    }
    // Each escape is a byte more, which may be an escape; so the last byte is none.
    size_t end = 1 + header.len;
    bool escaped = is_escape(data[end - 1]);
    for (size_t more = escapes; more > 0; more = escapes) {
        if (end + more >= len) {
            return 0;
        }
        escapes = 0;
        for (const size_t to = end + more; end < to; ++end) {
            const bool escape = is_escape(data[end]);
            if (data[end] == DiagFrameParser::FLAG || (escape && escaped)) {
                return 0;
            }
            escaped = escape;
            escapes += escape;
        }
    }
    return data[end] == DiagFrameParser::FLAG ? end + 1 : 0;
}

}  // namespace

#endif

size_t measure_frame(const uint8_t* data, size_t len, DiagHeader& header, size_t& body_len) {
#ifdef WITH_AVX2
    if (const size_t size = USABLE ? plain_size(data, len, header) : 0) {
        body_len = header.len;
        return size;
    }
#endif
    return DiagFrameParser::measure(data, len, header, body_len);
}
