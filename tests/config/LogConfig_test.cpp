// SPDX-License-Identifier: Apache-2.0

#include "config/LogConfig.h"

#include <sstream>

#include "config/ConfigFixture.h"

namespace {

class LogConfigTest : public ConfigFixture {
protected:
    // What the settings are, as the lines of a saved file that the defaults do not have.
    std::string changes(LogConfig& config) const {
        EXPECT_EQ(config.save(), 0);
        std::istringstream saved(root.read_file("kest_modem.conf"));
        std::string result;
        for (std::string line; std::getline(saved, line);) {
            if (("\n" + DEFAULTS).find("\n" + line + "\n") == std::string::npos) {
                result += (result.empty() ? "" : "|") + line;
            }
        }
        return result;
    }
};

TEST_F(LogConfigTest, LineGrammar) {
    static const char INVALID[] = "invalid line: 1\n [";
    static const char STREAM[] = "stream\tcp_wcdma\ton\t100\t3";
    static const struct {
        std::string line;
        const char* message;  // "": nothing may be logged
        const char* changes;
    } CASES[] = {
        {"  stream cp_wcdma on 100 3\n", "", STREAM},
        {"stream cp_wcdma on\t0x64 03\r\n", "", STREAM},
        {"stream cp_wcdma on 100\v3 3\n", INVALID, ""},
        {std::string("stream cp_wcdma on 100 3\0x\n", 27), "", STREAM},
        {std::string("stream cp_wcdma on\0 100 3\n", 26), INVALID, ""},
        {"stream cp_wcdma ON 100 3\n", "", "stream\tcp_wcdma\toff\t100\t3"},
        {"stream agdsp on -1 -0x1\n", "", "stream\tagdsp\ton\t4294967295\t4294967295"},
        {"stream cp_wcdma on 100x 3\n", INVALID, ""},
        {"stream\n", INVALID, ""},
        {"stream cp_tdd-lte on 100 3\n", "", ""},
        {"iq cp_wcdma WCDMA GSM GSM\n", "", "iq cp_wcdma GSM WCDMA"},
        {"iq cp_wcdma \n", ": no I/Q type [", ""},
        {"iq cp_wcdma WCDMA LTE\n", ": invalid I/Q type [", ""},
        {"iq cp_td-lte WCDMA\n", ": invalid I/Q CP type [", ""},
        {"minidump enable internal\n", "", "minidump enable\tinternal"},
        {"minidump enable\n", INVALID, "minidump enable\texternal"},
        {"log_file_size 0x20\n", "", "log_file_size 32"},
        {"log_file_size", INVALID, ""},
        {"log_file_size 7M\n", INVALID, ""},
        {"log_file_size abc\n", "0: every write starts a new log file\n", "log_file_size 0"},
        {"log_file_size 0x1000\n", " 4096: every write starts", "log_file_size 4096"},
        {"data_log_size 0\n", "0: the internal medium has no quota\n", "data_log_size 0"},
        {"sd_log_size\n", "0: the SD card has no quota\n", "sd_log_size 0"},
        {"log_file_size -1\n", "", "log_file_size 4294967295"},
        {"log_file_size 4294967295\n", "", "log_file_size 4294967295"},
        {"log_file_size 4294967296\n", INVALID, ""},
        {"log_overwrite yes\n", "", "log_overwrite disable"},
        {"Stream cp_wcdma on 100 3\n", INVALID, ""},
        {"#stream cp_wcdma on 100 3\n", "", ""},
    };
    for (const auto& c : CASES) {
        SCOPED_TRACE(testing::PrintToString(c.line));
        root.write_file("kest_modem.conf", c.line);
        log.clear();
        LogConfig config(file.c_str());
        EXPECT_EQ(read(config), 0);
        EXPECT_TRUE(c.message[0] ? log.has(c.message) : log.text().empty()) << log.text();
        EXPECT_EQ(changes(config), c.changes);
    }
}

TEST_F(LogConfigTest, DuplicatesKeepTheFirstPlaceAndInvalidLinesTheirNumber) {
    root.write_file("kest_modem.conf",
                    "stream cp_wcn on 1 1\nfoo\nstream agdsp on 2 2\nstream cp_wcn off 3 4\n"
                    "iq cp_wcdma GSM\niq cp_wcdma WCDMA\n\nbar\n");
    LogConfig config(file.c_str());
    ASSERT_EQ(read(config), 0);
    EXPECT_TRUE(log.has("kestcp: duplicate CP cp_wcn in config file ["));
    EXPECT_TRUE(log.has("int LogConfig::read_config(int, char**): invalid line: 2\n ["));
    EXPECT_TRUE(log.has("invalid line: 8\n ["));
    EXPECT_FALSE(config.wcdma_iq_enabled(CT_WCDMA)) << "the first I/Q entry decides";
    const std::string iq = "iq cp_wcdma GSM |iq cp_wcdma WCDMA|";
    EXPECT_EQ(changes(config), iq + "stream\tcp_wcn\toff\t3\t4|stream\tagdsp\ton\t2\t2");
}

TEST_F(LogConfigTest, LongLinesAreReadInPieces) {
    const std::string number = "log_file_size 12";
    root.write_file("kest_modem.conf", "#" + std::string(1022, 'x') + "data_log_size 9\n" +  // 1, 2
                                           std::string(1023 - number.size(), ' ') + number +
                                           "34\n\n");  // 3, 4
    LogConfig config(file.c_str());
    ASSERT_EQ(read(config), 0);
    EXPECT_EQ(log.count("invalid line:"), 2u);
    EXPECT_TRUE(log.has("invalid line: 3\n") && log.has("invalid line: 4\n")) << log.text();
    EXPECT_EQ(changes(config), "data_log_size 9");
}

TEST_F(LogConfigTest, Options) {
    root.write_file("kest_modem.conf", "");
    static const struct {
        std::vector<std::string> args;
        int result;
        bool kest_dir;
    } CASES[] = {
        {{}, 0, false},
        {{"word", "-s"}, 0, true},
        {{"-sx"}, -1, true},
        {{"-x"}, -1, false},
    };
    for (const auto& c : CASES) {
        SCOPED_TRACE(testing::PrintToString(c.args));
        log.clear();
        LogConfig config(file.c_str());
        EXPECT_EQ(read(config, c.args), c.result);
        EXPECT_EQ(config.kest_dir(), c.kest_dir);
        EXPECT_EQ(config.sd_root(), c.result < 0 ? "" : "/storage/sdcard0");
        EXPECT_EQ(log.count("option:-s Modem log will be saved in kest directory!\n"),
                  c.kest_dir ? 1u : 0u);
        EXPECT_EQ(log.count("parameters passed to kestmodem are unrecognised! ["),
                  c.result < 0 ? 1u : 0u);
        EXPECT_EQ(log.count("\n"), (c.kest_dir ? 1u : 0u) + (c.result < 0 ? 1u : 0u))
            << "getopt spoke itself";
    }
}

// The other settings change by requests only; the tests of those see the file.
TEST_F(LogConfigTest, CapturesAreSwitchedOneByOne) {
    LogConfig config(file.c_str());
    static const struct {
        void (LogConfig::*change)(CpType, int);
        int type;
        const char* line;
    } CASES[] = {
        {&LogConfig::enable_iq, LogConfig::IQ_GSM, "iq cp_td-scdma GSM "},
        {&LogConfig::enable_iq, LogConfig::IQ_WCDMA, "iq cp_td-scdma GSM WCDMA"},
        {&LogConfig::disable_iq, LogConfig::IQ_WCDMA, "iq cp_td-scdma GSM "},
        {&LogConfig::disable_iq, LogConfig::IQ_GSM, "iq cp_td-scdma "},
        {&LogConfig::enable_iq, LogConfig::IQ_WCDMA, "iq cp_td-scdma WCDMA"},
    };
    for (const auto& c : CASES) {
        (config.*c.change)(CT_TD, c.type);
        EXPECT_TRUE(config.dirty()) << c.line;
        EXPECT_EQ(changes(config), c.line);
        (config.*c.change)(CT_TD, c.type);
        EXPECT_FALSE(config.dirty()) << c.line;
    }
    config.disable_iq(CT_WCDMA, LogConfig::IQ_WCDMA);  // no such entry
    EXPECT_FALSE(config.dirty());
}

}  // namespace
