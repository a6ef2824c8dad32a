// SPDX-License-Identifier: Apache-2.0

#include "kestlog/FrameIndex.h"

#include <algorithm>

#ifdef __x86_64__
#include <immintrin.h>
#define WITH_AVX2 __attribute__((target("avx2,bmi,popcnt")))
#endif

namespace {

// Frames that are longer are measured one by one.
constexpr size_t BLOCK = 16 * 1024;

}  // namespace

bool FrameIndex::seek(const uint8_t* data, size_t len, uint64_t offset) {
    while (m_at < m_count && m_base + m_ends[m_at].flag + 1 < offset) {
        ++m_at;
    }
    if (m_at < m_count && m_base + m_ends[m_at].flag + 1 == offset) {
        m_escapes = m_ends[m_at++].escapes;
    } else if (offset < m_end) {
        return false;  // within a frame of the index
    }
    if (m_at == m_count && offset >= m_end && len > 0 && data[0] == DiagFrameParser::FLAG &&
        usable()) {
        m_base = offset;
        m_at = 0;
        m_escapes = 0;
        build(data, std::min(len, BLOCK));
    }
    m_next = offset;
    return m_at < m_count;
}

#ifdef WITH_AVX2

namespace {

constexpr size_t WORD = 64;  // bytes that are looked at together

// A bit for each of these bytes that is the wanted one.
WITH_AVX2 inline uint32_t places(__m256i bytes, __m256i wanted) {
    return static_cast<uint32_t>(_mm256_movemask_epi8(_mm256_cmpeq_epi8(bytes, wanted)));
}

WITH_AVX2 inline uint32_t count(uint64_t bits) {
    return static_cast<uint32_t>(__builtin_popcountll(bits));
}

}  // namespace

// As most processors of the last ten years can; the others look for one byte after the other.
bool FrameIndex::usable() {
    static const bool can = __builtin_cpu_supports("avx2") && __builtin_cpu_supports("bmi") &&
                            __builtin_cpu_supports("popcnt");
    return can;
}

WITH_AVX2 void FrameIndex::build(const uint8_t* data, size_t len) {
    const __m256i flag = _mm256_set1_epi8(static_cast<char>(DiagFrameParser::FLAG));
    const __m256i escape = _mm256_set1_epi8(static_cast<char>(DiagFrameParser::ESCAPE));
    // At most one end for each byte, and one more that is written but not kept.
    m_ends.resize(std::max(m_ends.size(), len + 1));
    End* end = m_ends.data();
    uint32_t escapes = 0;
    uint64_t flag_before = 1;  // the opening flag of the first frame is not alone
    uint64_t escape_before = 0;
    // The last bytes, with zeros behind them: a flag before what is not known ends no frame.
    uint8_t padded[WORD + 1];
    for (size_t at = 0; at < len; at += WORD) {
        const uint8_t* word = data + at;
        if (len - at <= WORD) {
            memset(padded, 0, sizeof(padded));
            memcpy(padded, word, len - at);
            word = padded;
        }
        const __m256i low = _mm256_loadu_si256(reinterpret_cast<const __m256i*>(word));
        const __m256i high = _mm256_loadu_si256(reinterpret_cast<const __m256i*>(word + WORD / 2));
        const uint64_t flags = uint64_t{places(high, flag)} << 32 | places(low, flag);
        const uint64_t specials = uint64_t{places(high, escape)} << 32 | places(low, escape);
        const uint64_t next = flags >> 1 | uint64_t{word[WORD] == DiagFrameParser::FLAG} << 63;
        const uint64_t alone = flags & ~(flags << 1 | flag_before) & ~next;
        // Rare: no frame that ends or begins in such a word is plain.
        const uint32_t odd = (alone | (specials & (specials << 1 | escape_before))) ? ODD : 0;
        flag_before = flags >> 63;
        escape_before = specials >> 63;
        // Mostly there is one end or none: the first is written without a branch, which would be
        // mispredicted half of the time.
        uint64_t ends = flags & next;
        do {
            const uint64_t before = (ends & -ends) - 1;
            end->flag = static_cast<uint32_t>(at) + count(before);
            escapes += odd;
            end->escapes = escapes + count(specials & before);
            end += ends != 0;
            ends &= ends - 1;
        } while (ends != 0);
        escapes += count(specials) + odd;
    }
    m_count = static_cast<size_t>(end - m_ends.data());
    const bool far = m_count > 0 && end[-1].flag >= len / 2;
    m_end = m_base + (far ? end[-1].flag + 1 : len);
}

#else

bool FrameIndex::usable() {
    return false;
}

void FrameIndex::build(const uint8_t*, size_t) {}

#endif
