// SPDX-License-Identifier: Apache-2.0

#include "channels/ModemDumpConsumer.h"

#include "storage/MediaStorage.h"
#include "support/ServiceFixture.h"

namespace {

const std::string START_END = "CP_DUMP_START WCDMA\nCP_DUMP_END WCDMA\n";
const std::string DUMP_NAME = std::string("cp_wcdma_memory") + STAMP;

class ModemDumpTest : public FaultFixture {
protected:
    // Where the dump file lies; "" when there is none.
    std::string dump_path() const {
        const std::vector<std::string> dumps = root.find(".dmp");
        return dumps.empty() ? "" : dumps[0];
    }
    std::string dir_of(const std::string& path) const { return path.substr(0, path.rfind('/')); }
};

// Two modems fall silent: one after some data, one without an answer.
TEST_F(ModemDumpTest, SilentModemsAreCopiedFromTheKernel) {
    Pty td_dev;
    const Fifo log_t(root.path("log_t"));
    root.set_prop("ro.modem.t.log", root.path("log_t"));
    root.set_prop("ro.modem.t.diag", td_dev.path());
    boot_modem(true, "stream cp_td-scdma on 5 3\n");
    LogPipeHandler* td = ctrl->get_cp(CT_TD);
    td->process_assert(false);
    ASSERT_TRUE(begin_dump());
    run_clock(500);
    ASSERT_TRUE(supply(diag_dev, "partial"));
    run_clock(2499);
    EXPECT_EQ(td->state(), CWS_DUMP);
    run_clock(1);
    EXPECT_EQ(td->state(), CWS_NOT_WORKING);
    EXPECT_EQ(modem()->state(), CWS_DUMP);
    ASSERT_TRUE(diag_dev.put("late"));  // read when the time-out comes, which is none then
    run_clock(500);
    EXPECT_EQ(modem()->state(), CWS_DUMP);
    run_clock(3000);
    EXPECT_EQ(modem()->state(), CWS_NOT_WORKING);
    EXPECT_TRUE(files() == (Files{{"data:" + DUMP_NAME + ".mem", MEMORY}}));
    // What a copy that failed has made stays.
    EXPECT_EQ(files("cp_td-scdma"),
              (Files{{std::string("data:cp_td-scdma_memory") + STAMP + ".mem", ""}}));
    const std::string where = "bool ModemDumpConsumer::save_dump_file(): dump proc memory: ";
    EXPECT_EQ(log.count("dump_read_timeout(void*): read timeout ["), 2u);
    EXPECT_TRUE(log.has(where + root.path("proc/cpw/mem") + " successfully.\n"));
    EXPECT_TRUE(log.has(where + root.path("proc/cpt/mem") + " failed. [2("));
}

TEST_F(ModemDumpTest, AFileThatWentUnderTheDumpDoesNotCount) {
    boot_modem(false);
    ASSERT_TRUE(both_log("<start>"));
    ASSERT_TRUE(begin_dump());
    const uint64_t size = ctrl->stor_mgr().get_media_stor()->size();
    ASSERT_TRUE(supply(diag_dev, std::string(64000, 'x')));
    remove_tree(dump_path());
    modem()->process_alive();
    EXPECT_EQ(ctrl->stor_mgr().get_media_stor()->size(), size);
}

// A modem that does not know the request goes on to log on the device.
TEST_F(ModemDumpTest, AStreamThatNeverEndsIsNoDump) {
    boot_modem(true);
    ASSERT_TRUE(both_log("<start>"));
    ASSERT_TRUE(begin_dump());
    for (int seconds = 2; seconds < 1800; seconds += 2) {
        run_clock(2000);
        ASSERT_TRUE(supply(diag_dev, frame(0x98, 'd', "log")));
    }
    EXPECT_EQ(modem()->state(), CWS_DUMP);
    run_clock(2000);
    EXPECT_EQ(modem()->state(), CWS_NOT_WORKING);
    EXPECT_TRUE(log.has("dump_does_not_end(void*): no end of the dump ["));
    EXPECT_TRUE(files() == (Files{{"data:" + DUMP_NAME + ".mem", MEMORY}}));
}

// The medium refuses the dump or the file goes away under it.
TEST_F(ModemDumpTest, OutlivesFaultsOfItsFile) {
    const Files on_card{{"sd:" + DUMP_NAME + ".dmp", std::string(64000, 'x')}};
    const std::string mem = "data:" + DUMP_NAME + ".mem";
    const Files copy{{mem, MEMORY}}, half{{mem, MEMORY.substr(0, 65536)}};
    const std::string more(4000, 'y');
    const auto full = [] { faults::fail(faults::WRITEV, 1, ENOSPC); };
    const auto all_but_the_probe = [](int fd, const void* data, size_t len) {
        const std::string path = faults::path_of(fd);
        const bool fails = path.find("/sd/") != path.npos && path.find("_test") == path.npos;
        return fails ? (errno = EIO, ssize_t{-1}) : real::write(fd, data, len);
    };
    const struct {
        const char* what;
        bool card;
        std::function<void()> arrange;
        std::string then;  // arrives at the modem's dump, or, if empty, at another log
        std::string message;
        Files files;
    } cases[] = {
        // clang-format off
        {"full", false, full, more, ": need to write 4000, write returns -2 [28(", copy},
        {"cut", false, [] { faults::shorten(faults::WRITEV, 64010); }, more, "returns 10 [", copy},
        {"full at the end", false, [] { faults::fail(faults::WRITE, 1, ENOSPC); }, end_marker(), "returns -1 [28(", copy},
        {"no memory file", false, [&] { full(), faults::fail(faults::OPEN, 1, ENOSPC); }, more, "create dump mem file failed [28(", Files{}},
        {"copy fails", false, [&] { full(), faults::fail(faults::WRITE, 2, ENOSPC); }, more, "/proc/cpw/mem failed. [28(", half},
        {"the card fails under the copy", true, [&] { full(), faults::instead.write = all_but_the_probe; }, more, "/proc/cpw/mem successfully.", copy},
        {"set deleted", false, [&] { remove_tree(dir_of(dir_of(dump_path()))); }, more, ": dump file of cp_wcdma is gone\n", copy},
        {"unmounted", true, [&] { set_card(false); }, "", ": SD card is gone, the dump of cp_wcdma ends\n", on_card},
        {"the card fails", true, [] { faults::fail(faults::WRITEV, 1, EIO), faults::fail(faults::WRITE, 1, EIO); }, more, "returns -1 [5(", copy},
        {"full, unmounted", true, [&] { set_card(false), full(); }, more, "returns -2 [28(", copy},
        // clang-format on
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.what);
        set_card(c.card);
        boot_modem(false);
        ASSERT_TRUE(both_log("<start>"));
        Client client;
        ASSERT_EQ(ask(client, "SUBSCRIBE WCDMA DUMP\n", "OK\n"), "OK\n");
        const auto before = resources();
        ASSERT_TRUE(begin_dump());
        ASSERT_TRUE(supply(diag_dev, std::string(64000, 'x')));
        ASSERT_EQ(dump_path().compare(0, 2, c.card ? "sd" : "da"), 0);
        c.arrange();
        ASSERT_TRUE(c.then.empty() ? feed(gnss_dev, "notice") : supply(diag_dev, c.then));
        faults::instead.write = nullptr;
        EXPECT_EQ(modem()->state(), CWS_NOT_WORKING);
        EXPECT_TRUE(log.has(c.message)) << log.text();
        EXPECT_FALSE(log.has("Receive diag notify")) << "ended twice";
        EXPECT_EQ(hear(client, START_END), START_END);
        EXPECT_TRUE(files() == c.files);
        repair();
        modem()->process_alive();
        EXPECT_TRUE(both_log("<again>"));
        EXPECT_EQ(resources(), before);
        end_service();
    }
}

}  // namespace
