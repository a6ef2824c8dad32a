// SPDX-License-Identifier: Apache-2.0
// Captures that the real kestlog writes, as tshark and capinfos read them with the dissector.

#include <algorithm>
#include <regex>

#include "tools/KestlogFixture.h"

namespace {

const std::string OLD_MODEM_LOG = MODEM + "1-cp_wcdma-2016-03-01_09-00-00.log";

std::string numbered(uint32_t seq, int type, int sub_type, const std::string& payload) {
    return ::frame(type, sub_type, payload, seq);
}

// A capture of the older form, with packets that kestlog does not write.
std::string pcap_of(const std::vector<std::string>& packets) {
    const uint32_t head[] = {0xa1b2c3d4, 0x40002, 0, 0, 65536, 147};
    std::string pcap(reinterpret_cast<const char*>(head), sizeof(head));
    for (const std::string& packet : packets) {
        const uint32_t len = static_cast<uint32_t>(packet.size());
        const uint32_t record[] = {0, 0, len, len};
        pcap += std::string(reinterpret_cast<const char*>(record), sizeof(record)) + packet;
    }
    return pcap;
}

class KestlogExportTest : public KestlogTest {
protected:
    void SetUp() override {
        write("p.lua", "print('runs')");  // not by every tshark for root
        if (shell("command -v capinfos >/dev/null && tshark -X lua_script:p.lua -v") != 0 ||
            m_out.rfind("runs\n", 0) != 0) {
            GTEST_SKIP() << "no tshark that runs scripts: " << m_err;
        }
    }
    // What tshark prints about the fields of a file's packets, or of what kestlog exports. The
    // dissector makes no error.
    std::string fields(const std::string& source, const std::string& names) {
        std::string file = source;
        if (source.compare(0, 7, "export ") == 0) {
            file = "read.pcapng";
            EXPECT_EQ(run(source + " --force -o " + file), m_status) << m_err;
        }
        const std::string args = std::regex_replace(" " + names + " _ws.lua.error _ws.malformed",
                                                    std::regex(" "), " -e ");
        EXPECT_EQ(
            shell("tshark -X lua_script:" KEST_SOURCE_DIR "/share/wireshark/kestdiag.lua -r " +
                  file + " -T fields -E separator='|'" + args),
            0)
            << m_err;
        const auto lines = static_cast<size_t>(std::count(m_out.begin(), m_out.end(), '\n'));
        EXPECT_EQ(occurrences(m_out, "||\n"), lines) << m_out;
        return std::regex_replace(m_out, std::regex(R"(\|\|\n)"), "\n");
    }
    int shell(const std::string& command) { return run("--version >/dev/null; " + command); }

