// SPDX-License-Identifier: Apache-2.0
// The surroundings of the tests of crashes and transactions: modems whose devices are
// raw pseudo-terminals, so that the test plays the CP byte by byte, control clients on
// the real socket, and a look at the files that crashes and transactions leave.
#ifndef TESTS_SUPPORT_CRASHFIXTURE_H_
#define TESTS_SUPPORT_CRASHFIXTURE_H_

#include <signal.h>
#include <termios.h>

#include <map>

#include "support/ChannelFixture.h"
#include "support/faults.h"

// A CP's device: the service opens path(), the test holds the CP's end and keeps the
// service's end open, so that nothing is lost while the service has it closed.
class Pty : Unique {
public:
    Pty() : m_master(posix_openpt(O_RDWR | O_NOCTTY | O_CLOEXEC | O_NONBLOCK)) {
        char name[64] = "";
        if (m_master < 0 || grantpt(m_master) != 0 || unlockpt(m_master) != 0 ||
            ptsname_r(m_master, name, sizeof(name)) != 0) {
            abort();
        }
        m_path = name;
        m_slave = open(name, O_RDWR | O_NOCTTY | O_CLOEXEC);
        struct termios raw;
        tcgetattr(m_slave, &raw);
        cfmakeraw(&raw);
        tcsetattr(m_slave, TCSANOW, &raw);
    }
    ~Pty() {
        close(m_slave);
        close(m_master);
    }

    // As many bytes as the service surely reads at once.
    static constexpr size_t CHUNK = 4000;

    const std::string& path() const { return m_path; }
    size_t unread() const { return bytes_waiting(m_slave); }
    // Gives the service one chunk to read.
    bool put(const std::string& data) const {
        struct pollfd slave = {m_slave, POLLIN, 0};
        return real::write(m_master, data.data(), data.size()) ==
                   static_cast<ssize_t>(data.size()) &&
               poll(&slave, 1, 60000) == 1 && wait_until([&] { return unread() == data.size(); });
    }
    // What the service has written since the last call of forget().
    const std::string& received() {
        char buf[256];
        ssize_t n;
        while ((n = read(m_master, buf, sizeof(buf))) > 0) {
            m_received.append(buf, static_cast<size_t>(n));
        }
        return m_received;
    }
    void forget() {
        received();
        m_received.clear();
        tcflush(m_slave, TCIFLUSH);
    }

private:
    int m_master;
    int m_slave;
    std::string m_path;
    std::string m_received;
};

inline std::string escaped(const std::string& body) {
    std::string out;
    for (char c : body) {
        if (c == '\x7d' || c == '\x7e') {
            out += '\x7d';
            c = static_cast<char>(c ^ 0x20);
        }
        out += c;
    }
    return out;
}

inline std::string raw_frame(const std::string& body) {
    return "\x7e" + escaped(body) + "\x7e";
}

inline std::string frame(int type, int sub_type, const std::string& payload = "") {
    std::string body(4, '\0');
    for (size_t value : {(payload.size() + 8) & 0xff, (payload.size() + 8) >> 8,
                         static_cast<size_t>(type), static_cast<size_t>(sub_type)}) {
        body += static_cast<char>(value);
    }
    return raw_frame(body + payload);
}

const std::string END_TEXT = "\nmodem_memdump_finish";

// The frame that ends a dump; its header does not matter.
inline std::string end_marker() {
    return raw_frame("\x7e\x7d\x01\x02\x03\x04\x05\x06" + END_TEXT);
}

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

class CrashFixture : public ChannelFixture {
protected:
    CrashFixture() : time_service(std::string(12, 't')), gnss_dev(root.path("gnss")) {
        signal(SIGPIPE, SIG_IGN);  // as the service does
        setenv("TZ", "XXX-3:30", 1);
        tzset();
        root.write_file("proc/cpw/mem", MEMORY);
    }

