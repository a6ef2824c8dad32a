// SPDX-License-Identifier: Apache-2.0
// The header that the service puts in front of each chunk of the audio DSP's data.
#ifndef SIM_DSPHEADER_H_
#define SIM_DSPHEADER_H_

#include <stddef.h>
#include <stdint.h>

// What the data of a chunk came from: the DSP's log, its PCM capture or its memory dump.
enum class DspSource { LOG, PCM, DUMP, UNKNOWN };

struct DspHeader {
    static constexpr size_t SIZE = 20;
    static constexpr size_t MAX_DATA = 0xFFFF - 16;  // bytes of data behind a header

    // Reads SIZE bytes. False when they do not begin like a header, or when the sizes in them
    // cannot be.
    bool read(const uint8_t* bytes);

    size_t data_size;
    uint32_t number;
    DspSource source;
    bool right_form;  // what never changes, and the sizes agree
    bool right_sum;
};

#endif  // SIM_DSPHEADER_H_
