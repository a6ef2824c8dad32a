// SPDX-License-Identifier: Apache-2.0
// What the configuration finds in the handset's properties and environment.
#include "config/ConfigFixture.h"

namespace {

typedef std::vector<std::pair<std::string, std::string>> Settings;

class DiscoveryTest : public ConfigFixture {};

TEST_F(DiscoveryTest, DevicePaths) {
    static const struct {
        CpType type;
        Settings props;
        bool found, same;
        const char *log_path, *diag_path;
    } CASES[] = {
        {CT_WCDMA, {{"w.log", "/l"}}, false, false, "old", "old"},
        {CT_WCDMA, {{"w.diag", "/d"}}, true, true, "/d", ""},
        {CT_WCDMA, {{"w.diag", "/d"}, {"w.log", "/d"}}, true, true, "/d", ""},
        {CT_WCDMA, {{"w.diag", "/d"}, {"w.log", "/l"}}, true, false, "/l", "/d"},
        {CT_TD, {{"t.diag", "/d"}}, false, false, "old", "old"},
        {CT_TD, {{"t.log", "/l"}}, false, false, "", "old"},
        {CT_TD, {{"t.log", "/l"}, {"t.diag", "/d"}}, true, false, "/l", "/d"},
        {CT_3MODE, {{"tl.log", "/l"}, {"tl.diag", "/d"}}, true, false, "/l", "/d"},
        {CT_4MODE, {{"lf.log", "/l"}, {"lf.diag", "/d"}}, true, false, "/l", "/d"},
        {CT_5MODE, {{"l.log", "/l"}, {"l.diag", "/d"}}, true, false, "/l", "/d"},
        {CT_WANMODEM, {{"w.diag", "/d"}}, false, false, "old", "old"},
    };
    LogConfig config(file.c_str());
    for (const auto& c : CASES) {
        SCOPED_TRACE(std::to_string(c.type) + testing::PrintToString(c.props));
        for (const auto& prop : c.props) {
            root.set_prop("ro.modem." + prop.first, prop.second);
        }
        bool same = false;
        android::String8 log_path("old");
        android::String8 diag_path("old");
        EXPECT_EQ(config.get_dev_paths(c.type, same, log_path, diag_path), c.found ? 0 : -1);
        EXPECT_EQ(same, c.same);
        EXPECT_STREQ(log_path.string(), c.log_path);
        EXPECT_STREQ(diag_path.string(), c.diag_path);
        for (const auto& prop : c.props) {
            root.set_prop("ro.modem." + prop.first, "");
        }
    }
}

TEST_F(DiscoveryTest, ModemTypeByPriority) {
    static const struct {
        const char* mode;
        CpType type;
    } ORDER[] = {
        {"tl", CT_3MODE}, {"lf", CT_4MODE}, {"l", CT_5MODE}, {"w", CT_WCDMA}, {"t", CT_TD}};
    root.set_prop("persist.modem.w.enable", "");
    root.set_prop("persist.modem.t.enable", "11");
    LogConfig::propget_wan_modem_type();
    EXPECT_EQ(LogConfig::wan_modem_type(), CT_UNKNOWN);
    EXPECT_EQ(log.count("static void LogConfig::propget_wan_modem_type(): modem type unkown ["),
              1u);
    log.clear();
    for (const auto& modem : ORDER) {  // each comes before those set so far
        root.set_prop(std::string("persist.modem.") + modem.mode + ".enable", "1");
        LogConfig::propget_wan_modem_type();
        EXPECT_EQ(LogConfig::wan_modem_type(), modem.type);
        EXPECT_EQ(cp_image_prop_suffix(modem.type), modem.mode + std::string(".nvp"));
    }
    for (const auto& modem : ORDER) {
        root.set_prop(std::string("persist.modem.") + modem.mode + ".enable", "0");
    }
    LogConfig::propget_wan_modem_type();  // keeps what it knew
    EXPECT_EQ(LogConfig::wan_modem_type(), CT_TD);
    EXPECT_EQ(log.text(), "");
}

TEST_F(DiscoveryTest, SdRoot) {
    static const struct {
        const char* type;
        const char *external, *secondary;  // null: not set
        const char* root;                  // null: failure
        const char* message;
    } CASES[] = {
        {"1", "/ext", "/sec", "/ext", ""},
        {"2", "/ext", "/sec", "/sec", ""},
        {"1", "", "/sec", "", ""},
        {"", "/ext", "/sec", nullptr, "persist.storage.type non exist ["},
        {"1", nullptr, "/sec", nullptr, "no EXTERNAL_STORAGE ["},
        {"2", "/ext", nullptr, nullptr, "no SECONDARY_STORAGE ["},
        {"3", "/ext", "/sec", nullptr, "unexpected persist.storage.type 3 ["},
    };
    for (const auto& c : CASES) {
        SCOPED_TRACE(c.type);
        root.set_prop("persist.storage.type", c.type);
        c.external ? setenv("EXTERNAL_STORAGE", c.external, 1) : unsetenv("EXTERNAL_STORAGE");
        c.secondary ? setenv("SECONDARY_STORAGE", c.secondary, 1) : unsetenv("SECONDARY_STORAGE");
        log.clear();
        LogConfig config(file.c_str());
        EXPECT_EQ(config.get_sd_root(), c.root != nullptr);
        EXPECT_EQ(config.sd_root(), c.root ? c.root : "");
        const std::string signature = "bool LogConfig::get_sd_root(): ";
        EXPECT_TRUE(c.message[0] ? log.has(signature + c.message) : log.text().empty());
    }
}

}  // namespace
