// SPDX-License-Identifier: Apache-2.0
// The settings file through kills, faults and whatever stands in its place.
#include <errno.h>
#include <sys/stat.h>

#include <algorithm>

#include "config/ConfigFixture.h"
#include "config/settings_file.h"
#include "support/faults.h"

namespace {

const std::string ON = DEFAULTS + "stream\tcp_wcn\ton\t1\t1\n";

class SettingsFileTest : public ConfigFixture {
protected:
    SettingsFileTest() {
        faults::instead.write = [this](int fd, const void* data, size_t len) {
            return real::write(fd, data, fd > STDERR_FILENO ? std::min(len, most) : len);
        };
        faults::instead.pwrite = [this](int fd, const void* data, size_t len, off_t at) {
            const size_t begin = static_cast<size_t>(at);
            errno = ENOSPC;
            return !before_change() || begin >= room
                       ? -1
                       : real::pwrite(fd, data, std::min({len, most, room - begin}), at);
        };
        faults::instead.ftruncate = [this](int fd, off_t len) {
            return before_change() ? real::ftruncate(fd, len) : -1;
        };
        faults::instead.close = [this](int fd) {
            const bool works = before_change();
            return real::close(fd) == 0 && works ? 0 : -1;
        };
    }
    ~SettingsFileTest() override { faults::instead = {}; }

    // A start with this text in the settings file finds the stream, on or off, and has
    // nothing to say.
    void expect_whole(const std::string& text) {
        root.write_file("moment.conf", text);
        LogConfig config(root.path("moment.conf").c_str());
        log.clear();
        EXPECT_EQ(read(config), 0);
        EXPECT_TRUE(log.text().empty() && config.find_stream(CT_WCN)) << log.text() << text;
    }

