// SPDX-License-Identifier: Apache-2.0
// The surroundings of a channel test: a controller in a temporary root, its loop driven
// step by step, FIFOs that stand for the log devices, and a time service.
#ifndef TESTS_SUPPORT_CHANNELFIXTURE_H_
#define TESTS_SUPPORT_CHANNELFIXTURE_H_

#include <cutils/sockets.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <poll.h>
#include <stdlib.h>
#include <sys/ioctl.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <time.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "channels/LogPipeHandler.h"
#include "config/LogConfig.h"
#include "control/LogController.h"
#include "sim/TimeService.h"
#include "support/TestRoot.h"

// One pass of the loop that ends after about 20 ms even when nothing happens.
inline void pump_once(Multiplexer& mux) {
    bool fired = false;
    TimerManager::Timer* guard = mux.timer_mgr().create_timer(
        20, [](void* flag) { *static_cast<bool*>(flag) = true; }, &fired);
    mux.run_once();
    if (!fired) {
        mux.timer_mgr().del_timer(guard);
    }
}

// Runs the loop until the condition holds; false when the time is over.
inline bool pump_until(Multiplexer& mux, const std::function<bool()>& condition,
                       int timeout_ms = 60000) {
    const int64_t end = monotonic_ms() + timeout_ms;
    while (!condition()) {
        if (monotonic_ms() > end) {
            return false;
        }
        pump_once(mux);
    }
    return true;
}

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

// The CP's log files on a medium in the order they were written: sets by their time, in
// each the files from the largest number down to 0. Paths relative to the root.
inline std::vector<std::string> log_files(const TestRoot& root, const std::string& medium,
                                          const std::string& cp) {
    std::vector<std::string> files;
    for (const std::string& set : root.list(medium)) {
        std::vector<std::string> names;
        for (const std::string& name : root.list(medium + "/" + set + "/" + cp)) {
            if (name.find("-" + cp + "-") != std::string::npos) {
                names.push_back(name);
            }
        }
        std::sort(names.begin(), names.end(), [](const std::string& a, const std::string& b) {
            return atoi(a.c_str()) > atoi(b.c_str());
        });
        for (const std::string& name : names) {
            files.push_back(medium + "/" + set + "/" + cp + "/" + name);
        }
    }
    return files;
}

// The content of those files, one after the other, without the record of head bytes that
// each of them has to begin with.
inline std::string log_content(const TestRoot& root, const std::vector<std::string>& files,
                               const std::string& head = "") {
    std::string all;
    for (const std::string& file : files) {
        const std::string content = root.read_file(file);
        EXPECT_EQ(content.substr(0, head.size()), head) << file;
        all += content.substr(std::min(head.size(), content.size()));
    }
    return all;
}

// Fills the loop's table, or sees how many handlers it still takes.
class Filler : public FdHandler {
public:
    explicit Filler(Multiplexer* mux) : FdHandler(-1, nullptr, mux) {}
    void process(int) override {}

    static std::vector<std::unique_ptr<Filler>> fill(Multiplexer& mux) {
        std::vector<std::unique_ptr<Filler>> fillers;
        for (;;) {
            auto filler = std::make_unique<Filler>(&mux);
            if (filler->add_events(POLLIN) < 0) {
                return fillers;
            }
            fillers.push_back(std::move(filler));
        }
    }
    static size_t free_slots(Multiplexer& mux) { return fill(mux).size(); }
};

class ChannelFixture : public testing::Test {
protected:
    ChannelFixture() {
        LogConfig::set_wan_modem_type(CT_UNKNOWN);
        setenv("EXTERNAL_STORAGE", root.path("sd").c_str(), 1);
        root.set_prop("persist.storage.type", "1");
        root.set_prop("persist.modem.w.enable", "1");
        root.set_prop("ro.modem.w.log", root.path("log_w"));
        root.set_prop("ro.modem.w.diag", root.path("diag_w"));
        root.set_prop("ro.modem.wcn.diag", root.path("wcn"));
        root.set_prop("ro.modem.gnss.diag", root.path("gnss"));
        root.make_dir("sd");
    }

    // A controller on a settings file of this text; what init returned.
    int boot(const std::string& settings, std::vector<std::string> args = {}) {
        ctrl.reset();
        root.write_file("kest_modem.conf", settings);
        config = std::make_unique<LogConfig>(root.path("kest_modem.conf").c_str());
        args.insert(args.begin(), "kestmodem");
        EXPECT_EQ(config->read_config(static_cast<int>(args.size()), argv_of(args).data()), 0);
        ctrl = std::make_unique<LogController>();
        const int result = ctrl->init(config.get());
        m_others = Multiplexer::MAX_HANDLERS - Filler::free_slots(mux());
        for (const LogPipeHandler* channel : ctrl->log_pipes()) {
            m_others -= channel->fd() >= 0;
        }
        return result;
    }
    // Ends the service and removes what it wrote.
    void end_service() {
        ctrl.reset();
        remove_tree("data/modem_log");
        remove_tree("sd/modem_log");
        log.clear();
    }
    void remove_tree(const std::string& path) const {
        std::filesystem::remove_all(root.path(path));
    }
    // Log devices that the loop polls; the controller's other descriptors do not count.
    size_t polled() { return Multiplexer::MAX_HANDLERS - Filler::free_slots(mux()) - m_others; }

    Multiplexer& mux() { return ctrl->multiplexer(); }
    bool pump(const std::function<bool()>& condition, int timeout_ms = 60000) {
        return pump_until(mux(), condition, timeout_ms);
    }
    // Sends the data through the channel's device in one piece of at most 32768 bytes.
    bool feed(const Fifo& fifo, const std::string& data) {
        return fifo.put(data) && pump([&] { return fifo.unread() == 0; });
    }
    std::string content(const std::string& cp, const std::string& head = "") const {
        return log_content(root, log_files(root, "data/modem_log", cp), head);
    }

    TestRoot root;
    LogCapture log;
    std::unique_ptr<LogConfig> config;
    std::unique_ptr<LogController> ctrl;

private:
    size_t m_others = 0;
};

#endif  // TESTS_SUPPORT_CHANNELFIXTURE_H_
