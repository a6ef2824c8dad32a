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
constexpr uint8_t LAST = MODEM_IMAGE_LAST_ENTRY;
constexpr uint8_t HASHED = MODEM_IMAGE_HAS_SHA1;

std::string le32(uint32_t value) {
    std::string bytes;
    for (int shift = 0; shift < 32; shift += 8) {
        bytes += static_cast<char>(value >> shift);
    }
    return bytes;
}

std::string entry(uint8_t type, uint8_t flags, uint32_t offset, uint32_t size) {
    return std::string({static_cast<char>(type), static_cast<char>(flags), '?', '?'}) +
           le32(offset) + le32(size);
}

const std::string HEADER = "VHX1\x07\xff??????";

// An image whose payload, digest and database, lies at offset 1000.
std::string image(const std::string& entries, const std::string& payload) {
    std::string bytes = HEADER + entries;
    bytes.resize(1000, '.');
    return bytes + payload;
}

class ParsingLibTest : public FaultFixture {
protected:
    ParsingLibTest() {
        root.set_prop("ro.product.partitionpath", root.path("part/"));
        root.set_prop("persist.modem.w.nvp", "nv_w");
        root.write_file("part/nv_wmodem", good(db));
    }

    static std::string good(const std::string& content) {
        return image(entry(2, LAST | HASHED, 1000, static_cast<uint32_t>(content.size()) + 20),
                     DIGEST + content);
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

TEST_F(ParsingLibTest, FindsTheDatabaseWhereverItsEntryStands) {
    boot_modem(false);
    ASSERT_TRUE(write_log());
    expect_saved(db);
    // Entries of another type before it, with all flags but the last, and one of its own after.
    const std::string other = entry(3, 0xfe, 0xffffffff, 0xffffffff);
    remove_saved();
    root.write_file(
        "part/nv_wmodem",
        image(other + other + entry(2, HASHED, 1000, 21) + entry(2, 0xff, 0, 20), DIGEST + "z"));
    restart();
    expect_saved("z");
}

TEST_F(ParsingLibTest, TrustsNothingInAnImage) {
    boot_modem(false);
    ASSERT_TRUE(write_log());
    const std::string get = "get_modem_img(int, uint8_t*, size_t&, size_t&): ";
    const std::string payload = DIGEST + "database";
    const std::string outside = get + "MODEM image entry at 1000 size ";
    std::string endless = HEADER;
    for (int i = 0; i < 5000; ++i) {
        endless += entry(1, 0, 0, 0);
    }
    const uint32_t end = 1028;
    const struct {
        std::string bytes, message;
    } images[] = {
        {good("x").substr(0, 23), get + "MODEM image length less than two headers ["},
        {"VHX2" + good("x").substr(4), get + "MODEM image not VHX1 format ["},
        {image(entry(1, LAST, 0, 0) + entry(2, HASHED, 1000, 28), payload), ""},
        {HEADER + entry(1, 0, 0, 0) + "12345", get + "can not read more headers 5 ["},
        {endless, get + "MODEM image has more than 1024 headers ["},
        {image(entry(2, LAST, 1000, 28), payload), get + "MODEM image has no SHA-1 checksum ["},
        {image(entry(2, HASHED, 1000, 19), payload), outside + "19 is not within the image ["},
        {image(entry(2, HASHED, 1000, 29), payload), outside + "29 is not within the image ["},
        {image(entry(2, HASHED, 1000, 0xffffffff - 999), payload),
         outside + "4294966296 is not within the image ["},
        {image(entry(2, HASHED, end - 19, 20), payload), get + "read SHA-1 error 19 ["},
        {image(entry(2, HASHED, 0xffffffff - 19, 40), payload), get + "read SHA-1 error 0 ["},
    };
    for (const auto& i : images) {
        SCOPED_TRACE(i.message + " " + std::to_string(&i - images));
        remove_saved();
        root.write_file("part/nv_wmodem", i.bytes);
        restart();
        EXPECT_EQ(saved(DB) + saved(SHA1), "(none)(none)");
        EXPECT_TRUE(log.has(i.message)) << log.text();
        EXPECT_EQ(log.count(get), i.message.empty() ? 0u : 1u);
        EXPECT_EQ(log.count("save_log_parsing_lib(MediaStorage&): get MODEM image info error ["),
                  1u);
        EXPECT_GE(modem()->fd(), 0) << "logging goes on";
    }
    // Neither is what can be read, but not from the place wanted.
    const std::string bytes = good("x");
    int fds[2];
    ASSERT_EQ(pipe2(fds, O_CLOEXEC), 0);
    ASSERT_EQ(write(fds[1], bytes.data(), bytes.size()), static_cast<ssize_t>(bytes.size()));
    uint8_t hex[SHA1_HEX_LEN];
    size_t offset, size;
    EXPECT_EQ(WanModemLogHandler::get_modem_img(fds[0], hex, offset, size), -1);
    EXPECT_TRUE(log.has(get + "lseek MODEM image error [29(")) << log.text();
    close(fds[0]);
    close(fds[1]);
}

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
