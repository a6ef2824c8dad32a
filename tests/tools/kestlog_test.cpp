// SPDX-License-Identifier: Apache-2.0
// Runs the real kestlog over good trees and over a table of damages.
#include <limits.h>
#include <signal.h>
#include <string.h>

#include <algorithm>

#include "sim/FaultPlan.h"
#include "storage/CpDirectory.h"
#include "storage/LogFile.h"
#include "storage/MediaStorage.h"
#include "storage/StorageManager.h"
#include "tools/KestlogFixture.h"

namespace {

TEST_F(KestlogTest, AGoodTreeIsFineFromEveryDirectoryOfIt) {
    write_good_tree();
    for (const std::string& dir : {std::string("modem_log/"), SET, MODEM, WCN, std::string(".")}) {
        EXPECT_EQ(run("verify " + dir), 0) << m_out << m_err;
        EXPECT_TRUE(said(" files checked, 0 damages, 0 notes\n")) << m_out;
    }
    EXPECT_TRUE(said("18 files"));
    // A copied directory does not carry its own name any more.
    EXPECT_EQ(rename(m_root.path(WCN).c_str(), m_root.path("copy").c_str()), 0);
    EXPECT_EQ(run("verify copy"), 0) << m_out;
    EXPECT_EQ(run("ls nowhere"), 2);
    // What cannot be read of a directory is told.
    for (const faults::Call call : {faults::FSTATAT, faults::READDIR}) {
        const int plan[8] = {0, call, EIO, 2, INT_MAX};
        write("plan", std::string(reinterpret_cast<const char*>(plan), sizeof(FaultPlan)));
        EXPECT_EQ(
            run("--version; export ASAN_OPTIONS=verify_asan_link_order=0; " FAULT_PLAN_VARIABLE
                "=plan LD_PRELOAD='" KESTSIM_FAULTS "' '" KESTLOG "' ls copy"),
            2);
        EXPECT_EQ(occurrences(m_err, ": Input/output error\n"), 1u) << m_err;
    }
}

// A handset's root with both media, logs of the internal one from 09:00 to 09:20.
TEST_F(KestlogTest, SeveralRootsAreOneTreeThatTimesCut) {
    write("handset/data/" + MODEM + "1-cp_wcdma-2016-03-01_09-00-00.log", TIME_RECORD);
    write("handset/data/" + MODEM_LOG, TIME_RECORD);
    write("handset/data/" + MODEM + "cp_wcdma_memory_2016-03-01_09-20-00.mem", "x");
    write("handset/storage/sdcard0/modem_log/2016-03-01-08-00-00/cp_wcn/cp_wcn.version", "x");
    write("usb/kest/" + WCN + "0-cp_wcn-2016-02-29_23-59-59.log", "x");
    const struct {
        std::string args;
        std::vector<std::string> media;
        std::string files;
    } CASES[] = {
        {"handset", {"card", "internal"}, "4 files"},
        {"--card usb/kest/modem_log handset", {"card", "internal"}, "4 files"},
        {"--card usb.tar handset", {"card", "internal"}, "4 files"},
        {"handset usb", {"card", "internal", "usb"}, "5 files"},
        {"handset/data handset handset/data/modem_log", {"handset card", "data"}, "4 files"},
        {"handset --since 2016-03-01_09-15-01", {"card", "internal"}, "2 files"},
        {"handset --since 2016-03-01T09:15 --until '2016-03-01 09:16'",
         {"card", "internal"},
         "3 files"},
        {"handset --until 2016-02-29", {"card"}, "1 files"},
        {"handset --since 2016-03-01-09-15-00 --until 2016-03-01T09:15:00",
         {"card", "internal"},
         "3 files"},
        {"handset --since -10m --until -5m", {"card", "internal"}, "3 files"},
    };
    ASSERT_EQ(run("--version; tar cf usb.tar usb"), 0);
    for (const auto& c : CASES) {
        EXPECT_EQ(run("ls --json " + c.args), 0) << m_err;
        size_t at = 0;
        for (const std::string& medium : c.media) {
            at = m_out.find("\"medium\":\"" + medium + "\",\"cps\":", at);
            EXPECT_NE(at, std::string::npos) << c.args << " " << medium << "\n" << m_out;
        }
        EXPECT_EQ(occurrences(m_out, "\"cps\":"), c.media.size()) << c.args << m_out;
        EXPECT_EQ(run("verify " + c.args), 0) << m_err;
        EXPECT_TRUE(said(c.files + " checked, 0 damages, 0 notes")) << c.args << m_out;
    }
    EXPECT_EQ(run("verify handset handset/data/" + MODEM + " nowhere"), 2);
    EXPECT_TRUE(said("4 files"));
    EXPECT_EQ(run("ls " + ("usb/kest/" + WCN + " ") + "usb/kest/" + WCN), 0);
    EXPECT_EQ(occurrences(m_out, "files"), 2u) << m_out;
    // A link of a card may lead anywhere.
    ASSERT_EQ(sh("mkdir linked; ln -s ../usb/kest linked"), 0);
    EXPECT_EQ(run("verify linked"), 3);
    EXPECT_TRUE(said("linked/kest/modem_log: damage: does not belong here\n0 files")) << m_out;
    EXPECT_EQ(run("ls --since noon handset"), 1);
    EXPECT_EQ(run("ls --until 2015-02-29 handset"), 1);
}

TEST_F(KestlogTest, AnArchiveIsReadAsADirectoryAndLeavesNothingBehind) {
    write_good_tree();
    m_root.make_dir("temp");
    const std::string packers[] = {
        "tar cf a.tar modem_log",
        "tar cjf a.tbz2 -b 2048 modem_log",
        "mkdir DCIM && truncate -s 2M DCIM/x && tar czf a.tgz --transform 's,^,some/card/,' DCIM "
        "modem_log",
        "python3 -m zipfile -c a.zip modem_log",
        "truncate -s 500000 " + WCN_LOG + " && tar cSf a.cp.tar -C " + WCN + " .",
        "mkdir -p up/phone/data && cp -a modem_log up/phone/data && tar cf up.tar up",
        "python3 -c 'import tarfile; name = tarfile.TarInfo(\"modem_log/\" + \"x\" * 5000); "
        "name.type = tarfile.SYMTYPE; tarfile.open(\"name.tar\", \"w\").addfile(name)'"};
    for (const std::string& packer : packers) {
        ASSERT_EQ(sh(packer), 0) << packer;
    }
    setenv("TMPDIR", m_root.path("temp").c_str(), 1);
    for (const char* args : {"a.tar", "a.tbz2", "a.tgz", "a.zip", "- <a.tgz"}) {
        EXPECT_EQ(run(std::string("verify ") + args), 0) << args << m_err << m_out;
        EXPECT_TRUE(said("18 files checked, 0 damages, 0 notes\n")) << args;
    }
    EXPECT_EQ(run("frames a.tgz"), 2) << m_out;
    EXPECT_NE(m_err.find("kestlog: a.tgz: It is an archive; ls, "), std::string::npos) << m_err;
    EXPECT_EQ(run("ls --json a.cp.tar"), 0) << m_err;
    EXPECT_TRUE(said("\"medium\":\"a.cp.tar\",\"cp\":\"cp_wcn\",\"files\":2,\"size\":501000,"))
        << m_out;

    EXPECT_EQ(run("ls --json up.tar"), 0) << m_err;
    EXPECT_TRUE(said("\"medium\":\"internal\"")) << m_out;

    // An entry that is there twice is left out the second time, and what is cut off is told.
    ASSERT_EQ(sh("tar rf a.tar " + WCN_LOG + " && head -c -1000 a.tgz >short.tgz"), 0);
    EXPECT_EQ(run("verify a.tar"), 2);
    EXPECT_NE(m_err.find(WCN_LOG + ": left out: another entry has this name\n"), std::string::npos);
    EXPECT_TRUE(said("18 files checked, 0 damages")) << m_out;
    EXPECT_GE(run("verify short.tgz"), 2) << m_out;
    EXPECT_NE(m_err.find(": cut off: gzip: unexpected end of file\n"), std::string::npos) << m_err;
    // One bit of a checksum is wrong, or of what it is the sum of.
    std::string bytes = m_root.read_file("a.tgz");
    bytes[bytes.size() - 8] ^= 1;
    write("bad.tgz", bytes);
    bytes = m_root.read_file("a.tbz2");
    bytes[bytes.size() - 3] ^= 1;
    write("bad.tbz2", bytes);
    bytes = m_root.read_file("a.zip");
    write("short.zip", bytes.substr(0, bytes.find("PK\1\2")));
    bytes[bytes.find(LOG_DATA)] ^= 1;
    write("bad.zip", bytes);
    // One entry's header is wrong; the entry that it had twice is there once.
    bytes = m_root.read_file("a.tar");
    bytes[bytes.find(WCN_LOG)] ^= 1;
    write("bad.tar", bytes);
    const struct {
        std::string args, told;
    } DAMAGED[] = {
        {"bad.tgz", "kestlog: bad.tgz: gzip: incorrect data check\n"},
        {"- <bad.tgz", "kestlog: -: gzip: incorrect data check\n"},
        {"bad.tbz2", "kestlog: bad.tbz2: bzip decompression failed\n"},
        {"- <bad.tbz2", "kestlog: -: bzip decompression failed\n"},
        {"bad.zip", ".log: damaged: ZIP bad CRC"},
        {"short.zip", "kestlog: short.zip: damaged\n"},
        {"name.tar", "kestlog: name.tar/?: left out: its name is too long\n"},
        {"bad.tar", "bad.tar/?: left out: Damaged tar archive\n"},
    };
    for (const auto& c : DAMAGED) {
        EXPECT_EQ(run("verify " + c.args), 2) << c.args << m_out;
        EXPECT_NE(m_err.find(c.told), std::string::npos) << c.args << m_err;
        EXPECT_EQ(occurrences(m_err, "\n"), 1u) << c.args << m_err;
    }
    // What came before a fault of the disk counts. The end of a pseudo-terminal is such a fault.
    write("fails.py",
          "import os, pty, subprocess, sys, tty\n"
          "master, slave = pty.openpty()\n"
          "tty.setraw(slave)\n"
          "os.write(slave, subprocess.check_output(['tar', 'cz', '" +
              WCN +
              "']))\n"
              "os.close(slave)\n"
              "sys.exit(subprocess.call(['" KESTLOG "', 'verify', '-'], stdin=master))\n");
    EXPECT_EQ(run("fails.py", "python3"), 2);
    EXPECT_TRUE(said("2 files checked, 0 damages, 0 notes\n")) << m_out << m_err;
    EXPECT_EQ(m_err, "kestlog: -: Input/output error\n");
    EXPECT_EQ(run("ls --unpack-limit 1 a.tgz"), 0) << m_err;
    write(WCN + "big", std::string(1100000, 'x'));
    ASSERT_EQ(sh("tar cf big.tar modem_log && mkdir dirs && cd dirs && "
                 "seq -f modem_log/%g 256 | xargs mkdir -p && tar cf ../dirs.tar modem_log"),
              0);
    for (const std::string name : {"big.tar", "dirs.tar"}) {
        EXPECT_EQ(run("ls --unpack-limit 1 " + name), 2);
        EXPECT_NE(m_err.find("larger than the 1 MiB that it may take in"), std::string::npos)
            << name << m_err;
    }
    EXPECT_EQ(run("big.tar | (trap '' XFSZ; ulimit -f 1; '" KESTLOG "' export -)", "cat"), 2);
    EXPECT_NE(m_err.find("-: cannot be copied to " + m_root.path("temp") + ": File too large\n"),
              std::string::npos)
        << m_err;
    // Without a place to unpack it an archive is no file either.
    for (const std::string root : {"big.tar a.zip", "- <big.tar"}) {
        EXPECT_EQ(run("export -o none " + root, "TMPDIR=/nowhere '" KESTLOG "'"), 2);
        EXPECT_EQ(occurrences(m_err, ": cannot be unpacked in /nowhere: No such file"),
                  root[0] == '-' ? 1u : 2u)
            << m_err;
        EXPECT_FALSE(m_root.exists("none"));
    }
    EXPECT_TRUE(m_root.list("temp").empty());

    // It waits for an archive from a pipe when it is ended.
    ASSERT_EQ(mkfifo(m_root.path("pipe").c_str(), 0600), 0);
    for (const std::string signal : {"INT", "TERM", "KILL"}) {
        const std::string script =
            "env --default-signal=INT '" KESTLOG
            "' ls - <>pipe & "
            "timeout 60 sh -c 'until ls temp | grep -q kestlog; do :; done'; kill -" +
            signal + " $!";
        EXPECT_EQ(sh(script), 0);
        EXPECT_TRUE(wait_until([&] { return m_root.list("temp").empty(); })) << signal;
    }
    unsetenv("TMPDIR");
}

TEST_F(KestlogTest, EveryDamageIsFoundAndNothingElse) {
    const std::string good = THREE_CHUNKS;
    const struct {
        std::string file, content;  // replaces or joins those of the good tree
        const char* code;
        bool damage;
        int offset;  // of the finding
    } CASES[] = {
        {"modem_log/2016-3-1/x", "", "name", true, -1},
        {"modem_log/2016-13-01-00-00-00/x", "", "name", true, -1},
        {SET + "junk", "", "name", true, -1},
        {WCN + "sub/x", "", "name", true, -1},
        {WCN + "01-cp_wcn-2016-02-01_00-00-00.log", "x", "name", true, -1},
        {WCN + "1-cp_gnss-2016-02-01_00-00-00.log", "x", "name", true, -1},
        {WCN + "1-cp_wcn-2016-02-01_24-00-00.log", "x", "name", true, -1},
        {WCN + "x\x1b[2J\"\xff", "x", "name", true, -1},
        {WCN + "0-cp_wcn-" + STAMP + ".log.bak", "x", "name", true, -1},
        {WCN + "0-cp_wcn-" + STAMP + "-01.log", "x", "name", true, -1},
        {WCN + "0-cp_wcn-" + STAMP + "-1.log", "x", "double", false, -1},
        {"modem_log/System Volume Information/x", "x", "foreign", false, -1},
        {SET + ".DS_Store", "x", "foreign", false, -1},
        {WCN + "._0-cp_wcn-" + STAMP + ".log", "x", "foreign", false, -1},
        {WCN + "THUMBS.DB", "x", "foreign", false, -1},
        {SET + "LOST.DIR/x", "x", "foreign", false, -1},
        {WCN + "desktop.ini", "x", "foreign", false, -1},
        {WCN + "0-cp_wcn-2016-03-01_09-15-01.log", "x", "double", true, -1},
        {WCN + "2-cp_wcn-2016-03-01_09-00-00.log", "x", "gap", false, -1},
        {WCN + "1-cp_wcn-2016-04-01_00-00-00.log", "x", "order", false, -1},
        {WCN_LOG, "", "empty", false, -1},
        {MODEM_LOG, frame("no record"), "record", false, -1},
        {MODEM_LOG, TIME_RECORD.substr(0, 15), "record", true, 0},
        {MODEM_DUMP, frame(LOG_DATA), "end", true, -1},
        {MODEM_DUMP, frame("x") + altered(frame("\x55"), 9, 0x7e) + DUMP_END, "frame", true, 11},
        {MODEM_DUMP, frame("x") + "~" + std::string(70000, 'A') + DUMP_END, "frame", true, 11},
        {MODEM_DUMP, frame("x") + "between" + DUMP_END, "frame", false, -1},
        {DSP_LOG, altered(good, 2, 0), "chunk", true, 0},
        {DSP_LOG, altered(good, 4, 0x18), "chunk", true, 0},
        {DSP_LOG, altered(good, 27 + 16, 9), "chunk", true, 27},
        {DSP_LOG, altered(good, 27 + 19, 0x41), "chunk", true, 27},
        {DSP_LOG, good.substr(1), "chunk", true, 0},
        {DSP_LOG, good + "tail", "chunk", true, 1067},
        {DSP_LOG, good + good.substr(0, 27), "sequence", false, 1067},
        {DSP_LOG, good.substr(0, 1000), "cut", false, 47},
        {OLD_DSP_LOG, chunk(6, LOG, LOG_DATA) + "~~~~", "cut", true, 1020},
        {OLD_DSP_LOG, chunk(5, LOG, "the other lacks the next"), "sequence", false, 0},
        {MODEM + "cp_wcdma.version", std::string(92, 'v'), "version", true, -1},
        {"modem_log/sha1.txt", "0123456789abcdef0123456789ABCDEF01234567", "digest", true, -1},
    };
    for (const auto& c : CASES) {
        write_good_tree();
        const bool replaced = m_root.exists(c.file);
        write(c.file, c.content);
        const std::string label = c.file + " " + c.code + "\n";
        EXPECT_EQ(run("--json verify ."), c.damage ? 3 : 0) << label << m_out;
        const size_t at = m_out.find(std::string("{\"damage\":") + (c.damage ? "true" : "false") +
                                     ",\"code\":\"" + c.code + "\",");
        ASSERT_NE(at, std::string::npos) << label << m_out;
        const std::string offset = ",\"offset\":" + std::to_string(c.offset) + ",";
        EXPECT_EQ(m_out.find(offset, at) != std::string::npos, c.offset >= 0) << label << m_out;
        EXPECT_EQ(m_out.find('\x1b'), std::string::npos);
        // Alone, but that a lost chunk also leaves a gap in the sequence.
        const bool lost = c.code == std::string("chunk") && c.offset < 1067;
        EXPECT_EQ(std::count(m_out.begin(), m_out.end(), '\n'), lost ? 3 : 2) << m_out;
        EXPECT_EQ(run("info '" + c.file + "'"), c.damage && replaced ? 3 : 0) << label << m_err;
        unlink(m_root.path(c.file).c_str());
        rmdir(m_root.path(c.file.substr(0, c.file.rfind('/'))).c_str());
    }
    write_good_tree();
    // What one command takes for a log file the other does too.
    write(WCN + "2-cp_wcn-2016-03-01_09-00-00.log", "x");
    write(WCN + "6-cp_wcn-2016-03-01_08-00-00-2.log", "x");
    write(WCN + "1-cp_wcn-2016-03-01_09-00-00.log~", "x");
    EXPECT_EQ(run("verify " + WCN), 3);
    EXPECT_TRUE(said("note: number 1 is missing\n") && said("note: numbers 3 to 5 are missing\n"));
    EXPECT_EQ(run("ls --json " + WCN), 0);
    EXPECT_TRUE(said("-00-2.log\",\"kind\":\"log\",\"number\":6,")) << m_out;
    EXPECT_TRUE(said(".log~\",\"kind\":\"unknown\",\"size\"")) << m_out;
    for (const char* name :
         {"2-cp_wcn-2016-03-01_09-00-00.log", "6-cp_wcn-2016-03-01_08-00-00-2.log",
          "1-cp_wcn-2016-03-01_09-00-00.log~"}) {
        unlink(m_root.path(WCN + name).c_str());
    }
    m_root.write_file(MODEM_DUMP, frame("in progress"));  // just now
    write("modem_log/.write_test", "");
    ASSERT_EQ(symlink("/dev/zero", m_root.path(WCN + "smsg_" + STAMP + ".log").c_str()), 0);
    EXPECT_EQ(run("verify ."), 3);
    for (const char* line : {".log: damage: does not belong here\n",
                             "note: dump still in progress\n", " 1 damages, 1 notes\n"}) {
        EXPECT_TRUE(said(line)) << line << m_out;
    }
}

TEST_F(KestlogTest, InfoAndFramesTellWhatTheFileHolds) {
    write_good_tree();
    EXPECT_EQ(run("info " + MODEM_LOG), 0) << m_err;
    for (const char* line :
         {"started         2016-03-01 09:15:00\n", "time record     2016-03-01 09:15:00\n",
          "cp time         7e017e0304057dff\n", "frames          2\n", "payload         60002\n"}) {
        EXPECT_TRUE(said(line)) << line << m_out;
    }
    EXPECT_EQ(run("info " + MODEM + "cp_wcdma.version"), 0) << m_err;
    EXPECT_EQ(m_out.find("bytes"), std::string::npos) << m_out;  // it holds no frames
    EXPECT_EQ(run("--json info " + DSP_LOG), 0) << m_err;
    EXPECT_TRUE(said("\"dump_bytes\":1000,\"sequence_gaps\":0,\"payload\":1007,")) << m_out;

    // Frames are found between anything, across every window, after a lost flag and what is too
    // long for a frame.
    std::string text = "tail of a frame\x7e" + frame("first") + "~junk~" + pattern_bytes(900000, 2);
    const std::string big(65527, '~');  // the largest
    text += "~" + std::string(70000, 'A') + frame(big, 3, 4);
    text += frame("lost").substr(1) + frame("last");
    write(WCN_LOG, text);
    EXPECT_EQ(run("frames " + WCN_LOG + " | grep -v wrong"), 0);
    const size_t at = text.find(frame(big, 3, 4).substr(0, 20));
    const std::string seq = "  seq 0          type ";
    for (const std::string& line :
         {"16" + seq + "0x9d 0x01      5 bytes\n",
          std::to_string(at) + seq + "0x03 0x04  65527 bytes\n",
          std::to_string(text.size() - frame("last").size()) + seq + "0x9d 0x01      4 bytes\n"}) {
        EXPECT_TRUE(said(line)) << line << m_out;
    }
    EXPECT_EQ(std::count(m_out.begin(), m_out.end(), '\n'), 3);
    EXPECT_EQ(run("--json frames " + DSP_LOG), 0);
    EXPECT_TRUE(said("\"len\":8,\"payload\":0,\"intact\":true,\"kind\":\"pcm\"}\n")) << m_out;
    // Who reads the output may stop: no word, and the end that the signal means.
    EXPECT_EQ(sh("(trap '' PIPE; '" KESTLOG "' frames --hex " + WCN_LOG +
                 " 2>err; echo $? >status) | head -1 >out"),
              0);
    EXPECT_EQ(m_root.read_file("status"), std::to_string(128 + SIGPIPE) + "\n");
    EXPECT_EQ(m_root.read_file("err"), "");
}

TEST_F(KestlogTest, FramesStandInColumnsWhateverTheirNumbers) {
    std::string text, want;
    for (const uint32_t seq : {0u, 9u, 10u, 9999u, 10000u, 10200u, 999u, 123456789u, 4294967295u}) {
        const DiagFrame frame{seq, 0x9d, 1, std::vector<uint8_t>(seq % 20000)};
        char line[100];
        snprintf(line, sizeof(line), "%10zu  seq %-10u type 0x9d 0x01  %5zu bytes\n", text.size(),
                 seq, frame.payload.size());
        want += line;
        const std::vector<uint8_t> bytes = frame.encode();
        text.append(bytes.begin(), bytes.end());
    }
    write(WCN_LOG, text);
    EXPECT_EQ(run("frames " + WCN_LOG), 0) << m_err;
    EXPECT_EQ(m_out, want);
}

TEST_F(KestlogTest, FramesAreChosenOverFilesAndPipes) {
    write_good_tree();
    write(WCN_LOG, frame("one", 0x9d, 1) + frame("~two", 3, 1) + frame("three", 3, 2) + "~12~");
    write(WCN + "1-cp_wcn-2016-03-01_09-00-00.log", frame("zero", 3, 2));
    const std::string both = WCN + "1-cp_wcn-2016-03-01_09-00-00.log " + WCN_LOG;
    const struct {
        std::string args;
        std::vector<std::string> payloads;  // their beginning as hexadecimal text
    } CASES[] = {
        {WCN_LOG, {"6f6e65", "7e74776f", "7468726565", "3132"}},
        {"--type 0 " + both, {}},
        {"--sub-type 0 " + both, {}},
        {"--type 3 " + both, {"7a65726f", "7e74776f", "7468726565"}},
        {"--type 0x03 --sub-type 2 " + both, {"7a65726f", "7468726565"}},
        {"--limit 2 " + both, {"7a65726f", "6f6e65"}},
        {"--since 09:15 --until 2016-03-02 " + both,
         {"7a65726f", "6f6e65", "7e74776f", "7468726565", "3132"}},
        {"--until 09:14 " + both, {"7a65726f"}},
        {"--type 3 - <" + WCN_LOG, {"7e74776f", "7468726565"}},
    };
    for (const auto& c : CASES) {
        EXPECT_EQ(run("frames --json --hex " + c.args), 0) << m_err;
        size_t at = 0;
        for (const std::string& payload : c.payloads) {
            at = m_out.find("\"data\":\"" + payload + "\"", at);
            EXPECT_NE(at, std::string::npos) << c.args << "\n" << m_out;
        }
        EXPECT_EQ(occurrences(m_out, "\n"), c.payloads.size()) << c.args;
    }
    EXPECT_EQ(run("frames --hex " + both), 0);
    EXPECT_TRUE(said(WCN_LOG + ":\n"));
    EXPECT_TRUE(said("  no header                          2 bytes  wrong length\n")) << m_out;
    EXPECT_TRUE(said("\n    000000  7e 74 77 6f                                      ~two\n"));
    ASSERT_EQ(sh("cat " + DSP_LOG + " | ('" KESTLOG "' info - >o; cat " + DSP_LOG +
                 " | '" KESTLOG "' split -) >/dev/null"),
              0);
    EXPECT_NE(m_root.read_file("o").find("size            1067\n"), std::string::npos);
    EXPECT_EQ(m_root.read_file("stdin.dump.bin"), LOG_DATA);
    for (const std::string& args :
         {"extract -o x - <" + DSP_LOG,
          "--version; cat " + DSP_LOG + " | '" KESTLOG "' extract --force -o x -"}) {
        EXPECT_EQ(run(args), 0) << m_err;
        EXPECT_EQ(m_root.read_file("x/stdin.dump.bin"), LOG_DATA) << args;
    }
    EXPECT_EQ(run("export -o x/pcapng - ./" + DSP_LOG + " <" + DSP_LOG), 0) << m_err;
    EXPECT_TRUE(said(": 3 packets on 1 interfaces")) << m_out;
    EXPECT_EQ(run("sigmf --datatype ci8 --rate 1 --frequency 0 - <" + DSP_LOG), 1);
    EXPECT_EQ(run("frames --since 09:15 " + WCN_LOG + " gone"), 2);
    EXPECT_EQ(run("info " + both + " gone"), 2);
    EXPECT_EQ(occurrences(m_out, "kind            log\n"), 2u) << m_out;
}

TEST_F(KestlogTest, SplitSeparatesTheAudioDspsDataAroundDamage) {
    static const ChunkKind KINDS[] = {LOG, PCM, DUMP};
    std::string text, want[3];
    for (uint32_t seq = 0; seq < 60; ++seq) {
        const std::string data = pattern_bytes(seq * 500, seq) + "~~~~";
        text +=
            seq == 31 ? altered(chunk(seq, PCM, data), 9, 0) : chunk(seq * 2, KINDS[seq % 3], data);
        want[seq % 3] += seq == 31 ? "" : data;  // that one is lost
    }
    write(OLD_DSP_LOG, text);
    EXPECT_EQ(run("split --output to " + OLD_DSP_LOG), 3) << m_err;
    const std::string stem = "to/1-agdsp-2016-03-01_09-00-00.";
    EXPECT_EQ(m_root.read_file(stem + "log.bin"), want[0]);
    EXPECT_EQ(m_root.read_file(stem + "pcm.bin"), want[1]);
    EXPECT_EQ(m_root.read_file(stem + "dump.bin"), want[2]);
    EXPECT_TRUE(said("58 sequence gaps, 15524 other bytes\n")) << m_out;
    for (const char* args :
         {"split -o s ", "extract --type 0 -o s ", "frames ", "export -o s/e "}) {
        EXPECT_EQ(run(args + OLD_DSP_LOG), 3) << args;
        EXPECT_NE(m_err.find("damage: wrong chunk header: "), std::string::npos) << args << m_err;
    }
    EXPECT_EQ(run("verify modem_log"), 3);
    EXPECT_TRUE(said("1 files checked, 1 damages, 21 notes\n")) << m_out;

    // Nothing is replaced unasked; with --force a link is replaced, not followed.
    EXPECT_EQ(run("split --output=to " + OLD_DSP_LOG), 4);
    write("victim", "v");
    unlink(m_root.path(stem + "log.bin").c_str());
    EXPECT_EQ(symlink(m_root.path("victim").c_str(), m_root.path(stem + "log.bin").c_str()), 0);
    write(OLD_DSP_LOG, THREE_CHUNKS);
    EXPECT_EQ(run("--json split --force --output to " + OLD_DSP_LOG), 0) << m_err;
    EXPECT_EQ(m_root.read_file(stem + "log.bin"), "log~~~~");
    EXPECT_EQ(m_root.read_file("victim"), "v");
    // Nor is one output of a run by another.
    write("x/" + OLD_DSP_LOG, chunk(7, LOG, "x"));
    EXPECT_EQ(run("split --force --output to " + OLD_DSP_LOG + " x/" + OLD_DSP_LOG), 0) << m_err;
    EXPECT_EQ(m_root.read_file(stem + "log.bin"), "log~~~~");
    EXPECT_EQ(m_root.read_file(stem + "log-1.bin"), "x");
}

// What the service's own storage classes make, after rotation and trimming.
TEST_F(KestlogTest, TheServicesOwnTreeIsFineAndListed) {
    StorageManager manager;
    MediaStorage media(&manager);
    media.set_dirs(android::String8(m_root.path("data").c_str()), Links::REFUSE);
    ASSERT_EQ(media.stat(), 0);
    ASSERT_NE(media.create_cp_set(), nullptr);
    const android::String8 gnss("cp_gnss");
    bool is_new;
    for (int i = 0; i < 4; ++i) {
        if (CpDirectory* dir = media.get_cp_dir(gnss)) {
            dir->rotate_logs();
        }
        LogFile* const file = media.create_file(gnss, LT_LOG, is_new, android::String8());
        ASSERT_NE(file, nullptr);
        EXPECT_EQ(file->write(LOG_DATA.data(), 100), 100);
        file->close();
    }
    media.trim(100);
    EXPECT_EQ(run("verify data"), 0) << m_err;
    EXPECT_EQ(m_out, "3 files checked, 0 damages, 0 notes\n");
    write("data/modem_log/sha1.txt", "");
    EXPECT_EQ(run("ls data"), 0);
    EXPECT_EQ(m_out.find("           0  database digest  sha1.txt  on data\n2"), 0u) << m_out;
    EXPECT_TRUE(said("  cp_gnss                         300 bytes     3 files  2") &&
                said("  on data\n"))
        << m_out;
    EXPECT_EQ(run("ls --tree data"), 0);
    EXPECT_TRUE(said("\ndata\n`-- 2")) << m_out;
    EXPECT_TRUE(said("\n    `-- cp_gnss\n        |-- 2-cp_gnss-2")) << m_out;
    EXPECT_EQ(run("ls --json data//"), 0);
    EXPECT_TRUE(said("\"path\":\"data/modem_log/2")) << m_out;
    EXPECT_LT(m_out.find("\"kind\":\"log\",\"number\":2,"), m_out.find("\"number\":0,")) << m_out;
}

TEST_F(KestlogTest, WrongUsageAndCompletion) {
    for (const char* args :
         {"", "fly", "ls", "frames --type x a", "frames --limit -1 a", "ls ''", "--fly ls x",
          "ls --force x", "info --output d x", "info '--\x1b[31m'"}) {
        EXPECT_EQ(run(args), 1) << args;
        EXPECT_EQ(m_err.find('\x1b'), std::string::npos);
        EXPECT_NE(m_err.find("usage: kestlog "), std::string::npos) << m_err;
    }
    EXPECT_EQ(run("vrify ."), 1);
    EXPECT_NE(m_err.find("(did you mean 'verify'?)"), std::string::npos) << m_err;
    EXPECT_EQ(run("--complete --json info --"), 0);
    EXPECT_EQ(m_out, "--help\n--json\n--version\n");
    std::string words;
    for (const std::string line :
         {"join --kind P", "report --iq-format = cf3", "--pcm-format s24", "--datatype ri8"}) {
        EXPECT_EQ(run("--complete " + line), 0);
        words += m_out;
    }
    EXPECT_EQ(words, "pcm\ncf32_le\ncf32_be\ns24le\ns24be\nri8\n");
}

}  // namespace
