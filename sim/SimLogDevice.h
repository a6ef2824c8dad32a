// SPDX-License-Identifier: Apache-2.0
// A CP's log device: a FIFO that the service opens by its path, or a pseudo-terminal when
// the service has to be able to send requests through it as well. The simulator keeps it
// open on both sides, so neither side ever sees the other hang up and what was fed waits
// in it while the service is away. Removed from the file system at the end.
#ifndef SIM_SIMLOGDEVICE_H_
#define SIM_SIMLOGDEVICE_H_

#include <stddef.h>
#include <sys/types.h>

#include <string>

#include "sim/SimDiagDevice.h"

class SimLogDevice {
public:
    SimLogDevice() = default;
    ~SimLogDevice() { remove(); }
    SimLogDevice(const SimLogDevice&) = delete;
    SimLogDevice& operator=(const SimLogDevice&) = delete;

    // Makes the FIFO, or the terminal; false with errno set on failure.
    bool create(const std::string& path, bool terminal = false);
    // Takes the device away: a service that holds it open gets no more data from it.
    void remove();

    // Lets go of the FIFO, which stays: a writer of the caller's own takes its place, sees
    // when the service opens it and waits for the service in its writes.
    void leave_to_writer();

    // Never blocks. Number of bytes taken (0 when the device is full), -1 on an error.
    ssize_t feed(const void* data, size_t len);
    // Bytes fed that the service has not read yet; of a terminal see SimDiagDevice.
    size_t pending() const;
    // Waits until the service has read everything; false when the time is over.
    bool wait_drained(int timeout_ms) const;

    const std::string& path() const { return m_path; }
    // The device's other uses; null for a FIFO.
    SimDiagDevice* terminal() { return m_is_terminal ? &m_terminal : nullptr; }

private:
    std::string m_path;
    int m_fd = -1;
    SimDiagDevice m_terminal;
    bool m_is_terminal = false;
};

#endif  // SIM_SIMLOGDEVICE_H_
