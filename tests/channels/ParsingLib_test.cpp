// SPDX-License-Identifier: Apache-2.0
// The modem's log parsing database, taken from the firmware image to the log root.
#include <sys/resource.h>
#include <sys/wait.h>

#include "channels/ModemImage.h"
#include "channels/WanModemLogHandler.h"
#include "support/ServiceFixture.h"

namespace {

const char DB[] = "modem_db.gz";
const char SHA1[] = "sha1.txt";
const std::string DIGEST(
    "\x00\x12\x34\x56\x78\x9a\xbc\xde\xf0\xff\x00\x01\x02\x03\x0a\xa0\x7f\x80\x9f\xf9", 20);
const char HEX[] = "00123456789ABCDEF0FF000102030AA07F809FF9";

class ParsingLibTest : public FaultFixture {
protected:
    ParsingLibTest() {
        root.set_prop("ro.product.partitionpath", root.path("part/"));
        root.set_prop("persist.modem.w.nvp", "nv_w");
        root.write_file("part/nv_wmodem", good(db));
    }

    // An image with one entry, a digest and the database at offset 1000. Whatever else an image
    // may be is in tests/recordings/firmware_image.in.
    static std::string good(const std::string& content) {
        const uint32_t place[] = {1000, static_cast<uint32_t>(DIGEST.size() + content.size())};
        std::string bytes = "VHX1\x07\xff??????\x02\x05??";
        bytes.append(reinterpret_cast<const char*>(place), sizeof(place));
        bytes.resize(1000, '.');
        return bytes + DIGEST + content;
    }
    bool write_log() { return feed(gnss_dev, "x"); }
    // Starts the modem's channel anew.
    void restart() {
        log.clear();
        modem()->stop();
        EXPECT_EQ(modem()->start(), 0);
    }
    std::string saved(const std::string& name, const std::string& medium = "data") const {
        const std::string path = medium + "/modem_log/" + name;
        return root.exists(path) ? root.read_file(path) : "(none)";
    }
    void expect_saved(const std::string& content, const std::string& medium = "data") const {
        EXPECT_TRUE(saved(DB, medium) == content);
        EXPECT_EQ(saved(SHA1, medium), HEX);
    }
    void remove_saved(const std::string& medium = "data") const {
        remove_tree(medium + "/modem_log/" + DB);
        remove_tree(medium + "/modem_log/" + SHA1);
    }

