// SPDX-License-Identifier: Apache-2.0
// What the simulator and the drivers that are preloaded into the service's process share:
// for each device a small control file and a file with its memory, beside the device's
// node, mapped on both sides. The node itself is a FIFO: a byte in it makes the device
// readable. The drivers recognise a descriptor by the node that it belongs to.
#ifndef SIM_DEVICE_CONTROL_H_
#define SIM_DEVICE_CONTROL_H_

#include <stddef.h>
#include <stdint.h>

#include <atomic>

#define IQ_NODE "dev/iq_mem"
#define IQ_CONTROL "dev/.iq_mem_control"
#define IQ_MEMORY "dev/.iq_mem_memory"
#define DSP_NODE "dev/audio_dsp_mem"
#define DSP_CONTROL "dev/.audio_dsp_control"
#define DSP_MEMORY "dev/.audio_dsp_memory"

constexpr size_t IQ_MEMORY_SIZE = 128 << 20;
constexpr size_t DSP_MEMORY_SIZE = 8 << 20;  // at most, of one dump

// The requests that the drivers understand.
constexpr unsigned long IQ_REQUEST_CHANNEL = 0x80;  // int: 1 in use, 0 not in use
constexpr unsigned long IQ_REQUEST_BUFFER = 0;      // IqBuffer*
constexpr unsigned long IQ_REQUEST_RELEASE = 0x82;
constexpr unsigned long DSP_REQUEST_DONE = 0x40045806;

struct IqBuffer {
    uint32_t offset;
    uint32_t len;
};

struct NodeId {
    uint64_t dev;
    uint64_t ino;
};

struct IqControl {
    NodeId node;
    IqBuffer buffer;                   // valid while filled is set
    std::atomic<uint32_t> filled;      // 1 from the announcement to the release
    std::atomic<uint32_t> in_use;      // the channel type last set
    std::atomic<uint32_t> released;    // buffers released
    std::atomic<uint32_t> wrong;       // requests out of turn or unknown
    std::atomic<int64_t> taken_ns;     // when the current buffer was asked for, steady clock
    std::atomic<int64_t> released_ns;  // when the last one was released
};

struct DspControl {
    NodeId node;
    std::atomic<uint32_t> size;       // of the dump; 0 when there is none
    std::atomic<uint32_t> position;   // read so far
    std::atomic<uint32_t> completed;  // dumps whose end was confirmed
    std::atomic<uint32_t> unread;     // of the last one when it was confirmed
    std::atomic<uint32_t> wrong;      // requests out of turn or unknown
};

static_assert(std::atomic<uint32_t>::is_always_lock_free &&
                  std::atomic<int64_t>::is_always_lock_free,
              "the atomics are shared between processes");

#endif  // SIM_DEVICE_CONTROL_H_
