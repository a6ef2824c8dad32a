// SPDX-License-Identifier: Apache-2.0

#include "simulation/IqDevice.h"

#include <string.h>
#include <sys/mman.h>
#include <sys/socket.h>
#include <unistd.h>

#include "iq/IqStorRespHandler.h"
#include "iq/iq_mem.h"
#include "sim/files.h"
#include "simulation/CodedStream.h"
#include "simulation/Devices.h"

namespace {

constexpr unsigned SAMPLE_STREAM = 100;  // no log device's

int s_memory = -1;
const uint8_t* s_samples;

bool is_within(const IqState& iq) {
    return iq.offset <= IQ_MEM_SIZE && iq.len <= IQ_MEM_SIZE - iq.offset;
}

}  // namespace

void IqDevice::make_memory() {
    if (s_memory >= 0) {
        return;
    }
    s_memory = memfd_create("iq_mem", MFD_CLOEXEC);
    void* memory = MAP_FAILED;
    if (s_memory >= 0 && ftruncate(s_memory, IQ_MEM_SIZE) == 0) {
        memory = mmap(nullptr, SAMPLES, PROT_READ | PROT_WRITE, MAP_SHARED, s_memory, 0);
    }
    if (memory == MAP_FAILED) {
        fail_run("simulation", "no memory for I/Q samples: %s", strerror(errno));
    }
    coded_stream::fill(SAMPLE_STREAM, 0, static_cast<uint8_t*>(memory), SAMPLES);
    s_samples = static_cast<const uint8_t*>(memory);
}

// ---- The driver

int IqDevice::open() {
    if (m_peer >= 0) {
        close(m_peer);
    }
    m_fd = Devices::open_pair(FD_IQ_DEVICE, &m_peer);
    return m_fd;
}

void* IqDevice::map(size_t len, int protection, int flags) {
    return mmap(nullptr, len, protection, flags, s_memory, 0);
}

// Nothing is to be read any more.
void IqDevice::empty() {
    uint8_t byte;
    while (recv(m_fd, &byte, 1, 0) > 0) {
    }
    g_state->iq.filled = g_state->iq.taken = false;
}

int IqDevice::control(unsigned long request, unsigned long argument) {
    IqState& iq = g_state->iq;
    switch (request) {
        case CMD_SET_IQ_CH_TYPE:
            iq.in_use = argument == 1;
            iq.stops = 0;
            empty();
            return 0;
        case CMD_GET_IQ_BUF_INFO: {
            if (!iq.filled || iq.taken) {
                fail_run("iq", "the service asks for a buffer %s",
                         iq.filled ? "twice" : "too many");
            }
            iq.taken = true;
            iq.failed = false;
            iq.saved = 0;
            const IqBufInfo info = {iq.offset, iq.len};
            memcpy(reinterpret_cast<void*>(argument), &info, sizeof(info));
            return 0;
        }
        case CMD_RELEASE_IQ_BUF:
            trace("I/Q buffer released, %u of %u bytes saved", iq.saved, iq.len);
            empty();
            return 0;
        default:
            fail_run("iq", "unknown request %lx", request);
    }
}

void IqDevice::fill(uint64_t place, uint64_t len) {
    IqState& iq = g_state->iq;
    if (!iq.in_use || iq.filled) {
        return;
    }
    iq.filled = true;
    iq.len = static_cast<uint32_t>(len);
    // One that is too long begins near the end of the memory, or of all numbers.
    iq.offset = static_cast<uint32_t>(len <= SAMPLES ? place % (SAMPLES - len + 1)
                                      : place % 2    ? IQ_MEM_SIZE - 5
                                                     : UINT32_MAX - 5);
    const uint8_t ready = 1;
    if (send(m_peer, &ready, 1, MSG_NOSIGNAL) != 1) {
        iq.in_use = iq.filled = false;  // the service closed it
    }
}

// ---- What became of it

void IqDevice::written(const uint8_t* data, ssize_t n) {
    IqState& iq = g_state->iq;
    if (n < 0) {
        iq.failed = true;
        return;
    }
    const uint32_t len = static_cast<uint32_t>(n);
    if (!iq.taken || len > iq.len - iq.saved ||
        memcmp(data, s_samples + iq.offset + iq.saved, len) != 0) {
        fail_run("iq", "%u bytes behind %u of %u are not the buffer's", len, iq.saved, iq.len);
    }
    iq.saved += len;
    g_state->counters.iq_bytes += len;
}

void IqDevice::commanded(int command) {
    g_state->iq.stops += command == IQST_STOP;
}

void IqDevice::responds(int response) {
    IqState& iq = g_state->iq;
    trace("thread responds %d", response);
    if (response == IQST_STOPPED && iq.stops-- == 0) {
        fail_run("iq", "the thread stopped, which nobody asked for");
    }
    if (response == IQST_SAVED && iq.taken && !iq.failed && is_within(iq) && iq.saved != iq.len) {
        fail_run("iq", "only %u of %u bytes are saved", iq.saved, iq.len);
    }
}

void IqDevice::check_file(const std::string& path) {
    const std::string text = read_text_file(path);
    const uint8_t* const bytes = reinterpret_cast<const uint8_t*>(text.data());
    uint64_t at;
    if (text.size() >= 15 &&
        (!coded_stream::locate(SAMPLE_STREAM, bytes, text.size(), &at) ||
         at + text.size() > SAMPLES || memcmp(s_samples + at, bytes, text.size()) != 0)) {
        fail_run("iq", "%s has something else than samples", path.c_str());
    }
}

void IqDevice::check_saved() {
    const IqState& iq = g_state->iq;
    if (!iq.in_use || iq.filled || iq.len == 0 || iq.saved != iq.len) {
        fail_run("iq", "of a buffer of %u bytes in calm, %u are saved; in use %d, filled %d",
                 iq.len, iq.saved, iq.in_use, iq.filled);
    }
}
