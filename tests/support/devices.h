// SPDX-License-Identifier: Apache-2.0
// The other side of the service's descriptors: FIFOs and pseudo-terminals that stand for the
// CPs' devices, clients of its sockets and the time service.
#ifndef TESTS_SUPPORT_DEVICES_H_
#define TESTS_SUPPORT_DEVICES_H_

#include <cutils/sockets.h>
#include <fcntl.h>
#include <poll.h>
#include <stdlib.h>
#include <sys/ioctl.h>
#include <sys/socket.h>
#include <sys/stat.h>

#include "sim/SimDiagDevice.h"
#include "sim/TimeService.h"
#include "support/TestRoot.h"
#include "support/faults.h"

struct Unique {
    Unique() = default;
    Unique(const Unique&) = delete;
    Unique& operator=(const Unique&) = delete;
};

// Bytes that can be read from a descriptor.
inline size_t bytes_waiting(int fd) {
    int n = 0;
    ioctl(fd, FIONREAD, &n);
    return static_cast<size_t>(n);
}

// The writing end of a FIFO in the root; the reader never sees an end of file.
class Fifo : Unique {
public:
    explicit Fifo(const std::string& path) {
        mkfifo(path.c_str(), 0600);
        m_fd = open(path.c_str(), O_RDWR | O_NONBLOCK | O_CLOEXEC);
        fcntl(m_fd, F_SETPIPE_SZ, 65536);
    }
    ~Fifo() { close(m_fd); }

    size_t unread() const { return bytes_waiting(m_fd); }
    bool put(const std::string& data) const {
        return write(m_fd, data.data(), data.size()) == static_cast<ssize_t>(data.size());
    }

private:
    int m_fd;
};

// The time service, which gives every connection the same answer.
struct TimeServer : TimeService {
    explicit TimeServer(const std::string& reply) {
        set_reply(reply);
        EXPECT_TRUE(start(getenv("KESTMODEM_ROOT")));
    }
};

// A CP's device: the service opens path(), the test holds the CP's end.
class Pty : public SimDiagDevice {
public:
    Pty() {
        static int number = 0;
        EXPECT_TRUE(create(getenv("KESTMODEM_ROOT") + ("/pty" + std::to_string(++number))));
    }

    // As many bytes as the service surely reads at once.
    static constexpr size_t CHUNK = 4000;

    // Gives the service one chunk to read. Not by a call that tests make fail.
    bool put(const std::string& data) const {
        struct pollfd slave = {m_slave, POLLIN, 0};
        return real::write(m_master, data.data(), data.size()) ==
                   static_cast<ssize_t>(data.size()) &&
               poll(&slave, 1, 60000) == 1 && wait_until([&] { return pending() == data.size(); });
    }
    // What the service has written since the last call of forget().
    const std::string& received() {
        const std::vector<uint8_t> more = read_request(0, 0);
        m_received.append(more.begin(), more.end());
        return m_received;
    }
    void forget() {
        received();
        m_received.clear();
        discard();
    }

private:
    std::string m_received;
};

// A connection to a local socket of the service, or one that the service made.
class Client : Unique {
public:
    explicit Client(const char* name = "kestmodem")
        : m_fd(socket_local_client(name, ANDROID_SOCKET_NAMESPACE_ABSTRACT, SOCK_STREAM)) {}
    explicit Client(int fd) : m_fd(fd) {}
    ~Client() { hang_up(); }

    bool say(const std::string& text) const {
        return send(m_fd, text.data(), text.size(), MSG_NOSIGNAL) ==
               static_cast<ssize_t>(text.size());
    }
    const std::string& heard() {
        char buf[512];
        ssize_t n;
        while ((n = recv(m_fd, buf, sizeof(buf), MSG_DONTWAIT)) > 0) {
            m_heard.append(buf, static_cast<size_t>(n));
        }
        m_ended = m_ended || n == 0 || (errno != EAGAIN && errno != EINTR);
        return m_heard;
    }
    void forget() { m_heard.clear(); }
    // The other end is gone.
    bool ended() { return heard(), m_ended; }
    int fd() const { return m_fd; }
    void hang_up() {
        if (m_fd >= 0) {
            close(m_fd);
        }
        m_fd = -1;
    }

private:
    int m_fd;
    std::string m_heard;
    bool m_ended = false;
};

#endif  // TESTS_SUPPORT_DEVICES_H_
