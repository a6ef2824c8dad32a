// SPDX-License-Identifier: Apache-2.0
// A card that somebody made to harm its reader, through every command of the real kestlog.
#include <deque>
#include <filesystem>
#include <nlohmann/json.hpp>
#include <sstream>

#include "sim/files.h"
#include "tools/KestlogFixture.h"

namespace {

const std::string BAD = "modem_log/2016-04-01-00-00-00/";
const std::string NAMES[] = {"<script>alert(1)",
                             "a\nb\r",
                             "\x1b[2J\x1b]0;x\a",
                             "\xff\xc3(",
                             "--output",
                             std::string(255, 'x'),
                             "4294967295-cp_wcn-9999-99-99_99-99-99.log",
                             "4294967295-cp_wcn-9999-12-31_23-59-59.log"};
// The card in a tar, and entries that no directory has in that and in a zip.
constexpr char PACK[] = R"(
import tarfile, zipfile
tar, zip = tarfile.open('bad.tar', 'w'), zipfile.ZipFile('bad.zip', 'w')
tar.add('modem_log/', 'modem_log')
for name, kind in [('/abs', '0'), ('../up', '0'), ('modem_log/dev', '3'), ('modem_log/link', '2'),
                   ('modem_log/hard', '1'), ('modem_log/2016-03-01-09-15-00/cp_wcn/\x1b', '0')] * 2:
    entry = tarfile.TarInfo(name)
    entry.type, entry.linkname = kind.encode(), '/etc/passwd'
    tar.addfile(entry)
    zip.writestr(name, 'x'))";

// Also in a pipe its status is known.
const std::string WATCHED =
    "kestlog() { '" KESTLOG "' \"$@\"; s=$?; echo $s >o/status; return $s; }; kestlog";

class HostileCard : public KestlogTest {
protected:
    const char* path(const std::string& rel) {
        return m_paths.emplace_back(m_root.path(rel)).c_str();
    }
    // Good sets among bad ones, on a file system that keeps any time where there is one.
    void SetUp() override {
        m_shm = make_temp_dir("/dev/shm", "kestlog-test");
        EXPECT_TRUE(m_shm.empty() || symlink(m_shm.c_str(), path("modem_log")) == 0);
        write_good_tree();
        std::string set = "modem_log/2016-03-02-00-00-00/";
        const std::vector<std::string> good = m_root.tree(SET);
        for (const std::string& content : {std::string(), LOG_DATA, std::string(64, '~')}) {
            for (const std::string& name : good) {
                write(set + name, content);
            }
            ++set[set.find("-00-") - 1];
        }
        for (const std::string& name : NAMES) {
            write(BAD + "cp_wcn/" + name, frame(name));
            write(BAD + "agdsp/" + name, THREE_CHUNKS);
            write("modem_log/" + name + "/file", "x");
        }
        const std::string logs = BAD + "cp_wcn/2-cp_wcn-2016-03-01_09-00-0";
        const struct timespec ages[] = {{INT64_MIN, 0}, {INT64_MIN, 0}};
        for (const std::string& file :
             {BAD + "cp_wcdma/cp_wcdma_memory_" + STAMP + ".dmp", logs + "0.log"}) {
            write(file, frame("x"));
            EXPECT_EQ(utimensat(AT_FDCWD, path(file), ages, 0), 0);
        }
        EXPECT_EQ(mkfifo(path(logs + "3.log"), 0600) | mkfifo(path(WCN + "cp_wcn.version"), 0600) |
                      mknod(path(logs + "4.log"), S_IFSOCK | 0600, 0) |
                      symlink("/etc/passwd", path(logs + "5.log")) |
                      symlink("..", path(BAD + "cp_gnss")) |
                      symlink("/etc", path("modem_log/2016-04-02-00-00-00")),
                  0);
        write("pack.py", PACK);
        ASSERT_EQ(sh("python3 pack.py 2>/dev/null"), 0);
        for (const std::string& file : {logs + "6.log", logs + "7.log", BAD + "cp_3mode/x"}) {
            write(file, "x");
        }
        EXPECT_EQ(truncate(path(logs + "6.log"), 1 << 25), 0);
        EXPECT_EQ(chmod(path(logs + "7.log"), 0) | chmod(path(BAD + "cp_3mode"), 0), 0);
    }
    void TearDown() override {
        chmod(path(BAD + "cp_3mode"), 0700);
        std::filesystem::remove_all(m_shm.empty() ? m_root.root() : m_shm);
    }
    std::string m_shm;
    std::deque<std::string> m_paths;
};

