// SPDX-License-Identifier: Apache-2.0
// The audio DSP's devices: its log, its PCM capture and its memory dump, which becomes
// readable when the DSP asserts and waits for the service to confirm that it has taken it.
// The dump device needs the library kestsim_devices preloaded into the service, which is
// its driver. Everything is removed from the file system at the end.
#ifndef SIM_SIMDSPDEVICE_H_
#define SIM_SIMDSPDEVICE_H_

#include <stddef.h>
#include <stdint.h>

#include <string>
#include <vector>

#include "sim/SharedFile.h"
#include "sim/SimLogDevice.h"

struct DspControl;

class SimDspDevice {
public:
    SimDspDevice() = default;
    SimDspDevice(const SimDspDevice&) = delete;
    SimDspDevice& operator=(const SimDspDevice&) = delete;

    // Makes the devices in this root; false with errno set on failure.
    bool create(const std::string& root);
    bool exists() const { return control() != nullptr; }

    SimLogDevice& log() { return m_log; }
    SimLogDevice& pcm() { return m_pcm; }
    // The DSP asserts, with this memory. False if it is larger than the device's (8 MiB)
    // or the service has not confirmed the last one.
    bool crash(const std::vector<uint8_t>& memory);
    // Dumps that the service confirmed, and what it had not read of the last one then.
    unsigned dumps_taken() const;
    size_t unread() const;
    // Requests that make no sense: unknown ones, a confirmation when there is no dump.
    unsigned wrong_requests() const;

private:
    DspControl* control() const;

    SimLogDevice m_log;
    SimLogDevice m_pcm;
    SimLogDevice m_node;  // of the dump
    SharedFile m_control;
    SharedFile m_memory;
};

#endif  // SIM_SIMDSPDEVICE_H_