    // Starts the service with a modem on one or two devices and a GNSS receiver.
    void boot_modem(bool one_device, const std::string& more = "") {
        log_dev = one_device ? &diag_dev : &own_log_dev;
        root.set_prop("ro.modem.w.log", one_device ? "" : own_log_dev.path());
        root.set_prop("ro.modem.w.diag", diag_dev.path());
        ASSERT_EQ(boot(more + "stream cp_wcdma on 5 3\nstream cp_gnss on 5 3\n"), 0);
        diag_dev.forget();
    }
    LogPipeHandler* modem() const { return ctrl->get_cp(CT_WCDMA); }

    // Has the service read the data, in chunks.
    bool supply(const Pty& dev, const std::string& data) {
        for (size_t at = 0; at < data.size(); at += Pty::CHUNK) {
            if (!dev.put(data.substr(at, Pty::CHUNK)) || !pump([&] { return dev.unread() == 0; })) {
                return false;
            }
        }
        return true;
    }
    // Lets the modem assert and answers its dump request.
    bool begin_dump() {
        diag_dev.forget();
        modem()->process_assert(false);
        return modem()->state() == CWS_DUMP && pump([&] { return diag_dev.received() == "3\n"; });
    }
    // Runs the loop until the client has got as much as expected; what it has got.
    std::string hear(Client& client, const std::string& expected) {
        pump([&] { return client.heard().size() >= expected.size(); });
        const std::string text = client.heard();
        client.forget();
        return text;
    }
    std::string ask(Client& client, const std::string& request, const std::string& expected) {
        EXPECT_TRUE(client.say(request));
        return hear(client, expected);
    }
    // Data of the modem and the GNSS receiver reach their log files.
    bool both_log(const std::string& data) {
        const size_t before = logged("cp_wcdma", data);
        const bool given = supply(*log_dev, data) && feed(gnss_dev, data);
        ctrl->flush();
        return given && logged("cp_wcdma", data) == before + 1 && logged("cp_gnss", data) > 0;
    }
    size_t logged(const std::string& cp, const std::string& data) const {
        size_t n = 0;
        for (const char* medium : {"data/modem_log", "sd/modem_log"}) {
            const std::string all = log_content(root, log_files(root, medium, cp));
            for (size_t at = all.find(data); at != std::string::npos; at = all.find(data, at + 1)) {
                ++n;
            }
        }
        return n;
    }
    // The CP's files but for its logs, on both media: "data:name" or "sd:name", content.
    std::map<std::string, std::string> files(const std::string& cp = "cp_wcdma") const {
        std::map<std::string, std::string> found;
        for (const std::string medium : {"data", "sd"}) {
            for (const std::string& name : root.tree(medium + "/modem_log")) {
                const size_t slash = name.rfind('/');
                if (name.find("/" + cp + "/") != std::string::npos &&
                    name.find("-" + cp + "-") == std::string::npos) {
                    found[medium + ":" + name.substr(slash + 1)] =
                        root.read_file(medium + "/modem_log/" + name);
                }
            }
        }
        return found;
    }
    // Descriptors that are open when the time service has nothing to do.
    static size_t lasting_descriptors() {
        const int last = socket_local_client("cp_time_sync_server",
                                             ANDROID_SOCKET_NAMESPACE_ABSTRACT, SOCK_STREAM);
        char answer[16];
        while (recv(last, answer, sizeof(answer), 0) > 0) {  // to the end: after all before it
        }
        close(last);
        return open_descriptors();
    }
    // The loop's free places and the lasting descriptors, to be the same before and after.
    std::pair<size_t, size_t> resources() {
        return {Filler::free_slots(mux()), lasting_descriptors()};
    }
    // The card that the service looks for; for a card that is pulled its files go, too.
    void set_card(bool in) { root.set_prop("init.svc.fuse_sdcard0", in ? "running" : ""); }

    typedef std::map<std::string, std::string> Files;
    const std::string MEMORY = pattern_bytes(200001, 99);
    const TimeServer time_service;
    const Fifo gnss_dev;
    Pty own_log_dev;
    Pty diag_dev;
    Pty* log_dev = nullptr;
};

#endif  // TESTS_SUPPORT_CRASHFIXTURE_H_
