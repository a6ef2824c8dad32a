// A CP's log device: a FIFO that the service opens by its path. The simulator keeps it
// open for reading and writing, so neither side ever sees the other hang up and what was
// fed waits in it while the service is away. Removed from the file system at the end.
#ifndef SIM_SIMLOGDEVICE_H_
#define SIM_SIMLOGDEVICE_H_

#include <stddef.h>
#include <sys/types.h>

#include <string>

class SimLogDevice {
public:
    SimLogDevice() = default;
    ~SimLogDevice() { remove(); }
    SimLogDevice(const SimLogDevice&) = delete;
    SimLogDevice& operator=(const SimLogDevice&) = delete;

    // Makes the FIFO; false with errno set on failure.
    bool create(const std::string& path);
    // Takes the device away: a service that holds it open gets no more data from it.
    void remove();

    // Never blocks. Number of bytes taken (0 when the device is full), -1 on an error.
    ssize_t feed(const void* data, size_t len);
    // Bytes fed that the service has not read yet.
    size_t pending() const;
    // Waits until the service has read everything; false when the time is over.
    bool wait_drained(int timeout_ms) const;

    const std::string& path() const { return m_path; }

private:
    std::string m_path;
    int m_fd = -1;
};

#endif  // SIM_SIMLOGDEVICE_H_
