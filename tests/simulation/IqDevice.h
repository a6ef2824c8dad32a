// SPDX-License-Identifier: Apache-2.0
// The modem's I/Q memory device: its driver, and what has to become of each buffer that it
// reports. Its samples never change and each tells its own place, so that a piece of a file tells
// what it is. Belongs to one life of the service; the driver's own state is in the State.
#ifndef SIMULATION_IQDEVICE_H_
#define SIMULATION_IQDEVICE_H_

#include <stddef.h>
#include <stdint.h>
#include <sys/types.h>

#include <string>

#include "simulation/Calls.h"

class IqDevice {
public:
    // So much of the memory holds samples.
    static constexpr uint32_t SAMPLES = 32u << 20;

    // Makes the memory, before the first life.
    static void make_memory();

    // The calls of the service: open, mmap, ioctl.
    int open();
    static void* map(size_t len, int protection, int flags);
    int control(unsigned long request, unsigned long argument);

    // A buffer is filled, if the last one is done with and the device in use.
    void fill(uint64_t place, uint64_t len);

    // The thread wrote to an I/Q file, n bytes or with a failure.
    static void written(const uint8_t* data, ssize_t n);
    // The thread told the loop what came of it; the loop sent a command.
    static void responds(int response);
    static void commanded(int command);

    // Samples and nothing else, one behind the other.
    static void check_file(const std::string& path);
    // The last buffer, filled in the calm, was saved whole.
    static void check_saved();

private:
    void empty();

    int m_fd = -1;  // the service's
    int m_peer = -1;
};

#endif  // SIMULATION_IQDEVICE_H_
