// SPDX-License-Identifier: Apache-2.0

#include "bench/Samples.h"

#include <algorithm>
#include <cmath>

double Samples::quantile(double part) const {
    std::vector<double> sorted = m_values;
    std::sort(sorted.begin(), sorted.end());
    const double at = part * static_cast<double>(sorted.size() - 1);
    const size_t below = static_cast<size_t>(at);
    const size_t above = std::min(below + 1, sorted.size() - 1);
    return sorted[below] + (at - std::floor(at)) * (sorted[above] - sorted[below]);
}

Samples Samples::over(const Samples& other) const {
    Samples ratios;
    for (size_t i = 0; i < std::min(count(), other.count()); ++i) {
        ratios.add(m_values[i] / other.m_values[i]);
    }
    return ratios;
}
