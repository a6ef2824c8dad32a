// SPDX-License-Identifier: Apache-2.0
// The real program as a child process: its exit statuses, its log lines, the files that
// it leaves and the system calls that a block of log data costs.

#include <sstream>

#include "sim/ChildProcess.h"
#include "sim/SimHandset.h"
#include "sim/SimModemImage.h"
#include "sim/SimSupervisor.h"
#include "support/ServiceFixture.h"

namespace {

const char CONFIG[] = "data/local/tmp/kestmodem/kest_modem.conf";

class ServiceTest : public ChannelFixture {
protected:
    ServiceTest() { set_zone("UTC0"); }

    // Runs a command with its output in the file "log".
    void run(std::vector<std::string> args = {KESTMODEM_BIN}, mode_t new_mask = 077) {
        const mode_t mask = umask(new_mask);
        EXPECT_TRUE(process.start({std::move(args), root.path("log"), "", false, {}, -1}));
        umask(mask);
    }
    bool logged(const std::string& part) const {
        return root.read_file("log").find(part) != std::string::npos;
    }
    // One block into an empty device, and all of it read again, once the service is there.
    static bool feed(const Fifo& fifo, const std::string& block) {
        return fifo.put(block) && wait_until([&] { return fifo.unread() == 0; });
    }

    ChildProcess process;
};

// No property holds the paths of its devices.
TEST_F(ServiceTest, ASimulatedHandsetIsNotMadeTooDeep) {
    SimHandset handset;
    ASSERT_TRUE(handset.create(root.path(std::string(50, 'h')), {})) << handset.error();
    EXPECT_FALSE(handset.add_cp("cp_wcdma"));
}

TEST_F(ServiceTest, FailedStartsHaveTheirExitStatus) {
    const struct {
        const char *settings, *in_the_way;
        int status;
        std::string message;  // the last line
    } cases[] = {
        {CONFIG, "data/modem_log", 2,
         "int LogController::init(LogConfig*): init storage manager error ["},
        {"other", "data/other", 255,
         "int LogConfig::read_config(int, char**): can not open " + root.path(CONFIG) + " ["},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.message);
        root.write_file(c.settings, "stream cp_gnss on 5 3\n");
        root.write_file(c.in_the_way, "a file");
        run();
        const std::string prefix = "E/KESTCP(" + std::to_string(process.pid()) + "): ";
        ASSERT_TRUE(wait_until([&] { return !process.alive(); }));
        EXPECT_EQ(process.status_text(), "exit status " + std::to_string(c.status));
        char ids[100];
        snprintf(ids, sizeof(ids), "int main(int, char**): kestmodem start ID=%u/%u, GID=%u/%u\n",
                 getuid(), geteuid(), getgid(), getegid());
        EXPECT_EQ(root.read_file("log").find(prefix + ids), 0u);
        EXPECT_TRUE(logged(prefix + c.message));
        EXPECT_EQ(root.exists("data/modem_log"), c.status == 2) << "untouched";
        remove_tree("data");
    }
}

TEST_F(ServiceTest, WhatItMakesHasItsModeInSpiteOfTheParentsMask) {
    const std::string settings = "stream cp_wcdma on 5 3\n";  // the system's, to be copied
    root.write_file("system/etc/kest_modem.conf", settings);
    root.set_prop("gsm.version.baseband", "BB_1");
    root.set_prop("ro.product.partitionpath", root.path("part/"));
    root.set_prop("persist.modem.w.nvp", "nv_w");
    const std::vector<uint8_t> image = SimModemImage(1000, 1).bytes();
    root.write_file("part/nv_wmodem", std::string(image.begin(), image.end()));
    const Fifo modem(root.path("log_w"));
    for (const mode_t mask : {mode_t{077}, mode_t{0}}) {
        remove_tree("data");
        root.make_dir("data/local/tmp/kestmodem");
        run({KESTMODEM_BIN, "-s"}, mask);
        // Two blocks fill the staging buffer.
        ASSERT_TRUE(feed(modem, pattern_bytes(32768, 1)) && feed(modem, pattern_bytes(32768, 2)));
        ASSERT_TRUE(wait_until([&] {
            return log_content(root, log_files(root, "data/kest/modem_log", "cp_wcdma")).size() ==
                   65536;
        }));
        EXPECT_EQ(root.read_file(CONFIG), settings);
        EXPECT_EQ(root.tree("data").size(), 5u) << "settings, log, version, library, digest";
        for (const auto& entry : std::filesystem::recursive_directory_iterator(root.path("data"))) {
            EXPECT_TRUE(entry.path().string().find("/data/local") != std::string::npos ||
                        !entry.is_directory() ||
                        entry.status().permissions() == std::filesystem::perms(0775))
                << entry.path();
            EXPECT_TRUE(entry.is_directory() ||
                        entry.status().permissions() == std::filesystem::perms(0644))
                << entry.path();
        }
        EXPECT_TRUE(logged("init(LogConfig*): modem log will be placed in kest dir!\n"));
        EXPECT_FALSE(logged("save log"));
        EXPECT_FALSE(logged("kestcp: open "));
        process.stop();
    }
}

