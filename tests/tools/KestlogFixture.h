// SPDX-License-Identifier: Apache-2.0
// The real kestlog in a root of its own, and trees for it. Names of the simulated handset are
// hidden by these, so they are each test file's own.
#ifndef TESTS_TOOLS_KESTLOGFIXTURE_H_
#define TESTS_TOOLS_KESTLOGFIXTURE_H_

#include <fcntl.h>
#include <sys/stat.h>
#include <sys/wait.h>

#include "support/TestRoot.h"
#include "support/wire.h"

namespace {

const std::string SET = "modem_log/2016-03-01-09-15-00/";
const std::string STAMP = "2016-03-01_09-15-00";
const std::string WCN = SET + "cp_wcn/";
const std::string DSP = SET + "agdsp/";
const std::string MODEM = SET + "cp_wcdma/";
const std::string WCN_LOG = WCN + "0-cp_wcn-" + STAMP + ".log";
const std::string DSP_LOG = DSP + "0-agdsp-" + STAMP + ".log";
const std::string OLD_DSP_LOG = DSP + "1-agdsp-2016-03-01_09-00-00.log";
const std::string MODEM_LOG = MODEM + "0-cp_wcdma-" + STAMP + ".log";
const std::string MODEM_DUMP = MODEM + "cp_wcdma_memory_" + STAMP + ".dmp";

inline std::string frame(const std::string& payload, int type = 0x9d, int sub_type = 1) {
    return ::frame(type, sub_type, payload);
}

// 2016-03-01 01:15:00 UTC, in a zone of 8 hours. The CP's time has the bytes of frames.
const std::string TIME_RECORD("\x78\x56\x34\x12\x94\x5d\xd5\x56\x7e\1\x7e\3\4\5\x7d\xff", 16);

inline std::string altered(std::string text, size_t pos, char byte) {
    text[pos] = byte;
    return text;
}

const std::string DUMP_END = frame("\nmodem_memdump_finish", 1, 2);
const std::string LOG_DATA = pattern_bytes(1000, 1);
const std::string THREE_CHUNKS =
    chunk(7, LOG, "log~~~~") + chunk(8, PCM, "") + chunk(9, DUMP, LOG_DATA);

class KestlogTest : public ::testing::Test {
protected:
    // Runs it; output in m_out and m_err. The arguments go through a shell in the root.
    int run(const std::string& args, const std::string& program = "'" KESTLOG "'") {
        const std::string line = "cd " + m_root.root() + " && " + program + " " + args + " >" +
                                 m_root.path("out") + " 2>" + m_root.path("err");
        const int status = system(line.c_str());
        m_out = m_root.read_file("out");
        m_err = m_root.read_file("err");
        return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
    }
    // A command of the shell in the root; its status.
    int sh(const std::string& command) const {
        return system(("cd " + m_root.root() + "; " + command).c_str());
    }
    bool said(const std::string& part) const { return m_out.find(part) != std::string::npos; }

    void write(const std::string& rel, const std::string& content) {
        m_root.write_file(rel, content);
        const struct timespec old[2] = {{1456794900, 0}, {1456794900, 0}};
        EXPECT_EQ(utimensat(AT_FDCWD, m_root.path(rel).c_str(), old, 0), 0);
    }
    // A tree with every kind of file and nothing wrong.
    void write_good_tree() {
        write(MODEM_LOG, TIME_RECORD + frame("a\x7e") + frame(std::string(60000, '}')));
        write(MODEM + "1-cp_wcdma-2016-03-01_09-00-00.log", TIME_RECORD + LOG_DATA);
        write(MODEM_DUMP, frame(LOG_DATA) + frame("") + DUMP_END);
        write(MODEM + "cp_wcdma.version", "baseband 1");
        for (const char* head :
             {"cp_wcdma_ringbuf_", "cp_wcdma_sleeplog_", "smsg_", "sbuf_", "sblock_"}) {
            write(MODEM + head + STAMP + ".log", "x");
        }
        write(MODEM + "cp_wcdma_memory_" + STAMP + ".mem", "x");
        write(MODEM + "cp_wcdma_wiq_" + STAMP + ".bin", "iqiq");
        write(MODEM + "mini_dump_" + STAMP + ".bin", "x");
        write(WCN_LOG, LOG_DATA);
        write(WCN + "cp_wcn_memory_" + STAMP + ".dmp", LOG_DATA);
        write(DSP_LOG, THREE_CHUNKS);
        write(OLD_DSP_LOG, TIME_RECORD + chunk(6, LOG, LOG_DATA));
        write("modem_log/modem_db.gz", LOG_DATA);
        write("modem_log/sha1.txt", "0123456789ABCDEF0123456789ABCDEF01234567");
    }

    TestRoot m_root;
    std::string m_out, m_err;
};

}  // namespace

#endif  // TESTS_TOOLS_KESTLOGFIXTURE_H_
