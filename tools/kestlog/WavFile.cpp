// SPDX-License-Identifier: Apache-2.0

#include "kestlog/WavFile.h"

#include <errno.h>
#include <string.h>

#include <algorithm>

namespace {

constexpr size_t SILENCE_STEP = 64 * 1024;  // frames

// clang-format off
constexpr WavFormat FORMATS[] = {
    {"u8",    SF_FORMAT_PCM_U8, 1, false},
    {"s16le", SF_FORMAT_PCM_16, 2, false},
    {"s16be", SF_FORMAT_PCM_16, 2, true},
    {"s24le", SF_FORMAT_PCM_24, 3, false},
    {"s24be", SF_FORMAT_PCM_24, 3, true},
    {"s32le", SF_FORMAT_PCM_32, 4, false},
    {"s32be", SF_FORMAT_PCM_32, 4, true},
    {"f32le", SF_FORMAT_FLOAT,  4, false},
    {"f32be", SF_FORMAT_FLOAT,  4, true},
};
// clang-format on

}  // namespace

const WavFormat* find_wav_format(const std::string& name) {
    for (const WavFormat& format : FORMATS) {
        if (name == format.name) {
            return &format;
        }
    }
    return nullptr;
}

std::vector<std::string> wav_format_names() {
    std::vector<std::string> names;
    for (const WavFormat& format : FORMATS) {
        names.push_back(format.name);
    }
    return names;
}

// With the system's reason where there is one: the library puts words of its own before it.
bool WavFile::fail(const char* words) {
    m_error = errno != 0 ? strerror(errno) : words;
    return false;
}

bool WavFile::open(int fd, const WavFormat& format, int rate, int channels) {
    SF_INFO info = {};
    info.samplerate = rate;
    info.channels = channels;
    info.format = SF_FORMAT_RF64 | format.wav_format;
    m_format = &format;
    m_frame_bytes = format.bytes * static_cast<size_t>(channels);
    errno = 0;
    m_file = sf_open_fd(fd, SFM_WRITE, &info, SF_FALSE);
    if (!m_file) {
        return fail(sf_strerror(nullptr));
    }
    // A plain WAV file, if in the end it is small enough.
    sf_command(m_file, SFC_RF64_AUTO_DOWNGRADE, nullptr, SF_TRUE);
    return true;
}

bool WavFile::write(const uint8_t* data, size_t len) {
    m_pending.insert(m_pending.end(), data, data + len);
    const size_t whole = m_pending.size() / m_frame_bytes * m_frame_bytes;
    if (!put(m_pending.data(), whole)) {
        return false;
    }
    m_pending.erase(m_pending.begin(), m_pending.begin() + static_cast<ptrdiff_t>(whole));
    return true;
}

bool WavFile::write_silence(uint64_t frames) {
    // Silence is the middle of the range, which is not 0 where samples have no sign.
    const int middle = m_format->wav_format == SF_FORMAT_PCM_U8 ? 0x80 : 0;
    std::vector<uint8_t> silence(std::min<size_t>(SILENCE_STEP, frames) * m_frame_bytes);
    memset(silence.data(), middle, silence.size());
    while (frames > 0) {
        const uint64_t step = std::min<uint64_t>(SILENCE_STEP, frames);
        if (!put(silence.data(), static_cast<size_t>(step) * m_frame_bytes)) {
            return false;
        }
        frames -= step;
    }
    return true;
}

// Whole frames only.
bool WavFile::put(uint8_t* data, size_t len) {
    if (m_format->swapped) {
        for (size_t at = 0; at < len; at += m_format->bytes) {
            std::reverse(data + at, data + at + m_format->bytes);
        }
    }
    const sf_count_t want = static_cast<sf_count_t>(len);
    errno = 0;
    if (len > 0 && sf_write_raw(m_file, data, want) != want) {
        return fail(sf_strerror(m_file));
    }
    m_frames += len / m_frame_bytes;
    return true;
}

size_t WavFile::drop_unfinished() {
    const size_t dropped = m_pending.size();
    m_pending.clear();
    return dropped;
}

bool WavFile::close() {
    errno = 0;
    const int result = m_file ? sf_close(m_file) : 0;
    m_file = nullptr;
    return result == 0 || fail(sf_error_number(result));
}