    int m_status = 0;  // that the export is to have
};

TEST_F(KestlogExportTest, PacketsAreTheFramesAndChunksWithTheTimesOfTheirFiles) {
    const std::string third = numbered(3, 0x3b, 0x01, "goes on ~ in the next file");
    const std::string broken = altered(numbered(8, 1, 1, "too long"), 5, 99) + "~short~";
    write(OLD_MODEM_LOG, TIME_RECORD + numbered(1, 0x3a, 0x64, "one") + "junk!" +
                             numbered(2, 0x3a, 0, "") + third.substr(0, 20));
    write(MODEM_LOG, TIME_RECORD + third.substr(20) + numbered(7, 0x55, 0x66, "") + broken);
    write(MODEM + "cp_wcdma.version", "baseband 1\n");
    write(MODEM_DUMP, numbered(0, 1, 2, std::string(60000, '~')) + DUMP_END);
    write(MODEM + "mini_dump_" + STAMP + ".bin", "no frames");
    write(OLD_DSP_LOG, altered(THREE_CHUNKS, 27 + 5, 1));
    write("card/modem_log/2016-03-01-10-00-00/cp_wcdma/0-cp_wcdma-2016-03-01_10-00-00.log",
          numbered(1, 1, 1, ""));
    m_status = 3;  // of the audio DSP's log
    // 1456822800 is 09:00:00, 1456823700 is 09:15:00, 1456826400 is 10:00:00.
    EXPECT_EQ(fields("export . card",
                     "frame.time_epoch frame.interface_id frame.interface_queue kestdiag.seq "
                     "kestdiag.length kestdiag.type kestdiag.sub_type kestdiag.sub_name "
                     "kestdiag.payload_len kestdiag.expected_seq kestdiag.dump_end frame.comment"),
              "1456822800.000000000|0|0|7|15|0x9d|0x40|log|7|||"
              "1-agdsp-2016-03-01_09-00-00.log: time of its name\n"
              "1456822800.000000000|0|0|9|1008|0x9d|0x42|dump|1000|8||"
              "20 bytes before this packet are in no intact chunk; log files are missing after "
              "1-agdsp-2016-03-01_09-00-00.log: number 0 is missing\n"
              "1456823700.000000000|1|0|1|11|0x3a|0x64|data|3|||"
              "1-cp_wcdma-2016-03-01_09-00-00.log: time of its record\n"
              "1456823700.000000000|1|0|2|8|0x3a|0x00|request, or not supported|0|||"
              "5 bytes before this packet are in no intact frame\n"
              "1456823700.000000000|1|0|3|34|0x3b|0x01|end|26|||"
              "begins in 1-cp_wcdma-2016-03-01_09-00-00.log, ends in "
              "0-cp_wcdma-2016-03-01_09-15-00.log\n"
              "1456823700.000000000|1|0|7|8|0x55|0x66||0|4||"
              "0-cp_wcdma-2016-03-01_09-15-00.log: time of its record; 25 bytes at the end of "
              "0-cp_wcdma-2016-03-01_09-15-00.log are in no intact frame\n"
              "1456823700.000000000|1|1|0|60008|0x01|0x02||60000|||"
              "cp_wcdma_memory_2016-03-01_09-15-00.dmp: time of its name\n"
              "1456823700.000000000|1|1|0|29|0x01|0x02||21||1|end of the memory dump\n"
              "1456826400.000000000|2|0|1|8|0x01|0x01||0|||"
              "0-cp_wcdma-2016-03-01_10-00-00.log: time of its name\n");
    EXPECT_EQ(shell("capinfos read.pcapng"), 0);
    for (const char* part :
         {"Number of packets:   9\n", "Number of interfaces in file: 3\n", "USER 0",
          "File timestamp precision:  seconds (0)\n", "Packet size limit:   file hdr: (not set)\n",
          "Name = agdsp\n", "= set 2016-03-01-09-15-00 on ", ", firmware baseband 1\n",
          "= set 2016-03-01-10-00-00 on card\n"}) {
        EXPECT_TRUE(said(part)) << part << m_out;
    }

    // The report counts the same ones.
    EXPECT_EQ(run("report --json ."), 3);
    EXPECT_TRUE(said("\"payload\":29,\"other_bytes\":30,")) << m_out;

    // What holds the first bytes of packets only has no wrong length.
    EXPECT_EQ(shell("editcap -s 24 read.pcapng cut.pcapng"), 0);
    EXPECT_EQ(fields("cut.pcapng", "kestdiag.payload_len kestdiag.bad_length kestdiag.dump_end"),
              "7||\n1000||\n3||\n0||\n26||\n0||\n60000||\n21||1\n0||\n");

    // Less, and more, of it.
    m_status = 0;
    EXPECT_EQ(fields("export . --cp CP_WCDMA --type 0x3b", "kestdiag.seq kestdiag.payload"),
              "3|676f6573206f6e207e20696e20746865206e6578742066696c65\n");
    EXPECT_EQ(fields("export card --since 10:00", "kestdiag.seq"), "1\n");
    EXPECT_EQ(run("export card --type 9 -o none"), 2);
    EXPECT_TRUE(m_err == "kestlog: found nothing to export\n" && !m_root.exists("none")) << m_err;
    EXPECT_EQ(fields("export --broken " + MODEM_LOG,
                     "kestdiag.seq frame.interface_name kestdiag.length kestdiag.payload_len "
                     "kestdiag.bad_length kestdiag.short"),
              "7|cp_wcdma|8|0||\n8|cp_wcdma|99|8|1|\n|cp_wcdma||||1\n");
    // FILEs of one log are one, each once; what was not given is not missing.
    EXPECT_EQ(fields("export " + MODEM_LOG + " " + OLD_MODEM_LOG + " " + MODEM_LOG,
                     "frame.interface_id kestdiag.seq"),
              "0|1\n0|2\n0|3\n0|7\n");
    m_status = 3;
    EXPECT_EQ(fields("export " + OLD_DSP_LOG, "kestdiag.seq frame.comment"),
              "7|1-agdsp-2016-03-01_09-00-00.log: time of its name\n"
              "9|20 bytes before this packet are in no intact chunk\n");
    EXPECT_EQ(run("export --json --type 0x3a . -o new.pcapng"), 3);
    EXPECT_TRUE(
        said("{\"file\":\"new.pcapng\",\"interfaces\":2,\"files\":4,\"left_out\":2,"
             "\"packets\":2,\"broken\":0,\"other_bytes\":50}\n"))
        << m_out;
}

TEST_F(KestlogExportTest, WhatIsMissingStandsInTheLastComment) {
    write(WCN + "3-cp_wcn-2016-03-01_08-00-00.log", numbered(1, 1, 1, "") + "~cut");
    write(WCN_LOG, numbered(2, 1, 1, ""));
    write(MODEM_DUMP, numbered(1, 1, 1, ""));
    m_status = 3;
    EXPECT_EQ(
        fields("export .", "frame.comment"),
        "3-cp_wcn-2016-03-01_08-00-00.log: time of its name; 4 bytes at the end of "
        "3-cp_wcn-2016-03-01_08-00-00.log are in no intact frame; log files are missing after "
        "3-cp_wcn-2016-03-01_08-00-00.log: numbers 1 to 2 are missing\n"
        "0-cp_wcn-2016-03-01_09-15-00.log: time of its name\n"
        "cp_wcdma_memory_2016-03-01_09-15-00.dmp: time of its name; "
        "the memory dump ends without its end marker\n");

    // The halves of two frames around a file that cannot be read are no frame.
    const std::string frame = numbered(3, 1, 1, "half");
    write(WCN + "2-cp_wcn-2016-03-01_08-30-00.log", numbered(2, 1, 1, "") + frame.substr(0, 8));
    write(WCN + "1-cp_wcn-2016-03-01_09-00-00.log", frame);
    write(WCN_LOG, frame.substr(8) + numbered(4, 1, 1, ""));
    EXPECT_EQ(chmod(m_root.path(WCN + "1-cp_wcn-2016-03-01_09-00-00.log").c_str(), 0), 0);
    const char* const user =
        geteuid() ? "" : "setpriv --bounding-set -dac_override,-dac_read_search ";
    shell(std::string(user) + KESTLOG " export . --cp cp_wcn --since 08:30:01 -o halves");
    EXPECT_EQ(fields("halves", "kestdiag.seq frame.comment"),
              "2|2-cp_wcn-2016-03-01_08-30-00.log: time of its name; "
              "8 bytes at the end of 2-cp_wcn-2016-03-01_08-30-00.log are in no intact frame\n4|"
              "1-cp_wcn-2016-03-01_09-00-00.log could not be read: Permission denied; "
              "6 bytes before this packet are in no intact frame; "
              "0-cp_wcn-2016-03-01_09-15-00.log: time of its name\n");
}

TEST_F(KestlogExportTest, HostileNamesAndPacketsDoNoHarm) {
    const std::string dir = "c\x1b[2J\xff\n";
    write(dir + "/" + WCN_LOG, numbered(1, 1, 1, ""));
    write(dir + "/" + WCN + "cp_wcn.version", std::string(5000, '\xfe') + "\n");
    write(dir + "/x\x1b", chunk(1, LOG, ""));
    const std::string shown = R"(c\x1b[2J\xff\x0a)";
    std::string version;
    for (int i = 0; i < 92; ++i) {
        version += R"(\xfe)";
    }
    // tshark shows each backslash as two.
    const std::string want = "cp_wcn|set 2016-03-01-09-15-00 on " + shown + ", firmware " + version;
    EXPECT_EQ(fields("export '" + dir + "'", "frame.interface_name frame.interface_description"),
              want + "\n");
    // A file that was given is taken for what it holds. It tells no time.
    EXPECT_EQ(
        fields("export '" + dir + "/x\x1b'", "frame.time_epoch frame.interface_name frame.comment"),
        R"(0.000000000|x\x1b|x\x1b: time unknown)"
        "\n");

    std::vector<std::string> packets;
    const std::string good = chunk(1, PCM, "0123456789");
    for (size_t len = 0; len <= good.size(); ++len) {
        packets.push_back(good.substr(0, len));  // too short, in the header, in the data
        packets.push_back(altered(good, std::min(len, good.size() - 1), '\xff'));
    }
    write("hostile.pcap", pcap_of(packets));
    const std::string lines = fields("hostile.pcap",
                                     "kestdiag.short kestdiag.bad_length "
                                     "kestdiag.bad_checksum kestdiag.gap");
    EXPECT_EQ(occurrences(lines, "\n"), 62u);
    EXPECT_EQ(occurrences(lines, "1|||\n"), 8u);
    EXPECT_EQ(occurrences(lines, "||1|\n"), 2u) << lines;  // each byte of the checksum
}

TEST_F(KestlogExportTest, TheOutputIsRefusedOrGivenUpWithAReason) {
    write(WCN_LOG, numbered(1, 1, 1, ""));
    write("taken", "mine");
    const struct {
        const char* args;
        int status;
        const char* said;
    } CASES[] = {
        {"export . -o taken", 4, "use --force"},
        {"export . -o /dev/full", 4, "/dev/full: "},
        {"export . --cp cp_gnss -o new", 2, "no file with frames"},
        {"export . --type 256 -o new", 1, "a number from 0 to 255"},
        {"export nowhere -o new", 2, "nowhere: "},
        {"export taken -o new", 2, "kestlog: taken: no frames or chunks in it\n"},
    };
    for (const auto& c : CASES) {
        EXPECT_EQ(run(c.args), c.status) << c.args;
        EXPECT_NE(m_err.find(c.said), std::string::npos) << c.args << m_err;
    }
    EXPECT_FALSE(m_root.exists("new"));
    EXPECT_EQ(m_root.read_file("taken"), "mine");
}

}  // namespace
