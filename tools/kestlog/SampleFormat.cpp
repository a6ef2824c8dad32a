// SPDX-License-Identifier: Apache-2.0

#include "kestlog/SampleFormat.h"

#include <float.h>
#include <string.h>

#include <algorithm>
#include <cmath>

namespace {

enum ByteOrder { LITTLE, BIG };

// Of any width: the number's bytes become the upper ones of 32 bits.
template <size_t BYTES, ByteOrder ORDER>
int32_t upper_bits(const uint8_t* at) {
    uint32_t bits = 0;
    for (size_t i = 0; i < BYTES; ++i) {
        bits |= static_cast<uint32_t>(at[ORDER == BIG ? i : BYTES - 1 - i]) << (24 - 8 * i);
    }
    return static_cast<int32_t>(bits);
}

template <size_t BYTES, ByteOrder ORDER = LITTLE>
float read_signed(const uint8_t* at) {
    return static_cast<float>(upper_bits<BYTES, ORDER>(at)) / 2147483648.0f;
}

// Half of the range is silence.
template <size_t BYTES, ByteOrder ORDER = LITTLE>
float read_unsigned(const uint8_t* at) {
    return static_cast<float>(upper_bits<BYTES, ORDER>(at) ^ INT32_MIN) / 2147483648.0f;
}

template <typename T, ByteOrder ORDER = LITTLE>
float read_real(const uint8_t* at) {
    uint8_t bytes[sizeof(T)];  // as the workstations that run this have them: little-endian
    for (size_t i = 0; i < sizeof(T); ++i) {
        bytes[i] = at[ORDER == BIG ? sizeof(T) - 1 - i : i];
    }
    T value;
    memcpy(&value, bytes, sizeof(value));
    return std::isfinite(value) ? static_cast<float>(std::clamp<T>(value, -FLT_MAX, FLT_MAX))
                                : 0.0f;
}

// clang-format off
constexpr SampleFormat FORMATS[] = {
    {"cu8",     "u8",    1, read_unsigned<1>},
    {"ci8",     "s8",    1, read_signed<1>},
    {"cu16_le", nullptr, 2, read_unsigned<2>},
    {"cu16_be", nullptr, 2, read_unsigned<2, BIG>},
    {"ci16_le", "s16le", 2, read_signed<2>},
    {"ci16_be", "s16be", 2, read_signed<2, BIG>},
    {nullptr,   "s24le", 3, read_signed<3>},
    {nullptr,   "s24be", 3, read_signed<3, BIG>},
    {"cu32_le", nullptr, 4, read_unsigned<4>},
    {"cu32_be", nullptr, 4, read_unsigned<4, BIG>},
    {"ci32_le", "s32le", 4, read_signed<4>},
    {"ci32_be", "s32be", 4, read_signed<4, BIG>},
    {"cf32_le", "f32le", 4, read_real<float>},
    {"cf32_be", "f32be", 4, read_real<float, BIG>},
    {"cf64_le", nullptr, 8, read_real<double>},
    {"cf64_be", nullptr, 8, read_real<double, BIG>},
};
// clang-format on

typedef const char* SampleFormat::*NameField;

const SampleFormat* find(NameField field, const std::string& name) {
    for (const SampleFormat& format : FORMATS) {
        if (format.*field && name == format.*field) {
            return &format;
        }
    }
    return nullptr;
}

std::vector<std::string> names(NameField field) {
    std::vector<std::string> list;
    for (const SampleFormat& format : FORMATS) {
        if (format.*field) {
            list.push_back(format.*field);
        }
    }
    return list;
}

}  // namespace

const SampleFormat* iq_format(const std::string& name) {
    return find(&SampleFormat::iq, name);
}

const SampleFormat* pcm_format(const std::string& name) {
    return find(&SampleFormat::pcm, name);
}

std::vector<std::string> iq_format_names() {
    return names(&SampleFormat::iq);
}

std::vector<std::string> pcm_format_names() {
    return names(&SampleFormat::pcm);
}
