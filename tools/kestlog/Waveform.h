// SPDX-License-Identifier: Apache-2.0
// The envelope of PCM data of any length: the least and the greatest sample of each of at most
// MAX_POINTS stretches of equal length.
#ifndef KESTLOG_WAVEFORM_H_
#define KESTLOG_WAVEFORM_H_

#include <utility>
#include <vector>

#include "kestlog/SampleFormat.h"

class Waveform {
public:
    static constexpr size_t MAX_POINTS = 1000;
    static constexpr size_t MAX_CHANNELS = 16;

    // channels: 1 to MAX_CHANNELS.
    Waveform(const SampleFormat& format, size_t channels);

    // Data that follows the last; the channels may be cut anywhere.
    void add(const uint8_t* data, size_t len);
    // Data was lost: what comes next begins with the first channel.
    void restart() { m_rest.clear(); }

    // Of each channel.
    uint64_t samples() const { return m_samples; }
    uint64_t samples_per_point() const { return m_per_point; }
    // Least and greatest of a point: those of all its channels stand together.
    const std::vector<std::pair<float, float>>& points() const { return m_points; }

private:
    void take(const uint8_t* at);
    void halve();

    const SampleFormat& m_format;
    const size_t m_channels;
    std::vector<uint8_t> m_rest;  // of a sample that was cut
    std::vector<std::pair<float, float>> m_points;
    uint64_t m_per_point = 1;
    uint64_t m_samples = 0;
};

#endif  // KESTLOG_WAVEFORM_H_