TEST_F(HostileCard, HarmsNoCommandAndHidesNothing) {
    const int unread = geteuid() == 0 ? 0 : 2;  // whom permissions stop
    const std::string files = " modem_log/*/*/*";
    const std::string moved = "modem_log/2016-05-01-00-00-00";
    const struct {
        std::string args;
        int status;
        std::string file, part;  // the file has this of what the good files hold
    } CASES[] = {
        {"ls modem_log", unread, "out", "0-cp_wcn-" + STAMP + ".log\n"},
        {"verify modem_log", 3, "out", "files checked"},
        {"verify bad.tar", 3, "out", "/modem_log/link: damage: does not belong here\n"},
        {"verify - <bad.zip", 3, "err", "/../up: left out: its name leads out of the archive\n"},
        {"info" + files, 3, "out", "cp time         7e017e0304057dff\n"},
        {"frames" + files, 3, "out", "      7 bytes  log\n"},
        {"report modem_log -o o/html", 3, "o/html", "baseband 1"},
        {"bundle modem_log --crash '2016-03-01 09:15' -o o/tar", unread, "o/tar", LOG_DATA},
        {"join modem_log --cp cp_wcn -o o/join", 3, "o/join", LOG_DATA},
        {"extract modem_log -o o", 3, "o/cp_wcdma_memory_" + STAMP + ".bin", LOG_DATA},
        {"extract --type 0x9d -o o" + files, 3, "o/" + std::string(243, 'x') + ".type-9d.bin", "x"},
        {"split -o o " + BAD + "agdsp/x*", 0, "o/" + std::string(246, 'x') + ".dump.bin", LOG_DATA},
        {"sigmf --datatype ci8 --rate 1 --frequency 0 -o o/x " + BAD + "cp_wcn/a*", 0, "o/x",
         "a\\nb"},
        {"export modem_log --broken -o o/pcapng", 3, "o/pcapng", "set 2016-03-01-09-15-00"},
#ifdef KEST_WAV
        {"wav modem_log --rate 1 --channels 1 --format u8 -o o/wav", 3, "o/wav", "RIFF"},
#endif
        {"follow modem_log 2>o/err | (read l; mv " + BAD + " " + moved + "; head -4; mv " + moved +
             " " + BAD + ")",
         0, "out", "new set: 2016-05-01"},
    };
    for (const auto& c : CASES) {
        for (const std::string json : {"", "--json "}) {
            std::filesystem::remove_all(path("o"));
            m_root.make_dir("o");
            EXPECT_EQ(run(json + c.args, WATCHED), c.status) << json << c.args << "\n" << m_err;
            EXPECT_EQ(m_root.read_file("o/status"), std::to_string(c.status) + "\n") << c.args;
            const std::string text = m_out + m_err + m_root.read_file("o/err");
            EXPECT_EQ(text.find_first_of("\x1b\r\a\xff\xc3"), std::string::npos) << c.args;
            EXPECT_EQ(occurrences(text, "runtime error") + occurrences(text, "Sanitizer"), 0u);
            const std::string file = m_root.read_file(c.file);
            EXPECT_TRUE(!json.empty() || occurrences(file, c.part) > 0) << c.args;
            EXPECT_TRUE(!json.empty() || c.file != "o/html" || occurrences(file, NAMES[0]) == 0);
            EXPECT_FALSE(m_root.exists("up"));
            std::istringstream lines(json.empty() ? "" : m_out);
            for (std::string line; std::getline(lines, line);) {
                EXPECT_TRUE(nlohmann::json::accept(line)) << c.args << "\n" << line;
            }
        }
    }
}

}  // namespace
