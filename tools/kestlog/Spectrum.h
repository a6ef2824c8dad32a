// SPDX-License-Identifier: Apache-2.0
// The spectrum over time of an I/Q capture: all of its samples go into it, in columns of equal
// length.
#ifndef KESTLOG_SPECTRUM_H_
#define KESTLOG_SPECTRUM_H_

#include <complex>
#include <vector>

#include "kestlog/LogReader.h"
#include "kestlog/SampleFormat.h"

struct Spectrum {
    static constexpr size_t BINS = 256;
    static constexpr size_t MAX_COLUMNS = 256;
    // A level of 0 stands for this and less, one of 255 for a tone of full scale (0 dB).
    static constexpr float LOWEST_DB = -127.5f;

    size_t columns = 0;
    uint64_t samples = 0;
    // Column by column, from the most negative frequency on.
    std::vector<uint8_t> levels;
};

// In place; the size is a power of two.
void fourier_transform(std::vector<std::complex<float>>* samples);

// Reads the rest of the file.
Spectrum spectrum_of(LogReader& in, const SampleFormat& format);

#endif  // KESTLOG_SPECTRUM_H_
