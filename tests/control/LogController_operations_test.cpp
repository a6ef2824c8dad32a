// SPDX-License-Identifier: Apache-2.0

#include <sstream>

#include "storage/MediaStorage.h"
#include "support/ServiceFixture.h"

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
        EXPECT_EQ(unlink(root.path("kest_modem.conf").c_str()), 0);
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
    // The settings as the controller tells them, in brackets as they are in force on the
    // media, and what is logged.
    std::string state() {
        const MediaStorage& internal = *ctrl->stor_mgr().get_media(MT_INTERNAL);
        const MediaStorage& external = *ctrl->stor_mgr().get_media(MT_EXTERNAL);
        std::ostringstream text;
        text << "file " << ctrl->get_log_file_size() << " (" << (internal.file_size() >> 20) << " "
             << (external.file_size() >> 20) << "), data " << ctrl->get_data_part_size() << " ("
             << (internal.quota() >> 20) << "), sd " << ctrl->get_sd_size() << " ("
             << (external.quota() >> 20) << "), overwrite " << ctrl->get_log_overwrite() << " ("
             << internal.overwrite() << " " << external.overwrite() << "), internal mini dumps "
             << ctrl->get_md_int_stor() << ", " << polled() << " devices: " << enabled();
        return text.str();
    }
    const std::string INITIAL =
        "file 4 (4 4), data 30 (30), sd 300 (300), overwrite 0 (0 0), internal mini dumps 0, "
        "2 devices: wcdma gnss ";
};

std::string changed(std::string text, const std::string& from, const std::string& to) {
    const size_t at = text.find(from);
    EXPECT_NE(at, std::string::npos) << from;
    return text.replace(at, from.size(), to);
}

TEST_F(ControlOperationsTest, ActOnTheRunningObjectsAndTheFile) {
    LogController* c = nullptr;
    struct Change {
        const char *from, *to;
    };
    const struct {
        std::function<int()> operation;
        Change file, state;
    } cases[] = {
        // clang-format off
        // The first is kept in 32 bits.
        {[&] { return c->set_log_file_size(4097); }, {"file_size 4", "file_size 4097"}, {"file 4 (4 4)", "file 4097 (1 1)"}},
        {[&] { return c->set_data_part_size(8000); }, {"data_log_size 30", "data_log_size 8000"}, {"data 30 (30)", "data 8000 (8000)"}},
        {[&] { return c->set_sd_size(0); }, {"sd_log_size 300", "sd_log_size 0"}, {"sd 300 (300)", "sd 0 (0)"}},
        {[&] { return c->set_log_overwrite(true); }, {"overwrite disable", "overwrite enable"}, {"overwrite 0 (0 0)", "overwrite 1 (1 1)"}},
        {[&] { return c->enable_md(); }, {"minidump disable", "minidump enable"}, {"", ""}},
        {[&] { return c->enable_md() + c->disable_md(); }, {"", ""}, {"", ""}},
        {[&] { return c->set_md_int_stor(true); }, {"external", "internal"}, {"mini dumps 0", "mini dumps 1"}},
        {[&] { return turn(true, CT_WCN, CT_TD); }, {"off", "on"}, {"2 devices: wcdma gnss", "3 devices: wcdma wcn gnss"}},
        {[&] { return turn(false, CT_TD, CT_GNSS, CT_GNSS); }, {"ss\ton", "ss\toff"}, {"2 devices: wcdma gnss", "1 devices: wcdma"}},
        {[&] { return c->enable_wcdma_iq(CT_GNSS); }, {"\n\n\n", "\n\niq cp_gnss WCDMA\n\n"}, {"", ""}},
        {[&] { return c->enable_wcdma_iq(CT_GNSS) + c->disable_wcdma_iq(CT_GNSS); }, {"\n\n\n", "\n\niq cp_gnss \n\n"}, {"", ""}},
        // clang-format on
    };
    const Fifo wcn(root.path("wcn"));
    for (const auto& test : cases) {
        for (bool saves : {true, false}) {  // what cannot be saved is saved later
            SCOPED_TRACE(std::string(test.file.to) + (saves ? "" : ", not saved"));
            log.clear();
            ASSERT_NO_FATAL_FAILURE(start());
            c = ctrl.get();
            if (!saves) {
                block_file();
            }
            EXPECT_EQ(test.operation(), 0);
            EXPECT_EQ(state(), changed(INITIAL, test.state.from, test.state.to));
            EXPECT_EQ(log.has("save config file failed [21("),
                      !saves && !log.has("enable WCDMA I/Q on CP "));
            if (!saves) {
                remove_tree("kest_modem.conf");
                c->set_log_file_size(c->get_log_file_size());
            }
            EXPECT_EQ(file(), changed(SAVED, test.file.from, test.file.to));
        }
    }
}

// What it does is in tests/recordings/reload.in.
TEST_F(ControlOperationsTest, AReloadThatChangesNothingOrCannotBeSavedOrRead) {
    const std::string begin = "int LogController::reload_kest_conf(): ";
    const std::string path = "data/local/tmp/kest/kest.conf";
    ASSERT_NO_FATAL_FAILURE(start());
    root.write_file(path, "enable\nstream cp_wcdma on 5 3\nstream cp_td-scdma on 1 1\n");
    EXPECT_EQ(ctrl->reload_kest_conf(), 0);
    EXPECT_EQ(file(), TYPED);
    block_file();
    root.write_file(path, "enable\nstream cp_wcdma off 5 3\n");
    EXPECT_EQ(ctrl->reload_kest_conf(), 0);
    EXPECT_TRUE(log.has(begin + "save config failed [21("));
    ASSERT_EQ(truncate(root.path(path).c_str(), (1 << 20) + 1), 0);
    for (const bool grows : {false, true}) {
        if (grows) {
            faults::instead.fstat = [](int fd, struct stat* st) {
                const int result = real::fstat(fd, st);
                st->st_size = std::min<off_t>(st->st_size, 10);
                return result;
            };
        }
        EXPECT_EQ(ctrl->reload_kest_conf(), -1);
        EXPECT_TRUE(log.has(begin + "load kest.conf failed [27(")) << "all of it would be read";
        log.clear();
        faults::instead = {};
    }
    remove_tree(path);
    root.write_file("elsewhere", "enable\nstream cp_gnss off 5 3\n");
    ASSERT_EQ(symlink(root.path("elsewhere").c_str(), root.path(path).c_str()), 0);
    EXPECT_EQ(ctrl->reload_kest_conf(), -1);
    EXPECT_TRUE(log.has("int KestConfig::read_config(const char*): can not open "));
    EXPECT_TRUE(log.has(begin + "load kest.conf failed [40("));
    EXPECT_EQ(enabled(), "gnss ");
}

}  // namespace