    // Called before each call that changes the file. False: it fails.
    std::function<bool()> before_change = [] { return true; };
    size_t most = SIZE_MAX;  // bytes that one write takes
    size_t room = SIZE_MAX;  // bytes that fit into the file
};

TEST_F(SettingsFileTest, KillsFaultsAndAFullMediumLeaveTheOldSettingsOrTheNew) {
    most = 4096;  // a kill between two pages is a moment of its own
    const std::string line = "stream cp_wcn off 1 1";
    std::string commented = line;
    while (commented.size() < 10000) {
        commented += "\n# settings\n";
    }
    for (const std::string& old : {DEFAULTS + line + "    \n", commented, line}) {
        for (size_t failing = 0; failing < 8; ++failing) {  // 0: the medium is full
            SCOPED_TRACE(std::to_string(old.size()) + ", fault " + std::to_string(failing));
            root.write_file("kest_modem.conf", old);
            LogConfig config(file.c_str());
            ASSERT_EQ(read(config), 0);
            config.set_stream(CT_WCN, true);
            std::vector<std::string> moments;
            before_change = [&] {
                moments.push_back(root.read_file("kest_modem.conf"));
                return moments.size() != failing;
            };
            room = failing ? SIZE_MAX : old.size() + 9;
            const int result = config.save();
            const bool fails = failing ? moments.size() >= failing : ON.size() > room;
            EXPECT_EQ(result, fails ? -1 : 0);
            before_change = [] { return true; };
            room = SIZE_MAX;
            EXPECT_EQ(config.dirty(), fails);
            moments.push_back(root.read_file("kest_modem.conf"));
            EXPECT_TRUE(!fails || failing > 1 || moments.back() == old);
            for (const std::string& moment : moments) {
                expect_whole(moment);
            }
            EXPECT_EQ(config.save(), 0);
            EXPECT_EQ(root.read_file("kest_modem.conf"), ON);
        }
    }
}

TEST_F(SettingsFileTest, TheDefaultReplacesWhatIsMissingEmptyOrAnUnfinishedCopy) {
    const std::string whole = "stream cp_wcn on 1 2\n" + std::string(5000, '#');
    const std::string other = "stream cp_wcn on 1 3\n" + std::string(1003, '#');
    root.write_file("system/etc/kest_modem.conf", whole);
    const size_t before = open_descriptors();
    const struct {
        const char* what;
        std::string text;
        bool kept;
    } cases[] = {{"nothing", "", false},
                 {"its first block", whole.substr(0, 1024), false},
                 {"a part that no block ends", whole.substr(0, 1000), true},
                 {"a block of something else", other, true},
                 {"all of it", whole, true}};
    for (const auto& c : cases) {
        SCOPED_TRACE(c.what);
        root.write_file("kest_modem.conf", c.text);
        LogConfig config(file.c_str());
        EXPECT_EQ(read(config), 0);
        EXPECT_EQ(root.read_file("kest_modem.conf"), c.kept ? c.text : whole);
        EXPECT_TRUE(config.find_stream(CT_WCN));
        EXPECT_EQ(log.text(), "");
    }
    for (const size_t free : {0u, 5u, 5021u}) {  // a medium that is full, then one that is not
        unlink(file.c_str());
        most = free;
        const bool fits = free == whole.size();
        LogConfig config(file.c_str());
        EXPECT_EQ(read(config), fits ? 0 : -1) << free;
        EXPECT_EQ(root.exists("kest_modem.conf"), fits);
        EXPECT_EQ(log.has("incomplete copy " + file + " deleted [28("), !fits);
        log.clear();
    }
    EXPECT_EQ(open_descriptors(), before);
}

TEST_F(SettingsFileTest, WhatCannotBeReadToItsEndIsNoConfiguration) {
    auto refused = [&](const char* error) {
        log.clear();
        LogConfig config(file.c_str());
        return read(config) == -1 && log.has("can not open " + file + " [" + error + "(");
    };
    EXPECT_TRUE(refused("2")) << "neither settings nor a default";
    root.write_file("system/etc/kest_modem.conf", "stream cp_wcn on 1 2\n");
    ASSERT_EQ(mkfifo(file.c_str(), 0600), 0);
    EXPECT_TRUE(refused("22") && unlink(file.c_str()) == 0) << "a FIFO, which stays";
    // Who may make files beside it could make the service read and write others with a link.
    const std::string victim = root.path("victim");
    for (const auto make : {symlink, link}) {
        root.write_file("victim", "stream cp_gnss on 1 2\n");
        ASSERT_EQ(make(victim.c_str(), file.c_str()), 0);
        EXPECT_TRUE(make == link || refused("40"));
        EXPECT_EQ(put_settings(file.c_str(), "new"), -1);
        root.write_file("victim", "");  // to be replaced by the default
        EXPECT_TRUE(make == link || refused("40"));
        copy_default_settings(root.path("system/etc/kest_modem.conf").c_str(), file.c_str());
        EXPECT_EQ(root.read_file("victim"), "");
        EXPECT_TRUE(log.has(make == link ? "[31(" : "[40("));
        unlink(file.c_str());
    }
    LogConfig unreadable("/proc/self/mem");
    EXPECT_EQ(read(unreadable), -1);
    EXPECT_TRUE(log.has("can not open /proc/self/mem [5(")) << "a read error is no end";
    // A default that cannot be read: it left an empty file, that is, settings without streams.
    faults::only_on("");
    faults::fail(faults::READ, 1, EIO, faults::FOREVER);
    EXPECT_TRUE(refused("2") && faults::hit(faults::READ));
    EXPECT_FALSE(root.exists("kest_modem.conf"));
    faults::reset();
    // An empty file that was there before is no copy, though it could not be opened at first.
    root.write_file("kest_modem.conf", "");
    unlink(root.path("system/etc/kest_modem.conf").c_str());
    faults::only_on(file.c_str());
    faults::fail(faults::OPEN, 1, EMFILE, 2);
    LogConfig config(file.c_str());
    EXPECT_EQ(read(config), 0);
    EXPECT_TRUE(root.exists("kest_modem.conf") && faults::hit(faults::OPEN));
}

}  // namespace
