// SPDX-License-Identifier: Apache-2.0
// The modem's I/Q memory device: 128 MiB of samples, a part of which is announced to the
// service as a filled buffer and stays until the service releases it. Needs the library
// kestsim_devices preloaded into the service, which is the device's driver. Everything is
// removed from the file system at the end.
#ifndef SIM_SIMIQDEVICE_H_
#define SIM_SIMIQDEVICE_H_

#include <stddef.h>
#include <stdint.h>

#include <string>

#include "sim/SharedFile.h"
#include "sim/SimLogDevice.h"

struct IqControl;

class SimIqDevice {
public:
    SimIqDevice() = default;
    SimIqDevice(const SimIqDevice&) = delete;
    SimIqDevice& operator=(const SimIqDevice&) = delete;

    // Makes the device in this root; false with errno set on failure.
    bool create(const std::string& root);
    bool exists() const { return control() != nullptr; }

    // Fills a part of the memory with samples that depend on the seed only. Not to be done
    // to a buffer that is announced.
    void write_samples(uint32_t offset, uint32_t len, uint32_t seed);
    // The part is ready to be saved. False while the service has not released the last one.
    bool announce(uint32_t offset, uint32_t len);
    // A buffer of these bytes, at the start of the memory.
    bool announce_bytes(const std::string& bytes);
    // Both.
    bool fill(uint32_t offset, uint32_t len, uint32_t seed);
    // Whether the file holds exactly the samples of this seed.
    static bool holds_samples(const std::string& path, uint32_t len, uint32_t seed);

    bool in_use() const;        // as the service says
    bool filled() const;        // a buffer is announced and not released
    unsigned released() const;  // buffers, so far
    // Requests that make no sense: unknown ones, a buffer asked for when there is none.
    unsigned wrong_requests() const;
    // When the service asked for the current or last buffer and when it released it: ns of
    // the steady clock.
    int64_t taken_ns() const;
    int64_t released_ns() const;

private:
    IqControl* control() const;

    SimLogDevice m_node;
    SharedFile m_control;
    SharedFile m_memory;
};

#endif  // SIM_SIMIQDEVICE_H_
