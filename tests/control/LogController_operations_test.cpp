#include <sstream>

#include "channels/CrashFixture.h"
#include "storage/MediaStorage.h"

namespace {

// What save() makes of the settings the tests begin with.
const std::string SAVED =
    "minidump disable\texternal\nlog_file_size 4\ndata_log_size 30\nsd_log_size 300\n"
    "log_overwrite disable\n\n\n#Type\tName\tState\tSize\tLevel\n"
    "stream\tcp_wcdma\ton\t5\t3\nstream\tcp_wcn\toff\t1\t2\nstream\tcp_gnss\ton\t7\t0\n";
// The same as somebody might have typed it, so that a file that is written again shows.
const std::string TYPED = "# typed\n" + SAVED;

class ControlOperationsTest : public CrashFixture {
protected:
    ControlOperationsTest() {
        root.set_prop("ro.modem.w.log", own_log_dev.path());
        root.set_prop("ro.modem.w.diag", diag_dev.path());
        log_dev = &own_log_dev;
    }

    void start() { ASSERT_EQ(boot(TYPED), 0); }
    std::string file() const { return root.read_file("kest_modem.conf"); }
    void block_file() const {
        ASSERT_EQ(unlink(root.path("kest_modem.conf").c_str()), 0);
        root.make_dir("kest_modem.conf");
    }
    template <typename... Types>
    int turn(bool on, Types... types) {
        const CpType list[] = {types...};
        return on ? ctrl->enable_log(list, sizeof...(types))
                  : ctrl->disable_log(list, sizeof...(types));
    }
    std::string enabled() const {
        std::string names;
        for (const LogPipeHandler* channel : ctrl->log_pipes()) {
            names += channel->enabled() ? channel->name().string() + 3 + std::string(" ") : "";
        }
        return names;
    }
    // The settings as the controller tells them, of both media as they are in force, the
    // number of polled devices and the channels that are on.
    std::string state() {
        std::ostringstream text;
        text << ctrl->get_log_file_size() << " " << ctrl->get_data_part_size() << " "
             << ctrl->get_sd_size() << " " << ctrl->get_log_overwrite() << ctrl->get_md_int_stor();
        for (MediaType type : {MT_INTERNAL, MT_EXTERNAL}) {
            const MediaStorage* media = ctrl->stor_mgr().get_media(type);
            text << ", " << (media->file_size() >> 20) << " " << (media->quota() >> 20) << " "
                 << media->overwrite();
        }
        text << ", " << polled() << " " << enabled();
        return text.str();
    }
    const std::string INITIAL = "4 30 300 00, 4 30 0, 4 300 0, 2 wcdma gnss ";
};

std::string changed(std::string text, const std::string& from, const std::string& to) {
    const size_t at = text.find(from);
    EXPECT_NE(at, std::string::npos) << from;
    return text.replace(at, from.size(), to);
}

TEST_F(ControlOperationsTest, ActOnTheRunningObjectsAndTheFile) {
    LogController* c = nullptr;
    const struct {
        std::function<int()> operation;
        const char *from, *to;
        std::string state;
    } cases[] = {
        {[&] { return c->set_log_file_size(7); }, "file_size 4", "file_size 7",
         "7 30 300 00, 7 30 0, 7 300 0, 2 wcdma gnss "},
        {[&] { return c->set_log_file_size(4097); }, "file_size 4", "file_size 4097",
         "4097 30 300 00, 1 30 0, 1 300 0, 2 wcdma gnss "},  // kept in 32 bits
        {[&] { return c->set_data_part_size(8000); }, "data_log_size 30", "data_log_size 8000",
         "4 8000 300 00, 4 8000 0, 4 300 0, 2 wcdma gnss "},
        {[&] { return c->set_sd_size(0); }, "sd_log_size 300", "sd_log_size 0",
         "4 30 0 00, 4 30 0, 4 0 0, 2 wcdma gnss "},
        {[&] { return c->set_log_overwrite(true); }, "overwrite disable", "overwrite enable",
         "4 30 300 10, 4 30 1, 4 300 1, 2 wcdma gnss "},
        {[&] { return c->enable_md(); }, "minidump disable", "minidump enable", INITIAL},
        {[&] { return c->enable_md() + c->disable_md(); }, "", "", INITIAL},
        {[&] { return c->set_md_int_stor(true); }, "external", "internal",
         "4 30 300 01, 4 30 0, 4 300 0, 2 wcdma gnss "},
        {[&] { return turn(true, CT_WCN, CT_TD); }, "off", "on",
         "4 30 300 00, 4 30 0, 4 300 0, 3 wcdma wcn gnss "},
        {[&] { return turn(false, CT_TD, CT_GNSS, CT_GNSS); }, "ss\ton", "ss\toff",
         "4 30 300 00, 4 30 0, 4 300 0, 1 wcdma "},
        {[&] { return turn(false, CT_GNSS) + turn(true, CT_GNSS); }, "", "", INITIAL},
        {[&] { return c->enable_wcdma_iq(CT_GNSS); }, "\n\n\n", "\n\niq cp_gnss WCDMA\n\n",
         INITIAL},
    };
    const Fifo wcn(root.path("wcn"));
    for (const auto& test : cases) {
        for (bool saves : {true, false}) {  // what cannot be saved is saved later
            SCOPED_TRACE(std::string(test.to) + (saves ? "" : ", not saved"));
            log.clear();
            start();
            c = ctrl.get();
            if (!saves) {
                block_file();
            }
            EXPECT_EQ(test.operation(), 0);
            EXPECT_EQ(state(), test.state);
            EXPECT_EQ(log.has("save config file failed [21("),
                      !saves && !log.has("enable WCDMA I/Q on CP "));
            if (!saves) {
                remove_tree("kest_modem.conf");
                c->set_log_file_size(c->get_log_file_size());
            }
            EXPECT_EQ(file(), changed(SAVED, test.from, test.to));
        }
    }
}

TEST_F(ControlOperationsTest, WhatChangesNothingLeavesTheFile) {
    start();
    LogController* c = ctrl.get();
    const std::pair<int, std::function<int()>> cases[] = {
        {0, [&] { return c->set_log_file_size(4); }},
        {0, [&] { return c->set_data_part_size(30); }},
        {0, [&] { return c->set_sd_size(300); }},
        {0, [&] { return c->set_log_overwrite(false); }},
        {0, [&] { return c->disable_md(); }},
        {0, [&] { return c->set_md_int_stor(false); }},
        {0, [&] { return turn(true, CT_WCDMA, CT_TD, CT_WANMODEM); }},
        {0, [&] { return turn(false, CT_WCN, CT_5MODE); }},
        {-1, [&] { return c->save_mini_dump_on_request(); }},
        {-7, [&] { return c->enable_wcdma_iq(CT_TD); }},
        {-7, [&] { return c->disable_wcdma_iq(CT_TD); }},
    };
    for (const auto& test : cases) {
        EXPECT_EQ(test.second(), test.first) << &test - cases;
        EXPECT_EQ(file(), TYPED) << &test - cases;
        EXPECT_EQ(state(), INITIAL);
    }
    EXPECT_TRUE(files().empty());
    EXPECT_EQ(c->enable_wcdma_iq(CT_WCN), 0);
    EXPECT_EQ(c->disable_wcdma_iq(CT_WCN), -1) << "of a CP that is off";
    EXPECT_EQ(file(), changed(SAVED, "\n\n\n", "\n\niq cp_wcn WCDMA\n\n"));
    start();
    root.set_prop("ro.modem.wcn.diag", "");
    EXPECT_EQ(turn(true, CT_WCN), 0);
    EXPECT_TRUE(
        log.has("int LogController::enable_log(const CpType*, size_t): Can not get "
                "log/diag path for cp_wcn ["));
    EXPECT_EQ(state(), INITIAL);
    EXPECT_EQ(file(), SAVED) << "written all the same";
}

TEST_F(ControlOperationsTest, ReloadAppliesTheOtherLoggersStreams) {
    const std::string begin = "int LogController::reload_kest_conf(): ";
    const std::string path = "data/local/tmp/kest/kest.conf";
    const struct {
        const char *text, *enabled;
        std::string file;
        size_t changes;
    } cases[] = {
        {"enable\nstream cp_wcdma on 5 3\nstream cp_wcn off 5 3\nstream cp_td-scdma on 1 1\n",
         "wcdma gnss ", TYPED, 0},
        {"enable\nstream cp_gnss off 5 3\nstream cp_wcn on 5 3\n", "wcdma wcn ",
         changed(changed(SAVED, "off", "on"), "ss\ton", "ss\toff"), 2},
        {"stream cp_wcn on 5 3\nstream cp_wcdma on 5 3\n",  // not enabled
         "gnss ", changed(SAVED, "ma\ton", "ma\toff"), 1},
        {"enable\nstream cp_gnss off 1 1\nstream cp_gnss on 1 1\n", "wcdma gnss ", SAVED, 2},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.text);
        log.clear();
        start();
        root.write_file(path, c.text);
        EXPECT_EQ(ctrl->reload_kest_conf(), 0);
        EXPECT_EQ(enabled(), c.enabled);
        EXPECT_EQ(file(), c.file);
        EXPECT_EQ(log.count(begin), c.changes);
    }
    EXPECT_TRUE(log.has(begin + "disable CP cp_gnss\n"));
    EXPECT_TRUE(log.has(begin + "enable CP cp_gnss\n"));
    // Missing devices do not keep the stream from being marked enabled. What was logged
    // before a CP is switched off is in its file.
    start();
    root.set_prop("ro.modem.wcn.diag", "");
    root.write_file(path, "enable\nstream cp_wcn on 5 3\nstream cp_wcdma off 5 3\n");
    ASSERT_TRUE(supply(*log_dev, "last words"));
    EXPECT_EQ(ctrl->reload_kest_conf(), 0);
    EXPECT_EQ(logged("cp_wcdma", "last words"), 1u);
    EXPECT_EQ(enabled(), "gnss ");
    EXPECT_EQ(file(), changed(changed(SAVED, "off", "on"), "ma\ton", "ma\toff"));
    EXPECT_TRUE(log.has(begin + "Can not get log/diag path for cp_wcn ["));
    block_file();
    root.write_file(path, "enable\nstream cp_wcdma on 5 3\n");
    EXPECT_EQ(ctrl->reload_kest_conf(), 0);
    EXPECT_TRUE(log.has(begin + "save config failed [21("));
    remove_tree(path);
    EXPECT_EQ(ctrl->reload_kest_conf(), -1);
    EXPECT_TRUE(log.has(begin + "load kest.conf failed [2("));
    EXPECT_EQ(enabled(), "wcdma gnss ");
}

