// SPDX-License-Identifier: Apache-2.0
// The service in a temporary root, its loop driven step by step. ChannelFixture: a controller
// and FIFOs that stand for the log devices. CrashFixture: modems whose devices are raw
// pseudo-terminals, so that the test plays the CP byte by byte, control clients on the real
// socket, and a look at the files that crashes and transactions leave. FaultFixture: a C
// library that can be made to fail and clocks set by hand.
#ifndef TESTS_SUPPORT_SERVICEFIXTURE_H_
#define TESTS_SUPPORT_SERVICEFIXTURE_H_

#include <signal.h>
#include <time.h>

#include <algorithm>
#include <filesystem>
#include <map>

#include "channels/LogPipeHandler.h"
#include "config/LogConfig.h"
#include "control/LogController.h"
#include "support/devices.h"
#include "support/loop.h"
#include "support/wire.h"

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

class ChannelFixture : public testing::Test {
protected:
    ~ChannelFixture() override { boot_clock::real(); }
    ChannelFixture() {
        signal(SIGPIPE, SIG_IGN);  // as the service does
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

    static void set_zone(const char* tz) {
        setenv("TZ", tz, 1);
        tzset();
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

    // The card that the service looks for; for a card that is pulled its files go, too.
    void set_card(bool in) { root.set_prop("init.svc.fuse_sdcard0", in ? "running" : ""); }

    Multiplexer& mux() { return ctrl->multiplexer(); }
    bool pump(const std::function<bool()>& condition) { return pump_until(mux(), condition); }
    // Passes of the loop, whatever there is to do.
    void pass(int times) {
        for (int i = 0; i < times; ++i) {
            pump_once(mux());
        }
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

class CrashFixture : public ChannelFixture {
protected:
    CrashFixture() : time_service(std::string(12, 't')), gnss_dev(root.path("gnss")) {
        set_zone("XXX-3:30");
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
            if (!dev.put(data.substr(at, Pty::CHUNK)) ||
                !pump([&] { return dev.pending() == 0; })) {
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
            n += occurrences(log_content(root, log_files(root, medium, cp)), data);
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
        Client last("cp_time_sync_server");
        wait_until([&] { return last.ended(); });  // after all before it
        last.hang_up();
        return open_descriptors();
    }
    // The loop's free places and the lasting descriptors, to be the same before and after.
    std::pair<size_t, size_t> resources() {
        return {Filler::free_slots(mux()), lasting_descriptors()};
    }
    typedef std::map<std::string, std::string> Files;
    const std::string MEMORY = pattern_bytes(200001, 99);
    const TimeServer time_service;
    const Fifo gnss_dev;
    Pty own_log_dev;
    Pty diag_dev;
    Pty* log_dev = nullptr;
};

constexpr time_t NOON = 1456811100;  // 2016-03-01 05:45:00 UTC, 09:15:00 here
const char STAMP[] = "_2016-03-01_09-15-00";

class FaultFixture : public CrashFixture {
protected:
    FaultFixture() { repair(); }
    ~FaultFixture() override { faults::reset(); }

    // Everything works again, it is noon and the clock of the timers stands still.
    static void repair() {
        faults::reset();
        faults::set_time(NOON);
        boot_clock::freeze();
    }
    // Has the timers fire that are due in that time.
    void run_clock(unsigned int ms) {
        boot_clock::advance(ms);
        mux().timer_mgr().process_timers();
    }
};

#endif  // TESTS_SUPPORT_SERVICEFIXTURE_H_
