// SPDX-License-Identifier: Apache-2.0

#include "kestlog/SampleFormat.h"

#include <string.h>

#include <cmath>

namespace {

template <typename T>
T number_at(const uint8_t* at) {
    T value;  // the files and the workstations that run this are little-endian
    memcpy(&value, at, sizeof(value));
    return value;
}

float read_s8(const uint8_t* at) {
    return static_cast<float>(number_at<int8_t>(at)) / 128.0f;
}

float read_s16(const uint8_t* at) {
    return static_cast<float>(number_at<int16_t>(at)) / 32768.0f;
}

float read_s32(const uint8_t* at) {
    return static_cast<float>(number_at<int32_t>(at)) / 2147483648.0f;
}

float read_f32(const uint8_t* at) {
    const float value = number_at<float>(at);
    return std::isfinite(value) ? value : 0.0f;
}

constexpr SampleFormat FORMATS[] = {
    {"ci8", "s8", 1, read_s8},
    {"ci16_le", "s16le", 2, read_s16},
    {"ci32_le", "s32le", 4, read_s32},
    {"cf32_le", "f32le", 4, read_f32},
};

typedef const char* SampleFormat::*NameField;

const SampleFormat* find(NameField field, const std::string& name) {
    for (const SampleFormat& format : FORMATS) {
        if (name == format.*field) {
            return &format;
        }
    }
    return nullptr;
}

std::string names(NameField field) {
    std::string text;
    for (const SampleFormat& format : FORMATS) {
        text += (text.empty() ? "" : ", ") + std::string(format.*field);
    }
    return text;
}

}  // namespace

const SampleFormat* iq_format(const std::string& name) {
    return find(&SampleFormat::iq, name);
}

const SampleFormat* pcm_format(const std::string& name) {
    return find(&SampleFormat::pcm, name);
}

std::string iq_format_names() {
    return names(&SampleFormat::iq);
}

std::string pcm_format_names() {
    return names(&SampleFormat::pcm);
}
