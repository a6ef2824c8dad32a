// SPDX-License-Identifier: Apache-2.0

#include "support/fake_devices.h"

#include <errno.h>
#include <fcntl.h>
#include <stdlib.h>
#include <string.h>
#include <sys/mman.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <filesystem>

#include "support/faults.h"

typedef std::lock_guard<std::mutex> Lock;

static std::atomic<FakeDevice*> s_devices[4];

// The driver's side: each call goes to the device that it is for, or to the C library.
static void install_driver() {
    faults::instead.ioctl = [](int fd, unsigned long cmd, unsigned long arg) {
        FakeDevice* device = FakeDevice::find(fd);
        return device ? device->do_ioctl(cmd, arg) : real::ioctl(fd, cmd, arg);
    };
    faults::instead.mmap = [](void* addr, size_t len, int prot, int flags, int fd, off_t offset) {
        FakeDevice* device = FakeDevice::find(fd);
        return device ? device->do_mmap(len == IQ_MEM_SIZE && offset == 0 && flags == MAP_PRIVATE &&
                                        prot == (PROT_READ | PROT_WRITE) &&
                                        (fcntl(fd, F_GETFL) & O_ACCMODE) == O_RDONLY)
                      : real::mmap(addr, len, prot, flags, fd, offset);
    };
    faults::instead.munmap = [](void* addr, size_t len) {
        FakeDevice* device = FakeDevice::find(-1, addr);
        if (!device || len != IQ_MEM_SIZE) {
            return real::munmap(addr, len);
        }
        device->do_munmap();
        return 0;
    };
    faults::instead.read = [](int fd, void* data, size_t len) {
        FakeDevice* device = FakeDevice::find(fd);
        return device ? device->do_read(data, len) : real::read(fd, data, len);
    };
}

FakeDevice::FakeDevice(const std::string& path)
    : m_memory(static_cast<uint8_t*>(real::mmap(nullptr, IQ_MEM_SIZE, PROT_READ | PROT_WRITE,
                                                MAP_PRIVATE | MAP_ANONYMOUS, -1, 0))) {
    std::filesystem::create_directories(std::filesystem::path(path).parent_path());
    mkfifo(path.c_str(), 0600);
    m_fd = ::open(path.c_str(), O_RDWR | O_NONBLOCK | O_CLOEXEC);
    if (m_fd < 0 || fstat(m_fd, &m_id) != 0) {
        abort();
    }
    *std::find(s_devices, s_devices + 4, nullptr) = this;
    install_driver();
}

FakeDevice::~FakeDevice() {
    *std::find(s_devices, s_devices + 4, this) = nullptr;
    close(m_fd);
    real::munmap(m_memory, IQ_MEM_SIZE);
}

FakeDevice* FakeDevice::find(int fd, const void* mapping) {
    struct stat st = {};
    fstat(fd, &st);
    for (const auto& slot : s_devices) {
        FakeDevice* device = slot.load(std::memory_order_relaxed);
        if (device &&
            (mapping ? mapping == device->m_memory
                     : device->m_id.st_dev == st.st_dev && device->m_id.st_ino == st.st_ino)) {
            return device;
        }
    }
    return nullptr;
}

void FakeDevice::set_ready(bool ready) {
    char byte = 0;
    if (ready != m_ready && (ready ? write(m_fd, &byte, 1) : real::read(m_fd, &byte, 1)) != 1) {
        abort();
    }
    m_ready = ready;
}

int FakeDevice::do_ioctl(unsigned long cmd, unsigned long arg) {
    if (cmd == CMD_GET_IQ_BUF_INFO) {
        on_buf_info();
    }
    const Lock lock(m_mutex);
    // Only the command that takes a number has one.
    m_ioctls[cmd].push_back(cmd == CMD_SET_IQ_CH_TYPE ? static_cast<int>(arg) : 0);
    const bool filled = !m_buffers.empty();
    errno = m_ioctl_errors[cmd] == 0 && cmd == CMD_GET_IQ_BUF_INFO && !filled ? ENODATA
                                                                              : m_ioctl_errors[cmd];
    if (errno != 0) {
        return -1;
    }
    if (cmd == CMD_GET_IQ_BUF_INFO) {
        memcpy(reinterpret_cast<void*>(arg), &m_buffers[0], sizeof(IqBufInfo));
    } else if (cmd == CMD_RELEASE_IQ_BUF && filled) {
        m_buffers.pop_front();
        set_ready(!m_buffers.empty());
    }
    return 0;
}

void* FakeDevice::do_mmap(bool as_agreed) {
    errno = as_agreed ? m_mmap_error : EINVAL;
    m_maps += errno == 0;
    return errno == 0 ? m_memory : MAP_FAILED;
}

ssize_t FakeDevice::do_read(void* data, size_t len) {
    const Lock lock(m_mutex);
    Steps::value_type step;
    if (!m_reads.empty()) {
        step = m_reads.front();
        m_reads.pop_front();
    }
    set_ready(!m_reads.empty());
    errno = step.second;
    const size_t n = step.first.copy(static_cast<char*>(data), len);
    return errno != 0 ? -1 : static_cast<ssize_t>(n);
}

void FakeDevice::script_reads(const Steps& steps) {
    const Lock lock(m_mutex);
    m_reads = steps;
    set_ready(true);
}

size_t FakeDevice::reads_left() {
    const Lock lock(m_mutex);
    return m_reads.size();
}

void FakeDevice::fill(uint32_t offset, uint32_t len, const std::string& content) {
    std::copy(content.begin(), content.end(), m_memory + offset);
    const Lock lock(m_mutex);
    m_buffers.push_back({offset, len});
    set_ready(true);
}

std::vector<long> FakeDevice::ioctls(unsigned long cmd) {
    const Lock lock(m_mutex);
    return m_ioctls[cmd];
}
