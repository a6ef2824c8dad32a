// SPDX-License-Identifier: Apache-2.0
// Noise that can be made again: a number without pattern for every number.
#ifndef SIM_NOISE_H_
#define SIM_NOISE_H_

#include <stdint.h>

inline uint64_t noise_of(uint64_t x) {
    x += 0x9e3779b97f4a7c15u;
    x = (x ^ (x >> 30)) * 0xbf58476d1ce4e5b9u;
    x = (x ^ (x >> 27)) * 0x94d049bb133111ebu;
    return x ^ (x >> 31);
}

#endif  // SIM_NOISE_H_