// Its reply to a client that has left must not end the service.
TEST_F(ServiceTest, AClientMayLeaveAtAnyTime) {
    root.write_file(CONFIG, "");
    run();
    ASSERT_TRUE(wait_until([] { return Client().say("\n"); }));
    process.signal(SIGSTOP);  // it finds the request of one who is gone
    EXPECT_TRUE(Client().say("FLUSH\n"));
    process.signal(SIGCONT);
    Client other;
    EXPECT_TRUE(other.say("FLUSH\n"));
    EXPECT_TRUE(wait_until([&] { return other.heard().size() >= 3 || other.ended(); }));
    EXPECT_EQ(other.heard(), "OK\n") << process.alive();
    process.stop();
}

// Between two marked blocks, the system calls are those of the log path and no others.
TEST_F(ServiceTest, ABlockCostsFiveSystemCallsAtMost) {
    if (system("strace -f -o /dev/null true 2>/dev/null") != 0) {
        GTEST_SKIP() << "no strace or no ptrace here";
    }
    root.write_file(CONFIG, "stream cp_wcn on 5 3\nstream cp_gnss on 5 3\n");
    const Fifo wcn(root.path("wcn")), gnss(root.path("gnss"));
    // Supervisors to connect to, so that no attempt falls into the measured time.
    SimSupervisor modemd, wcnd;
    ASSERT_TRUE(modemd.start("modemd", root.root()) &&
                wcnd.start("external_wcn_kest", root.root()));
    run({"strace", "-f", "-s", "32", "-o", root.path("trace"), KESTMODEM_BIN});
    // The first blocks make the files; the properties' file is not trusted while it is new.
    ASSERT_TRUE(feed(wcn, "x"));
    for (const int64_t begun = monotonic_ms(); monotonic_ms() - begun < 200;) {
        ASSERT_TRUE(feed(wcn, "x") && feed(gnss, "y"));
    }
    const int blocks = 40;
    ASSERT_TRUE(feed(gnss, "MARK-BEGIN"));
    for (int i = 0; i < blocks; ++i) {
        ASSERT_TRUE(feed(i % 4 ? gnss : wcn, pattern_bytes(20000, static_cast<uint32_t>(i))));
    }
    ASSERT_TRUE(feed(gnss, "MARK-END"));
    const auto trace = [&] { return root.read_file("trace"); };
    ASSERT_TRUE(wait_until([&] { return trace().find("MARK-END") != std::string::npos; }));

    // From the first marked read to the second: the same of each as there are blocks.
    const size_t begin = trace().find('\n', trace().find("MARK-BEGIN")) + 1;
    std::istringstream lines(trace().substr(begin, trace().find("MARK-END") - begin));
    std::map<std::string, int> calls;
    for (std::string line; std::getline(lines, line);) {
        const size_t start = line.find_first_not_of("0123456789 ");
        std::string name = line.substr(start, line.find('(', start) - start);
        for (const char* kind : {"stat", "access", "poll"}) {
            name = name.find(kind) != std::string::npos ? kind : name;
        }
        ++calls[name];
    }
    const int n = blocks + 1;
    EXPECT_GT(calls["writev"], 5);
    EXPECT_LE(calls["writev"], n);
    calls.erase("writev");
    const std::map<std::string, int> expected = {
        {"poll", n}, {"read", n}, {"stat", n}, {"access", n}};
    EXPECT_EQ(calls, expected);
}

}  // namespace