TEST_F(ControlOperationsTest, FlushAndClear) {
    start();
    ASSERT_TRUE(supply(*log_dev, "<staged>"));
    EXPECT_EQ(logged("cp_wcdma", "<staged>"), 0u);
    EXPECT_EQ(ctrl->flush(), 0);
    EXPECT_EQ(logged("cp_wcdma", "<staged>"), 1u);
    root.write_file("data/modem_log/modem_db.gz", "library");
    const auto tree = [&] { return root.tree("data/modem_log"); };

    Client client;
    for (const char* busy : {"", "SAVE_RINGBUF WCDMA\n", "SAVE_SLEEP_LOG WCDMA\n"}) {
        ASSERT_TRUE(*busy ? client.say(busy) : begin_dump());
        ASSERT_TRUE(pump([&] { return modem()->state() != CWS_WORKING; }));
        const std::vector<std::string> before = tree();
        EXPECT_EQ(ctrl->clear_log(), -2);
        EXPECT_EQ(tree(), before);
        modem()->process_alive();
    }
    EXPECT_EQ(ctrl->clear_log(), 0);
    EXPECT_EQ(tree(), std::vector<std::string>{"modem_db.gz"});
    EXPECT_EQ(ctrl->stor_mgr().get_media(MT_INTERNAL)->size(), 0u);
    EXPECT_TRUE(both_log("<after>"));
    EXPECT_EQ(tree().size(), 3u);
}

}  // namespace
