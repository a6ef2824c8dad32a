// SPDX-License-Identifier: Apache-2.0

#include "kestlog/Waveform.h"

#include <algorithm>
#include <iterator>

Waveform::Waveform(const SampleFormat& format, size_t channels)
    : m_format(format), m_channels(channels) {
    m_points.reserve(MAX_POINTS * channels);
}

void Waveform::add(const uint8_t* data, size_t len) {
    const size_t all = m_channels * m_format.bytes;
    if (!m_rest.empty()) {
        const size_t n = std::min(len, all - m_rest.size());
        std::copy_n(data, n, std::back_inserter(m_rest));
        data += n;
        len -= n;
        if (m_rest.size() < all) {
            return;
        }
        take(m_rest.data());
        m_rest.clear();
    }
    for (; len >= all; data += all, len -= all) {
        take(data);
    }
    m_rest.assign(data, data + len);
}

void Waveform::take(const uint8_t* at) {
    if (m_samples == MAX_POINTS * m_per_point) {
        halve();
    }
    const bool first = m_samples % m_per_point == 0;
    for (size_t c = 0; c < m_channels; ++c, at += m_format.bytes) {
        const float value = m_format.read(at);
        if (first) {
            m_points.push_back({value, value});
        } else {
            std::pair<float, float>& point = m_points[m_points.size() - m_channels + c];
            point = {std::min(point.first, value), std::max(point.second, value)};
        }
    }
    ++m_samples;
}

// Every two points become one.
void Waveform::halve() {
    for (size_t i = 0; i < MAX_POINTS / 2; ++i) {
        for (size_t c = 0; c < m_channels; ++c) {
            const std::pair<float, float>& a = m_points[2 * i * m_channels + c];
            const std::pair<float, float>& b = m_points[(2 * i + 1) * m_channels + c];
            m_points[i * m_channels + c] = {std::min(a.first, b.first),
                                            std::max(a.second, b.second)};
        }
    }
    m_points.resize(MAX_POINTS / 2 * m_channels);
    m_per_point *= 2;
}
