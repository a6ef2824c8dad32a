// What the configuration finds in the handset's properties and environment.
#include "config/ConfigFixture.h"

namespace {

typedef std::vector<std::pair<std::string, std::string>> Settings;

class DiscoveryTest : public ConfigFixture {};

TEST_F(DiscoveryTest, DevicePaths) {
    static const struct {
        CpType type;
        Settings props;
        const char* result;  // "same" or "two", then the paths; "-" on failure
    } CASES[] = {
        {CT_WCDMA, {}, "- old,old"},
        {CT_WCDMA, {{"w.log", "/l"}}, "- old,old"},
        {CT_WCDMA, {{"w.diag", "/d"}}, "same /d,"},
        {CT_WCDMA, {{"w.diag", "/d"}, {"w.log", "/l"}}, "two /l,/d"},
        {CT_TD, {{"t.diag", "/d"}}, "- old,old"},
        {CT_TD, {{"t.log", "/l"}}, "- ,old"},
        {CT_TD, {{"t.log", "/l"}, {"t.diag", "/d"}}, "two /l,/d"},
        {CT_3MODE, {{"tl.log", "/l"}, {"tl.diag", "/d"}}, "two /l,/d"},
        {CT_3MODE, {{"l.log", "/l"}, {"lf.log", "/d"}}, "- old,old"},
        {CT_4MODE, {{"lf.log", "/l"}, {"lf.diag", "/d"}}, "two /l,/d"},
        {CT_5MODE, {{"l.log", "/l"}, {"l.diag", "/d"}}, "two /l,/d"},
        {CT_WCN, {{"wcn.log", "/l"}, {"wcn.diag", "/d"}}, "same /d,"},
        {CT_WCN, {{"wcn.log", "/l"}}, "- old,old"},
        {CT_GNSS, {{"gnss.diag", "/d"}}, "same /d,"},
        {CT_AGDSP, {}, "same ROOT/dev/audio_dsp_log,"},
        {CT_WANMODEM, {{"w.diag", "/d"}}, "- old,old"},
    };
    LogConfig config(file.c_str());
    for (const auto& c : CASES) {
        for (const auto& prop : c.props) {
            root.set_prop("ro.modem." + prop.first, prop.second);
        }
        bool same = false;
        android::String8 log_path("old");
        android::String8 diag_path("old");
        const int found = config.get_dev_paths(c.type, same, log_path, diag_path);
        std::string result = found < 0 ? "- " : same ? "same " : "two ";
        result += std::string(log_path.string()) + "," + diag_path.string();
        std::string expected = c.result;
        if (const size_t at = expected.find("ROOT"); at != std::string::npos) {
            expected.replace(at, 4, root.root());
        }
        EXPECT_EQ(result, expected) << c.type << testing::PrintToString(c.props);
        for (const auto& prop : c.props) {
            root.set_prop("ro.modem." + prop.first, "");
        }
    }
}

TEST_F(DiscoveryTest, ModemTypeByPriority) {
    static const char* const ORDER[] = {"tl", "lf", "l", "w", "t"};
    static const CpType TYPES[] = {CT_3MODE, CT_4MODE, CT_5MODE, CT_WCDMA, CT_TD};
    root.set_prop("persist.modem.w.enable", "");
    for (const char* no : {"", "true", "11", "0", " 1"}) {
        root.set_prop("persist.modem.t.enable", no);
        LogConfig::propget_wan_modem_type();
        EXPECT_EQ(LogConfig::wan_modem_type(), CT_UNKNOWN);
    }
    EXPECT_EQ(log.count("static void LogConfig::propget_wan_modem_type(): modem type unkown ["),
              5u);
    log.clear();
    for (size_t i = 0; i < 5; ++i) {  // each comes before those set so far
        root.set_prop(std::string("persist.modem.") + ORDER[i] + ".enable", "1");
        LogConfig::propget_wan_modem_type();
        EXPECT_EQ(LogConfig::wan_modem_type(), TYPES[i]);
    }
    for (const char* mode : ORDER) {
        root.set_prop(std::string("persist.modem.") + mode + ".enable", "0");
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
        {"0x2", "/ext", "/sec", "/sec", ""},
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
