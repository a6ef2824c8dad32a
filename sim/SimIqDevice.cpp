// SPDX-License-Identifier: Apache-2.0

#include "sim/SimIqDevice.h"

#include <fcntl.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <vector>

#include "sim/device_control.h"
#include "sim/noise.h"

namespace {

// A circle in sixteenths; 16 bits leave room for the noise.
const int16_t COSINE[] = {16000,  14782,  11314,  6123,  0, -6123, -11314, -14782,
                          -16000, -14782, -11314, -6123, 0, 6123,  11314,  14782};
const size_t SAMPLE_SIZE = 4;
const uint64_t HOP_SAMPLES = 1 << 16;

// Bytes pos to pos + len of the seed's samples; pos is a multiple of 8. They are pairs of 16 bits,
// little-endian: a carrier that hops between eight frequencies, in noise.
void make_samples(uint8_t* dst, size_t pos, size_t len, uint32_t seed) {
    const uint64_t start = static_cast<uint64_t>(seed) << 32;
    for (size_t done = 0; done < len; done += sizeof(uint64_t)) {
        const uint64_t hop = (pos + done) / SAMPLE_SIZE / HOP_SAMPLES;
        const uint64_t turn = 2 * (noise_of(start + hop) % 8) + 1;
        uint64_t noise = noise_of(~start - (pos + done));
        uint8_t bytes[sizeof(uint64_t)];
        for (size_t i = 0; i < sizeof bytes; i += 2) {
            const uint64_t sine = i % SAMPLE_SIZE == 0 ? 0 : 12;  // a quarter behind
            const uint64_t angle = turn * ((pos + done + i) / SAMPLE_SIZE) + sine;
            const int value = COSINE[angle % 16] + static_cast<int>(noise % 4096) - 2048;
            bytes[i] = static_cast<uint8_t>(value);
            bytes[i + 1] = static_cast<uint8_t>(value >> 8);
            noise >>= 16;
        }
        memcpy(dst + done, bytes, std::min(sizeof bytes, len - done));
    }
}

}  // namespace

IqControl* SimIqDevice::control() const {
    return reinterpret_cast<IqControl*>(m_control.data());
}

bool SimIqDevice::create(const std::string& root) {
    const std::string node = root + "/" IQ_NODE;
    struct stat st;
    if (!m_node.create(node) || stat(node.c_str(), &st) != 0 ||
        !m_memory.create(root + "/" IQ_MEMORY, IQ_MEMORY_SIZE) ||
        !m_control.create(root + "/" IQ_CONTROL, sizeof(IqControl))) {
        return false;
    }
    control()->node = {st.st_dev, st.st_ino};
    return true;
}

void SimIqDevice::write_samples(uint32_t offset, uint32_t len, uint32_t seed) {
    make_samples(m_memory.data() + offset, 0, len, seed);
}

bool SimIqDevice::announce(uint32_t offset, uint32_t len) {
    if (filled()) {
        return false;
    }
    control()->buffer = {offset, len};
    control()->filled = 1;
    const uint8_t ready = 1;
    return m_node.feed(&ready, 1) == 1;
}

bool SimIqDevice::announce_bytes(const std::string& bytes) {
    if (filled() || bytes.size() > IQ_MEMORY_SIZE) {
        return false;
    }
    memcpy(m_memory.data(), bytes.data(), bytes.size());
    return announce(0, static_cast<uint32_t>(bytes.size()));
}

bool SimIqDevice::fill(uint32_t offset, uint32_t len, uint32_t seed) {
    if (filled()) {
        return false;
    }
    write_samples(offset, len, seed);
    return announce(offset, len);
}

bool SimIqDevice::holds_samples(const std::string& path, uint32_t len, uint32_t seed) {
    const int fd = open(path.c_str(), O_RDONLY | O_CLOEXEC);
    if (fd < 0) {
        return false;
    }
    struct stat st;
    bool good = fstat(fd, &st) == 0 && st.st_size == static_cast<off_t>(len);
    std::vector<uint8_t> data(1 << 20);
    std::vector<uint8_t> samples(data.size());
    for (size_t done = 0; good && done < len;) {
        const size_t n = std::min(data.size(), len - done);
        make_samples(samples.data(), done, n, seed);
        good = pread(fd, data.data(), n, static_cast<off_t>(done)) == static_cast<ssize_t>(n) &&
               memcmp(data.data(), samples.data(), n) == 0;
        done += n;
    }
    close(fd);
    return good;
}

bool SimIqDevice::in_use() const {
    return control()->in_use == 1;
}

bool SimIqDevice::filled() const {
    return control()->filled != 0;
}

unsigned SimIqDevice::released() const {
    return control()->released;
}

unsigned SimIqDevice::wrong_requests() const {
    return control()->wrong;
}

int64_t SimIqDevice::taken_ns() const {
    return control()->taken_ns;
}

int64_t SimIqDevice::released_ns() const {
    return control()->released_ns;
}