    const std::string db = pattern_bytes(100001, 3);
};

// Every call fails once, the first write also in part, until none is left.
TEST_F(ParsingLibTest, AFailureLeavesNoHalfWrittenFile) {
    boot_modem(false);
    ASSERT_TRUE(write_log());
    const size_t descriptors = lasting_descriptors();
    const std::string zeros(40, '0');
    const auto attempt = [&](const std::function<void()>& arrange, faults::Call call) {
        root.write_file(std::string("data/modem_log/") + DB, "older");
        root.write_file(std::string("data/modem_log/") + SHA1, zeros);
        modem()->stop();
        arrange();
        EXPECT_EQ(modem()->start(), 0);
        const bool hit = faults::hit(call);
        faults::reset();
        if (saved(DB) == db) {
            expect_saved(db);
        } else {
            EXPECT_TRUE(saved(SHA1) == "(none)" || (saved(DB) == "older" && saved(SHA1) == zeros));
            EXPECT_TRUE(saved(DB) == "(none)" || saved(DB) == "older");
        }
        restart();
        expect_saved(db);
        return hit;
    };
    const struct {
        faults::Call call;
        int made;  // by one save
    } calls[] = {{faults::WRITE, 5}, {faults::OPEN, 3}, {faults::UNLINK, 3}};
    attempt([] { faults::shorten(faults::WRITE, 7); }, faults::WRITE);
    for (const auto& c : calls) {
        for (int nth = 1; nth <= c.made + 1; ++nth) {
            SCOPED_TRACE(std::to_string(c.call) + ", call " + std::to_string(nth));
            EXPECT_EQ(attempt([&] { faults::fail(c.call, nth, ENOSPC); }, c.call), nth <= c.made);
        }
    }
    EXPECT_EQ(lasting_descriptors(), descriptors);
}

TEST_F(ParsingLibTest, AnImageThatIsReadButNotFromThePlaceWantedIsNone) {
    const std::string bytes = good("x");
    int fds[2];
    ASSERT_EQ(pipe2(fds, O_CLOEXEC), 0);
    ASSERT_EQ(write(fds[1], bytes.data(), bytes.size()), static_cast<ssize_t>(bytes.size()));
    uint8_t hex[SHA1_HEX_LEN];
    size_t offset, size;
    EXPECT_EQ(WanModemLogHandler::get_modem_img(fds[0], hex, offset, size), -1);
    EXPECT_TRUE(log.has("size_t&, size_t&): lseek MODEM image error [29(")) << log.text();
    close(fds[0]);
    close(fds[1]);
}

TEST_F(ParsingLibTest, ADatabaseThatIs4GiBTooLongIsSavedAnew) {
    boot_modem(false);
    ASSERT_TRUE(write_log());
    const std::string path = root.path(std::string("data/modem_log/") + DB);
    ASSERT_EQ(truncate(path.c_str(), (off_t{4} << 30) + static_cast<off_t>(db.size())), 0);
    restart();
    struct stat st;
    ASSERT_EQ(stat(path.c_str(), &st), 0);
    ASSERT_EQ(st.st_size, static_cast<off_t>(db.size()));
    expect_saved(db);
}

TEST_F(ParsingLibTest, ASaveThatIsCutOffCountsAsNone) {
    // An image that ends before its database does.
    const int cut = open(root.path("part/nv_wmodem").c_str(), O_RDONLY | O_CLOEXEC);
    const auto* hex = reinterpret_cast<const uint8_t*>(HEX);
    EXPECT_LT(WanModemLogHandler::save_log_lib(root.path("db").c_str(), root.path("sha").c_str(),
                                               cut, 1020, db.size() + 1, hex),
              0);
    close(cut);
    EXPECT_FALSE(root.exists("db") || root.exists("sha"));
    // A kill leaves no digest beside another database.
    boot_modem(false);
    ASSERT_TRUE(write_log());
    root.write_file("part/nv_wmodem", good(db + "2"));
    modem()->stop();
    const pid_t pid = fork();
    if (pid == 0) {
        const struct rlimit size = {32768, 32768};  // killed by the second write
        setrlimit(RLIMIT_FSIZE, &size);
        modem()->start();
        _exit(0);
    }
    int status = 0;
    EXPECT_EQ(waitpid(pid, &status, 0), pid);
    EXPECT_EQ(status & 0x7f, SIGXFSZ);
    EXPECT_EQ(saved(SHA1), "(none)");
    EXPECT_EQ(saved(DB).size(), 32768u);
    restart();
    expect_saved(db + "2");
}

// Whatever somebody has put in the place of the files: it is not waited for, not followed
// and replaced, but for a directory.
TEST_F(ParsingLibTest, NothingButItsOwnFilesIsTakenForTheLibrary) {
    root.write_file("other", db);
    root.write_file("digest", HEX);
    boot_modem(false);
    ASSERT_TRUE(write_log());
    const auto link_to = [](const std::string& target) {
        return [target](const char* path) { return symlink(target.c_str(), path); };
    };
    const struct {
        const char* what;
        std::function<int(const char* path)> put;
    } strangers[] = {
        {"FIFO", [](const char* path) { return mkfifo(path, 0600); }},
        {"link to a database", link_to(root.path("other"))},
        {"link to a digest", link_to(root.path("digest"))},
    };
    for (const std::string name : {DB, SHA1}) {
        const std::string file = "data/modem_log/" + name;
        for (const auto& stranger : strangers) {
            SCOPED_TRACE(name + ": " + stranger.what);
            remove_tree(file);
            ASSERT_EQ(stranger.put(root.path(file).c_str()), 0);
            restart();
            EXPECT_TRUE(log.has(name + " is not a regular file [") || log.has(name + ") error ["));
            expect_saved(db);
            EXPECT_FALSE(std::filesystem::is_symlink(root.path(file)));
        }
        remove_tree(file);
        root.make_dir(file);
        restart();
        EXPECT_TRUE(log.has(name + " failed [21(Is a directory)]")) << log.text();
        remove_tree(file);
        restart();
    }
    EXPECT_TRUE(root.read_file("other") == db);
    EXPECT_EQ(root.read_file("digest"), HEX);
    // Nor is a card's log root that became a link.
    set_card(true);
    ASSERT_TRUE(write_log());
    const std::string away = root.path("away"), log_root = root.path("sd/modem_log");
    ASSERT_EQ(rename(log_root.c_str(), away.c_str()) + symlink(away.c_str(), log_root.c_str()), 0);
    root.write_file("away/" + std::string(DB), "another's");
    restart();
    EXPECT_EQ(saved(DB, "sd"), "another's");
}

TEST_F(ParsingLibTest, AnImageMustBeAFileWhosePathFits) {
    boot_modem(false);
    ASSERT_TRUE(write_log());
    remove_tree("part/nv_wmodem");
    ASSERT_EQ(mkfifo(root.path("part/nv_wmodem").c_str(), 0600), 0);
    restart();
    EXPECT_TRUE(log.has("save_log_parsing_lib(MediaStorage&): open MODEM image failed [22("));
    remove_saved();
    for (size_t len : {127u, 128u}) {
        const std::string value(len - root.path("part/modem").size(), 'n');
        root.set_prop("persist.modem.w.nvp", value);
        root.write_file("part/" + value + "modem", good(db));
        restart();
        EXPECT_EQ(saved(SHA1), HEX);
        EXPECT_EQ(log.has("is too long [36("), len == 128);
    }
}

TEST_F(ParsingLibTest, StaysCurrentOnBothMedia) {
    boot_modem(false);
    EXPECT_EQ(saved(DB), "(none)") << "no medium is in use yet";
    const auto card = [&](bool in) { return set_card(in), write_log(); };
    ASSERT_TRUE(card(false));
    expect_saved(db);
    // A new firmware before the change to the card.
    root.write_file("part/nv_wmodem", good("new"));
    ASSERT_TRUE(card(true));
    expect_saved("new", "sd");
    expect_saved(db);
    ASSERT_TRUE(card(false));
    expect_saved("new");
    // What has the same size and digest is current, a digest that is cut is none.
    for (size_t digits : {40u, 39u}) {
        root.write_file(std::string("data/modem_log/") + DB, "old");
        root.write_file(std::string("data/modem_log/") + SHA1, std::string(HEX, digits));
        restart();
        EXPECT_EQ(saved(DB), digits == 40 ? "old" : "new");
    }
    // Clearing the logs keeps the files; the next write looks again.
    remove_saved();
    EXPECT_EQ(ctrl->clear_log(), 0);
    ASSERT_TRUE(write_log());
    expect_saved("new");
}

}  // namespace
