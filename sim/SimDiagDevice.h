// SPDX-License-Identifier: Apache-2.0
// A CP's diag device: a pseudo-terminal in raw mode. The service opens the path (a link
// to the slave side), sends requests and reads replies; the simulator plays the CP on the
// master side. The link is removed at the end.
#ifndef SIM_SIMDIAGDEVICE_H_
#define SIM_SIMDIAGDEVICE_H_

#include <stddef.h>
#include <stdint.h>

#include <string>
#include <vector>

class SimDiagDevice {
public:
    SimDiagDevice() = default;
    ~SimDiagDevice() { remove(); }
    SimDiagDevice(const SimDiagDevice&) = delete;
    SimDiagDevice& operator=(const SimDiagDevice&) = delete;

    // Makes the device and the link to it; false with errno set on failure.
    bool create(const std::string& path);
    void remove();

    // Reads what the service sent, waiting until at least min bytes are there or the time
    // is over; gives what there is.
    std::vector<uint8_t> read_request(size_t min, int timeout_ms) const;
    // Sends all bytes, waiting for the service to make room; false when the time is over
    // or on an error.
    bool write_reply(const void* data, size_t len, int timeout_ms) const;
    // The same, but gives the number of bytes that were sent in time.
    size_t write_some(const void* data, size_t len, int timeout_ms) const;
    // Bytes of replies that the service has not read yet. The kernel holds back more than
    // a few KB and shows them as they are read: only 0 that stays 0 means that all is read.
    size_t pending() const;
    // Throws away what the service has not read.
    void discard() const;

    const std::string& path() const { return m_path; }

protected:
    int m_master = -1;
    int m_slave = -1;  // kept open so that the device outlives the service's opening it

private:
    std::string m_path;
};

#endif  // SIM_SIMDIAGDEVICE_H_
