// SPDX-License-Identifier: Apache-2.0

#include "kestlog/Spectrum.h"

#include <algorithm>
#include <cmath>

namespace {

constexpr double TURN = 6.283185307179586;

// The level of the mean power, which a full-scale tone has as 1.
uint8_t level_of(double power) {
    const double db = 10 * std::log10(std::max(power, 1e-13));
    const double level = 255 * (1 - db / static_cast<double>(Spectrum::LOWEST_DB));
    return static_cast<uint8_t>(std::lround(std::clamp(level, 0.0, 255.0)));
}

}  // namespace

void fourier_transform(std::vector<std::complex<float>>* samples) {
    std::vector<std::complex<float>>& x = *samples;
    const size_t n = x.size();
    for (size_t i = 1, j = 0; i < n; ++i) {  // by reversed bits
        size_t bit = n >> 1;
        for (; j & bit; bit >>= 1) {
            j ^= bit;
        }
        j ^= bit;
        if (i < j) {
            std::swap(x[i], x[j]);
        }
    }
    static std::vector<std::complex<float>> roots;
    if (roots.size() != n / 2) {
        roots.resize(n / 2);
        for (size_t k = 0; k < n / 2; ++k) {
            const double angle = -TURN * static_cast<double>(k) / static_cast<double>(n);
            roots[k] = {static_cast<float>(std::cos(angle)), static_cast<float>(std::sin(angle))};
        }
    }
    for (size_t half = 1; half < n; half *= 2) {
        const size_t step = n / (2 * half);
        for (size_t start = 0; start < n; start += 2 * half) {
            for (size_t k = 0; k < half; ++k) {
                std::complex<float>& a = x[start + k];
                std::complex<float>& b = x[start + k + half];
                const std::complex<float> w = roots[k * step];
                // By parts: the operator also looks for numbers that are none.
                const std::complex<float> turned(w.real() * b.real() - w.imag() * b.imag(),
                                                 w.real() * b.imag() + w.imag() * b.real());
                b = a - turned;
                a += turned;
            }
        }
    }
}

Spectrum spectrum_of(LogReader& in, const SampleFormat& format) {
    constexpr size_t N = Spectrum::BINS;
    const size_t pair = 2 * format.bytes;
    Spectrum spectrum;
    spectrum.samples = in.size() / pair;
    const uint64_t windows = spectrum.samples / N;
    spectrum.columns = static_cast<size_t>(std::min<uint64_t>(windows, Spectrum::MAX_COLUMNS));
    std::vector<float> hann(N);
    for (size_t k = 0; k < N; ++k) {
        hann[k] = static_cast<float>(1 - std::cos(TURN * static_cast<double>(k) / N)) / N;
    }
    std::vector<std::complex<float>> x(N);
    std::vector<double> power(N);
    uint64_t in_column = 0;
    for (uint64_t w = 0; w < windows; ++w) {
        size_t got;
        const uint8_t* data = in.peek(N * pair, got);
        if (got < N * pair) {
            break;  // it has become shorter
        }
        for (size_t k = 0; k < N; ++k, data += pair) {
            x[k] = {format.read(data) * hann[k], format.read(data + format.bytes) * hann[k]};
        }
        in.skip(N * pair);
        fourier_transform(&x);
        for (size_t k = 0; k < N; ++k) {
            power[k] += static_cast<double>(std::norm(x[(k + N / 2) % N]));
        }
        ++in_column;
        if ((w + 1) * spectrum.columns / windows != w * spectrum.columns / windows) {
            for (double& sum : power) {
                spectrum.levels.push_back(level_of(sum / static_cast<double>(in_column)));
                sum = 0;
            }
            in_column = 0;
        }
    }
    spectrum.columns = spectrum.levels.size() / N;
    return spectrum;
}
