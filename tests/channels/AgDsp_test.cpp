// SPDX-License-Identifier: Apache-2.0
// The audio DSP's three devices when one fails; tests/recordings/audio_dsp.in has its log.
#include "channels/AgDspLogHandler.h"
#include "support/ServiceFixture.h"
#include "support/fake_devices.h"

namespace {

constexpr unsigned long COMPLETE = 0x40045806;
class AgDspTest : public FaultFixture {
protected:
    AgDspTest() {
        EXPECT_EQ(boot("stream agdsp on 5 3\n"), 0);
        dsp = ctrl->get_cp(CT_AGDSP);
        dsp->start();
        log.clear();
    }
    // Has the device yield the steps, until the service has taken them all.
    bool yields(FakeDevice& device, const FakeDevice::Steps& steps) {
        device.script_reads(steps);
        return pump([&] { return device.reads_left() == 0; });
    }
    std::string stored() {
        dsp->flush();
        return content("agdsp");
    }
    std::string device(const char* name) {
        root.make_dir("dev");
        return root.path("dev/audio_dsp_") + name;
    }

    FakeDevice logs{device("log")}, pcm{device("pcm")}, mem{device("mem")};
    LogPipeHandler* dsp = nullptr;
};

TEST_F(AgDspTest, TheCompletionIsAlwaysSent) {
    const struct {
        FakeDevice::Steps steps;
        std::string stored;
        const char* message;
    } cases[] = {
        // clang-format off
        {{{"", 0}}, "", ""},
        {{{"", EINTR}, {"a", 0}, {"", EINTR}, {"b", 0}, {"", 0}}, chunk(0, DUMP, "a") + chunk(1, DUMP, "b"), ""},
        {{{"", EIO}}, "", "save_dump(FileNotifier*): read AG-DSP dump device error [5("},
        {FakeDevice::Steps(301, {"", EINTR}), "", "read AG-DSP dump device error [4("},
        // The driver needs a moment.
        {{{"c", 0}, {"", EAGAIN}, {"", EAGAIN}, {"d", 0}, {"", 0}}, chunk(2, DUMP, "c") + chunk(3, DUMP, "d"), ""},
        // clang-format on
    };
    size_t completions = 0;
    std::string expected;
    for (const auto& c : cases) {
        log.clear();
        ASSERT_TRUE(yields(mem, c.steps));
        EXPECT_EQ(mem.count(COMPLETE), ++completions);
        EXPECT_EQ(log.count("AG-DSP agdsp assert"), 1u);
        EXPECT_EQ(log.count("dump device error"), *c.message ? 1u : 0u);
        EXPECT_TRUE(log.has(c.message)) << log.text();
        EXPECT_EQ(content("agdsp"), expected += c.stored);
    }
    // It gets three seconds after the last data.
    FakeDevice::Steps slow(400, {"", EAGAIN});
    slow.push_front({"e", 0});
    uint64_t slept_us = 0;
    faults::instead.usleep = [&](useconds_t us) { return slept_us += us, 0; };
    mem.script_reads(slow);
    ASSERT_TRUE(pump([&] { return mem.count(COMPLETE) > completions; }));
    faults::instead.usleep = nullptr;
    EXPECT_EQ(mem.reads_left(), 99u);
    EXPECT_EQ(slept_us, 2990000u);
    EXPECT_TRUE(log.has("save_dump(FileNotifier*): read AG-DSP dump device error [11("));
}

// It held the service for ever, and pushed all logs out of their quota.
TEST_F(AgDspTest, ADumpWithoutAnEndIsEnded) {
    const auto device_read = faults::instead.read;
    faults::instead.read = [&](int fd, void* data, size_t len) {
        const ssize_t n = device_read(fd, data, len);
        return len == 32748 && n > 0 ? static_cast<ssize_t>(len) : n;
    };
    mem.script_reads(FakeDevice::Steps(17000, {"x", 0}));
    ASSERT_TRUE(pump([&] { return mem.count(COMPLETE) == 1; }));
    const size_t left = 17000 - (512u << 20) / 32768;
    EXPECT_EQ(mem.reads_left(), left);
    EXPECT_TRUE(log.has("save_dump(FileNotifier*): no end of the AG-DSP dump ["));
    ASSERT_TRUE(yields(logs, {{"log", 0}}));
    EXPECT_EQ(mem.reads_left(), left) << "it goes on";
    faults::instead.read = device_read;
}

// Nor may it be held for little: again and again it was, for a minute by a byte now and then, for
// hours by bytes that never end. A driver may let it wait for the end of a dump, but not each time.
TEST_F(AgDspTest, ADumpThatTakesTooLongIsEnded) {
    const auto device_read = faults::instead.read;
    const auto advance = [](useconds_t us) { return boot_clock::advance(us / 1000), 0; };
    FakeDevice::Steps slow;
    for (int i = 0; i < 60; ++i) {
        slow.push_back({"y", 0});
        slow.insert(slow.end(), 299, {"", EAGAIN});
    }
    const struct {
        FakeDevice::Steps steps;
        unsigned int read_ms;
        bool full;  // each read fills the buffer
        size_t left;
    } cases[] = {
        {slow, 0, false, 12000},
        {FakeDevice::Steps(18000, {"x", 0}), 10, false, 12000},
        // 125 MiB in 64 s: a slow medium.
        {FakeDevice::Steps(4000, {"x", 0}), 16, true, 0},
    };
    faults::instead.usleep = advance;
    for (const auto& c : cases) {
        log.clear();
        const size_t completions = mem.count(COMPLETE);
        faults::instead.read = [&](int fd, void* data, size_t len) {
            const ssize_t n = device_read(fd, data, len);
            const bool dump = len == 32748 && n > 0;
            boot_clock::advance(dump ? c.read_ms : 0);
            return dump && c.full ? static_cast<ssize_t>(len) : n;
        };
        mem.script_reads(c.steps);
        ASSERT_TRUE(pump([&] { return mem.count(COMPLETE) > completions; }));
        const size_t left = mem.reads_left();
        EXPECT_NEAR(static_cast<double>(left), static_cast<double>(c.left), c.left ? 100 : 0);
        EXPECT_EQ(log.has("save_dump(FileNotifier*): no end of the AG-DSP dump ["), c.left > 0);
        pass(2);
        EXPECT_EQ(mem.reads_left(), left) << "it goes on";
        dsp->stop();
        dsp->start();
    }
    faults::instead.read = device_read;
    for (size_t i = 0; i < 12; ++i) {
        FakeDevice::Steps unended(301, {"", EAGAIN});
        unended.push_front({"z", 0});
        mem.script_reads(unended);
        pass(2);
        EXPECT_EQ(mem.reads_left(), i < 10 ? 0u : 302u) << i;
    }
    faults::instead.usleep = nullptr;
}

TEST_F(AgDspTest, AFailingStorageEndsADumpWithItsCompletion) {
    const std::string big = pattern_bytes(32748, 3);
    // Of a write that is short: the rest of the dump is not read.
    faults::shorten(faults::WRITEV, 50000);
    mem.script_reads({{big, 0}, {big, 0}, {big, 0}, {"left", 0}});
    ASSERT_TRUE(pump([&] { return mem.count(COMPLETE) == 1; }));
    EXPECT_TRUE(log.has("save_dump(FileNotifier*): agdsp save AG-DSP dump error ["));
    EXPECT_GE(mem.reads_left(), 1u);
    ASSERT_TRUE(yields(mem, {{"", 0}}));
    faults::shorten(faults::WRITEV, 50000);
    ASSERT_TRUE(yields(logs, {{big, 0}, {big, 0}}));
    EXPECT_TRUE(log.has(": agdsp save log: 15536 of 32768 bytes lost\n")) << log.text();
    // No file at all.
    const size_t completions = mem.count(COMPLETE);
    remove_tree("data/modem_log");
    root.write_file("data/modem_log", "in the way");
    ASSERT_TRUE(yields(mem, {{"d", 0}}));
    EXPECT_EQ(mem.count(COMPLETE), completions + 1);
    ASSERT_TRUE(yields(pcm, {{"d", 0}}));
    ASSERT_TRUE(yields(logs, {{"d", 0}}));
    EXPECT_EQ(log.count(": agdsp save log error ["), 2u);
}

TEST_F(AgDspTest, FailingDevices) {
    const size_t running = open_descriptors();
    const size_t slots = Filler::free_slots(mux());
    EXPECT_EQ(dsp->start(), 0);
    EXPECT_EQ(open_descriptors(), running) << "they are open";
    ASSERT_TRUE(yields(pcm, {{"", EAGAIN}, {"", EINTR}, {"", ENODEV}}));
    EXPECT_TRUE(log.has("read PCM device error [19("));
    EXPECT_EQ(open_descriptors(), running - 1) << "off until the next start";
    pcm.script_reads({{"p", 0}});
    // A failure of the log device leads to a new open.
    ASSERT_TRUE(yields(logs, {{"", EINTR}, {"a", 0}, {"", EIO}, {"b", 0}}));
    EXPECT_EQ(pcm.reads_left(), 1u);
    EXPECT_EQ(dsp->stop(), 0);
    EXPECT_EQ(Filler::free_slots(mux()), slots + 3);
    ASSERT_EQ(unlink(root.path("dev/audio_dsp_mem").c_str()), 0);
    EXPECT_EQ(dsp->start(), 0);
    EXPECT_TRUE(log.has("AgDspLogHandler::start(): start dump notifier error [2("));
    ASSERT_TRUE(pump([&] { return pcm.reads_left() == 0; }));
    // One that nobody writes to is not waited for.
    ASSERT_EQ(mkfifo(root.path("dev/audio_dsp_mem").c_str(), 0600), 0);
    EXPECT_EQ(dsp->start(), 0);
    // There is no dump over the diag device.
    dsp->process_assert(false);
    EXPECT_EQ(dsp->state(), CWS_NOT_WORKING);
    dsp->process_alive();
    ASSERT_TRUE(yields(logs, {{"c", 0}}));
    EXPECT_EQ(stored(),
              chunk(0, LOG, "a") + chunk(1, LOG, "b") + chunk(2, PCM, "p") + chunk(3, LOG, "c"));
}

// Whatever is ready for ever took a whole core: in a second a hung-up dump device gave 45,000
// lines, a PCM device at its end 2.5 MB of headers.
TEST_F(AgDspTest, DevicesThatGiveNothingAreLeftAlone) {
    const struct {
        FakeDevice& device;
        int error;  // 0: its end
        const char* line;
        size_t lines;
    } cases[] = {
        {logs, 0, "AG-DSP log device driver bug: read returns 0 [", 11},
        {logs, EAGAIN, "", 0},
        {logs, EIO, "", 0},
        {pcm, 0, "", 0},
        {logs, EINTR, "", 0},
        {pcm, EAGAIN, "", 0},
        {pcm, EINTR, "", 0},
        {mem, 0, "assert\n", 11},
        {mem, EAGAIN, "assert\n", 11},
        {mem, EIO, "dump device error [5(", 11},
    };
    for (const auto& c : cases) {
        log.clear();
        c.device.script_reads(FakeDevice::Steps(40, {"", c.error}));
        for (size_t left : {30u, 29u}) {
            pass(15);
            EXPECT_EQ(c.device.reads_left(), left);
            boot_clock::advance(3000);
        }
        EXPECT_EQ(log.count("gave nothing 10 times in a row"), 1u);
        EXPECT_TRUE(!c.lines || log.count(c.line) == c.lines) << log.text();
        ASSERT_TRUE(yields(c.device, {{"x", 0}}));
    }
    // A chunk of data for each case, and the headers of the PCM device at its end.
    EXPECT_EQ(stored().size(), std::size(cases) * 21 + 11 * 20);
}

}  // namespace
