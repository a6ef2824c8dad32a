// SPDX-License-Identifier: Apache-2.0
// Memory devices of the handset for tests: a FIFO in the test root that the service
// polls, behind it a scripted driver. Only calls on such a FIFO (or its mapping) are diverted.
// Looking whether it is one takes no lock, so that a thread sanitizer sees only the service's
// own order.
#ifndef TESTS_SUPPORT_FAKE_DEVICES_H_
#define TESTS_SUPPORT_FAKE_DEVICES_H_

#include <stdint.h>
#include <sys/stat.h>

#include <deque>
#include <functional>
#include <map>
#include <mutex>
#include <string>
#include <utility>
#include <vector>

#include "iq/iq_mem.h"

class FakeDevice {
public:
    typedef std::deque<std::pair<std::string, int>> Steps;

    // Makes the FIFO, and its directory.
    explicit FakeDevice(const std::string& path);
    ~FakeDevice();

    // What reads give from now on: data (empty: end of file) or, with an errno, a failure.
    // Readable until every step was taken; an end of file follows the last one.
    void script_reads(const Steps& steps);
    size_t reads_left();
    // A filled I/Q buffer, reported until it is released. Content is put there, if any.
    void fill(uint32_t offset, uint32_t len, const std::string& content = "");
    // These fail with the error from now on; 0: they work.
    void fail_ioctl(unsigned long cmd, int error) { m_ioctl_errors[cmd] = error; }
    void fail_mmap(int error) { m_mmap_error = error; }
    // Arguments of all ioctls of the command, and their number.
    std::vector<long> ioctls(unsigned long cmd);
    size_t count(unsigned long cmd) { return ioctls(cmd).size(); }
    size_t maps() const { return m_maps; }  // mappings made and not removed

    std::function<void()> on_buf_info = [] {};  // inside CMD_GET_IQ_BUF_INFO

    // The driver's side: the device of a descriptor or, if there is one, of a mapping.
    static FakeDevice* find(int fd, const void* mapping = nullptr);
    int do_ioctl(unsigned long cmd, unsigned long arg);
    ssize_t do_read(void* data, size_t len);
    void* do_mmap(bool as_agreed);
    void do_munmap() { --m_maps; }

private:
    void set_ready(bool ready);

    std::mutex m_mutex;
    int m_fd;
    struct stat m_id;
    bool m_ready = false;
    Steps m_reads;
    std::deque<IqBufInfo> m_buffers;
    std::map<unsigned long, std::vector<long>> m_ioctls;
    std::map<unsigned long, int> m_ioctl_errors;
    int m_mmap_error = 0;
    uint8_t* m_memory;
    size_t m_maps = 0;
};

#endif  // TESTS_SUPPORT_FAKE_DEVICES_H_
