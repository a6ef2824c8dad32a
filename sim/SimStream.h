// SPDX-License-Identifier: Apache-2.0
// The endless log stream of one simulated CP. Every byte is a pure function of the CP,
// a seed and the byte's position, so nothing that was fed has to be remembered to be
// checked. The stream consists of 64-byte blocks, each a diag frame whose sequence number
// is that of the block: a piece of it found in a file says by itself where in the stream it
// belongs, for the first 256 GiB.
#ifndef SIM_SIMSTREAM_H_
#define SIM_SIMSTREAM_H_

#include <stddef.h>
#include <stdint.h>

class SimStream {
public:
    static constexpr size_t BLOCK_SIZE = 64;

    explicit SimStream(uint8_t cp, uint32_t seed = 1) : m_cp(cp), m_seed(seed) {}

    // Writes the len bytes of the stream that start at position pos.
    void fill(uint64_t pos, uint8_t* dst, size_t len) const;
    // Finds the first whole, untouched block in data: its offset there and its position in
    // the stream. False if there is none.
    bool locate(const uint8_t* data, size_t len, size_t* offset, uint64_t* pos) const;
    // Number of leading bytes of data equal to the stream from pos on.
    size_t match(uint64_t pos, const uint8_t* data, size_t len) const;
    // Number of bytes, at most len, in front of data_end equal to the stream in front of pos.
    size_t match_back(uint64_t pos, const uint8_t* data_end, size_t len) const;

private:
    void make_block(uint32_t number, uint8_t* block) const;

    uint8_t m_cp;
    uint32_t m_seed;
};

#endif  // SIM_SIMSTREAM_H_
