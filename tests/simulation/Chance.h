// SPDX-License-Identifier: Apache-2.0
// A small generator of chance. Every event and every fault has one of its own, made from its
// own number, so that leaving one event out changes none of the others.
#ifndef SIMULATION_CHANCE_H_
#define SIMULATION_CHANCE_H_

#include <stdint.h>

class Chance {
public:
    explicit Chance(uint64_t seed, uint64_t stream = 0)
        : m_state(seed * 0x9e3779b97f4a7c15u ^ (stream + 1) * 0xd1342543de82ef95u) {
        next();
    }

    uint64_t next() {
        m_state += 0x9e3779b97f4a7c15u;
        uint64_t z = m_state;
        z = (z ^ (z >> 30)) * 0xbf58476d1ce4e5b9u;
        z = (z ^ (z >> 27)) * 0x94d049bb133111ebu;
        return z ^ (z >> 31);
    }
    // 0 to limit - 1.
    uint64_t below(uint64_t limit) { return next() % limit; }
    bool one_in(uint64_t n) { return below(n) == 0; }
    template <typename T, uint64_t N>
    const T& pick(const T (&table)[N]) {
        return table[below(N)];
    }

private:
    uint64_t m_state;
};

#endif  // SIMULATION_CHANCE_H_
