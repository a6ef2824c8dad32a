// SPDX-License-Identifier: Apache-2.0
// What was measured again and again.
#ifndef BENCH_SAMPLES_H_
#define BENCH_SAMPLES_H_

#include <stddef.h>

#include <vector>

class Samples {
public:
    void add(double value) { m_values.push_back(value); }
    size_t count() const { return m_values.size(); }
    // Of at least one value. The quantile of 0 is the least, that of 1 the greatest.
    double quantile(double part) const;
    double median() const { return quantile(0.5); }
    double least() const { return quantile(0); }
    double greatest() const { return quantile(1); }

    // Each value divided by the other's of the same round.
    Samples over(const Samples& other) const;

private:
    std::vector<double> m_values;
};

#endif  // BENCH_SAMPLES_H_
