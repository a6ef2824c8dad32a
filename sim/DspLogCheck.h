// SPDX-License-Identifier: Apache-2.0
// Reads an audio DSP's log files and takes the chunks apart: the headers are checked, the
// data of each source is put together again.
#ifndef SIM_DSPLOGCHECK_H_
#define SIM_DSPLOGCHECK_H_

#include <stddef.h>
#include <stdint.h>

#include <string>
#include <vector>

#include "sim/DspHeader.h"

class DspLogCheck {
public:
    // Adds a log file; the oldest comes first. False when it cannot be read.
    bool add_file(const std::string& path);

    const std::vector<uint8_t>& data(DspSource source) const {
        return m_data[static_cast<size_t>(source)];
    }
    unsigned chunks() const { return m_chunks; }
    // Headers that are wrong, chunks cut short, numbers out of sequence.
    unsigned damages() const { return m_damages; }
    const std::string& first_damage() const { return m_first_damage; }

private:
    size_t take_chunk(const uint8_t* bytes, size_t len);
    void damage(const std::string& text);

    // For each known source.
    std::vector<uint8_t> m_data[static_cast<size_t>(DspSource::UNKNOWN)];
    unsigned m_chunks = 0;
    uint32_t m_next_number = 0;
    unsigned m_damages = 0;
    std::string m_first_damage;
};

#endif  // SIM_DSPLOGCHECK_H_
