// SPDX-License-Identifier: Apache-2.0

#include "sim/SimIqDevice.h"

#include <fcntl.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <vector>

#include "sim/device_control.h"

namespace {

// Samples pos to pos + len of the seed; pos is a multiple of 8.
void make_samples(uint8_t* dst, size_t pos, size_t len, uint32_t seed) {
    for (size_t done = 0; done < len; done += sizeof(uint64_t)) {
        uint64_t x = (static_cast<uint64_t>(seed) << 32) + (pos + done) / sizeof(uint64_t);
        x = (x ^ (x >> 30)) * 0xBF58476D1CE4E5B9u;
        x = (x ^ (x >> 27)) * 0x94D049BB133111EBu;
        x ^= x >> 31;
        memcpy(dst + done, &x, std::min(sizeof x, len - done));
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
