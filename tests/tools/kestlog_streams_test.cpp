// SPDX-License-Identifier: Apache-2.0
// What kestlog takes out of log trees: streams, memory images, sound and I/Q captures.
#include <signal.h>

#include <filesystem>
#include <nlohmann/json.hpp>

#include "tools/KestlogFixture.h"

namespace {

using Json = nlohmann::ordered_json;

class KestlogStreamsTest : public KestlogTest {
protected:
    bool complained(const std::string& part) const { return m_err.find(part) != std::string::npos; }

    void write_log(const std::string& set, const std::string& cp, int number,
                   const std::string& time, const std::string& content) {
        write(set + cp + "/" + std::to_string(number) + "-" + cp + "-2016-03-01_" + time + ".log",
              content);
    }
};

const std::string INTERNAL = "data/modem_log/2016-03-01-09-00-00/";
const std::string CARD_SET = "storage/sdcard0/modem_log/2016-03-01-10-00-00/";
const std::string OTHER_SET = "other/data/modem_log/2016-03-01-09-30-00/";

// Both media, a record in each file, fed in pieces that end anywhere.
TEST_F(KestlogStreamsTest, JoinGivesWhatWasFed) {
    const std::string fed = pattern_bytes(700000, 3);
    write_log(INTERNAL, "cp_wcdma", 12, "09:00:00", "x");  // no name of the service
    write_log(INTERNAL, "cp_wcdma", 12, "09-00-00", TIME_RECORD + fed.substr(0, 300001));
    write_log(INTERNAL, "cp_wcdma", 11, "09-10-00", TIME_RECORD + fed.substr(300001, 1));
    write_log(INTERNAL, "cp_wcdma", 10, "09-20-00", TIME_RECORD);
    for (int number = 9; number > 0; --number) {
        write_log(INTERNAL, "cp_wcdma", number, "09-20-0" + std::to_string(10 - number), "");
    }
    write_log(INTERNAL, "cp_wcdma", 0, "09-30-00", fed.substr(300002, 5));
    write_log(CARD_SET, "cp_wcdma", 0, "10-00-00", TIME_RECORD + fed.substr(300007));

    EXPECT_EQ(run("join ."), 0) << m_err;
    EXPECT_EQ(m_out, fed);
    EXPECT_EQ(m_err, "");
    EXPECT_EQ(run("join . | cat"), 0);
    EXPECT_EQ(m_out, fed);
    EXPECT_EQ(run("join . --records --since 10:00"), 0);
    EXPECT_EQ(m_out, TIME_RECORD + fed.substr(300007));
    EXPECT_EQ(run("join . --json -o all --until 09:30"), 0) << m_err;
    EXPECT_EQ(m_root.read_file("all"), fed.substr(0, 300007));
    EXPECT_EQ(Json::parse(m_out), Json::parse(R"({"cp":"cp_wcdma","output":"all","files":13,
        "left_out":0,"bytes":300007,"damages":0,"notes":0})"));

    EXPECT_EQ(run("frames " + INTERNAL + "*/*_09-[012]0-00.log --since 09:19"), 0) << m_err;
    EXPECT_TRUE(said("/11-cp_wcdma-") && !said("/12-")) << m_out;

    // Nothing is replaced unasked, and nothing but the file is left.
    EXPECT_EQ(run("join . -o all"), 4);
    EXPECT_TRUE(complained("kestlog: all: File exists; use --force to replace it\n")) << m_err;
    EXPECT_EQ(run("join . -o all --force"), 0) << m_err;
    EXPECT_EQ(m_out, "all: cp_wcdma, 14 files, 700000 bytes\n");
    EXPECT_EQ(m_root.read_file("all"), fed);
    EXPECT_EQ(run("join . -o data --force"), 4);
    ASSERT_EQ(sh("python3 -c 'import socket; socket.socket(socket.AF_UNIX).bind(\"socket\")'"), 0);
    EXPECT_EQ(run("join . -o socket --force"), 4);
    EXPECT_NE(sh("ulimit -c 0; ulimit -f 8; '" KESTLOG "' join . -o cut"), 0);
    EXPECT_EQ(run("join . -o /dev/full"), 4);
    EXPECT_TRUE(m_root.find(".kestlog-").empty());

    write_log(CARD_SET, "cp_gnss", 0, "10-00-00", "gnss");
    EXPECT_EQ(run("join ."), 1);
    EXPECT_TRUE(complained("choose one with --cp: cp_gnss, cp_wcdma\n")) << m_err;
    EXPECT_EQ(run("join . --cp CP_GNSS"), 0);
    EXPECT_EQ(m_out, "gnss");
    EXPECT_EQ(run("join . --cp cp_wcn"), 2);
    EXPECT_EQ(run("join . --cp cp_gnss --kind pcm"), 1);
    EXPECT_EQ(run("join . --cp cp_gnss --until 2015-01-01"), 2);
    EXPECT_EQ(m_err, "kestlog: no log files of that time\n");
}

TEST_F(KestlogStreamsTest, JoinTellsWhatIsMissingDoubledOrCut) {
    const std::string three = chunk(5, LOG, "one") + chunk(6, PCM, "two") + chunk(7, DUMP, "3");
    std::string gaps;
    for (uint32_t i = 0; i < 23; ++i) {
        gaps += chunk(2 * i, LOG, "");
    }
    struct Log {
        std::string set;
        int number;
        std::string time, content;
    };
    const auto in = [](int number, const char* time, const std::string& content) {
        return Log{INTERNAL, number, time, content};
    };
    const auto on_card = [](int number, const std::string& content) {
        return Log{CARD_SET, number, "10-00-00", content};
    };
    const auto copied = [](const std::string& content) {
        return Log{"copy/modem_log/2016-03-01-09-00-00/", 0, "09-00-00", content};
    };
    // Files of one start, as in a CP that logs fast, down to number 0.
    const auto at_once = [&](const std::vector<std::string>& set,
                             const std::vector<std::string>& copy) {
        std::vector<Log> logs;
        for (size_t i = 0; i < set.size() + copy.size(); ++i) {
            const bool in_set = i < set.size();
            logs.push_back(in_set ? in(0, "09-00-00", set[i]) : copied(copy[i - set.size()]));
            logs.back().number =
                static_cast<int>((in_set ? set.size() : set.size() + copy.size()) - 1 - i);
        }
        return logs;
    };
    const std::vector<std::string> many(40, "a"), less(39, "a"), other(40, "x");
    const struct {
        std::string cp;
        std::vector<Log> logs;
        std::string args;
        int status;
        std::string stream, words;
    } CASES[] = {
        // clang-format off
        {"cp_wcn", {in(5, "09-00-00", "a"), in(2, "09-20-00", "b"), in(1, "09-30-00", "c"), in(0, "09-40-00", "d")},
         "", 3, "abcd", "-00-00.log: damage: after it numbers 3 to 4 are missing\n"},
        // What --until cuts off is not missing, what --since leaves is.
        {"cp_wcn", {in(2, "09-00-00", "a"), in(0, "09-20-00", "b")}, "--until 09:10", 0, "a", ""},
        // The oldest files are trimmed in each set; only the last file may lack a newer one.
        {"cp_wcn", {in(1, "09-00-00", "a"), on_card(4, "b")},
         "", 3, "ab", "09-00-00.log: damage: after it number 0 is missing\n"},
        {"cp_wcn", {on_card(1, "b")}, "", 0, "b", "10-00-00.log: note: after it number 0 is missing\n"},
        {"cp_wcn", {in(0, "09-00-00", "a"), in(0, "09-00-00-1", "b")},
         "", 0, "ba", "09-00-00-1.log: note: two log files with this number\n"},
        {"cp_wcn", {in(0, "09-00-00", ""), in(0, "09-00-00-1", "")}, "", 0, "", "note: two log files "},
        {"cp_wcn", {in(1, "09-00-00", "a"), in(1, "09-00-00-1", "a"), in(0, "09-10-00", "b")}, "", 3, "ab",
         "00-1.log: damage: a copy of ./" + INTERNAL + "cp_wcn/1-cp_wcn-2016-03-01_09-00-00.log; left out\n"},
        {"cp_wcn", {in(0, "09-00-00", "a"), in(0, "09-20-00", "b")},
         "", 3, "ab", "damage: two log files with this number\n"},
        // A file that was set aside ends where the next one of its number begins.
        {"cp_wcn", {in(1, "09-00-00-1", "a"), in(1, "09-05-00", "b"), in(0, "09-10-00", "c")}, "--since 09:05:30", 0, "bc", ""},
        // Copied while it grew, and before it was renumbered.
        {"cp_wcn", {in(1, "09-00-00", "abc"), in(0, "09-20-00", "d"), copied("ab")}, "", 3, "abcd",
         "copy/modem_log/2016-03-01-09-00-00/cp_wcn/0-cp_wcn-2016-03-01_09-00-00.log: damage: the beginning of "
         "./data/modem_log/2016-03-01-09-00-00/cp_wcn/1-cp_wcn-2016-03-01_09-00-00.log; left out\n"},
        {"cp_wcn", {in(0, "09-00-00", "ab"), copied("ab")}, "", 3, "ab", "damage: a copy of "},
        {"cp_wcn", {in(0, "09-00-00", "ab"), copied("xyz")},
         "", 3, "abxyz", "damage: started at the same second as "},
        {"cp_gnss", at_once({"a", "bc"}, {"a", "bc"}), "", 3, "abc", "damage: a copy of "},
        {"cp_gnss", at_once({"a", "a"}, {"a"}), "", 3, "aa", "damage: a copy of "},
        {"cp_gnss", at_once({"", "ab"}, {"", "ab"}), "", 3, "ab", "damage: a copy of "},
        {"cp_gnss", at_once({"a", "ab"}, {"ab"}), "", 3, "aab", "damage: a copy of "},
        {"cp_gnss", at_once({"a", "bc"}, {"a", "bcd", "e"}), "", 3, "abcde", "damage: the beginning of "},
        {"cp_gnss", at_once({"a", "b"}, {"a", "x"}), "", 3, "abx", "damage: started at the same second as "},
        {"cp_gnss", at_once(many, less), "", 3, std::string(40, 'a'), "damage: a copy of "},
        {"cp_gnss", at_once(many, other), "", 3, std::string(40, 'a') + std::string(40, 'x'), "damage: started at "},
        {"cp_wcn", {in(0, "09-00-00", "a"), {"copy/modem_log/2016-03-01-09-30-00/", 0, "09-30-00", "b"}},
         "", 0, "ab", "09-30-00.log: note: from another ROOT than the one before\n"},
        {"cp_wcdma", {in(0, "09-00-00", TIME_RECORD.substr(0, 15))},
         "", 3, "", "damage: the time record is cut off (at byte 0)\n"},
        {"agdsp", {in(1, "09-00-00", TIME_RECORD + three.substr(0, 50)), in(0, "09-10-00", three)},
         "", 3, three.substr(0, 50) + three, "damage: the last chunk is cut off (at byte 62)\n"},
        {"agdsp", {in(0, "09-00-00", gaps + three.substr(0, 50)), on_card(0, three)},
         "--kind pcm", 3, "twotwo", "damage: the last chunk is unfinished (at byte 506)\n"},
        {"agdsp", {in(1, "09-00-00", three), in(0, "09-10-00", three)},
         "--kind log", 0, "oneone", "note: chunk 5 where 8 was expected (at byte 0)\n"},
        {"agdsp", {in(0, "09-00-00", chunk(5, DUMP, "a") + "~~~~\x1b" + three)},
         "--kind dump", 3, "a3", "damage: wrong chunk header: mark (at byte 21)\n"},
        {"agdsp", {in(0, "09-00-00", three)}, "--kind sms", 1, "", "give one of log, pcm, dump"},
        // clang-format on
    };
    for (const auto& c : CASES) {
        for (const Log& log : c.logs) {
            write_log(log.set, c.cp, log.number, log.time, log.content);
        }
        const std::string roots = m_root.exists("copy") ? ". copy " : ". ";
        EXPECT_EQ(run("join " + roots + c.args), c.status) << c.words << m_err;
        EXPECT_EQ(m_out, c.stream) << c.words;
        EXPECT_TRUE(c.words.empty() ? m_err.empty() : complained(c.words)) << c.words << m_err;
        for (const char* words : {"started", "two log"}) {
            EXPECT_EQ(complained(words), c.words.find(words) != std::string::npos) << m_err;
        }
        ASSERT_EQ(sh("rm -r data/* storage copy 2>/dev/null; :"), 0);
    }
    // What is said of it never gets into the stream.
    write_log(INTERNAL, "agdsp", 0, "09-00-00", "abc");
    EXPECT_EQ(run("join . --cp agdsp -o one 2>&-; true"), 0);
    EXPECT_EQ(m_root.read_file("one"), "abc");
    // A link is not followed, an unreadable file costs only itself.
    write_log(INTERNAL, "cp_wcn", 0, "09-00-00", "a");
    ASSERT_EQ(symlink("/etc/passwd", m_root
                                         .path(INTERNAL + "cp_wcn/1-cp_wcn-2016-03-01_08-00-00"
                                                          ".log")
                                         .c_str()),
              0);
    EXPECT_EQ(run("join . nowhere --cp cp_wcn"), 2);
    EXPECT_EQ(m_out, "a");
    // Only what was read is counted.
    write(OLD_DSP_LOG, "abc");
    for (const std::string& log : {WCN_LOG, DSP_LOG}) {
        write(log, "b");
        EXPECT_EQ(chmod(m_root.path(log).c_str(), 0), 0);
    }
    const std::string user =
        geteuid() ? "" : "setpriv --bounding-set -dac_override,-dac_read_search ";
    for (const char* args : {"cp_wcn", "agdsp", "agdsp --kind log"}) {
        run(std::string("join data modem_log --json --force -o one --cp ") + args, user + KESTLOG);
        EXPECT_TRUE(said(R"("files":)" + std::to_string(args[0] == 'c' ? 1 : 2))) << m_out;
        EXPECT_TRUE(complained("Permission denied")) << m_err;
    }
}

// The halves of a frame are one where the log goes on, and nothing is made up where it does not.
// All commands count the same.
TEST_F(KestlogStreamsTest, AFrameGoesOnWhereItsLogDoes) {
    const std::string one = frame("one"), half = frame("half and half");
    const std::string begun = one + half.substr(0, 9), rest = half.substr(9) + one;
    struct Log {
        std::string set;
        int number;
        std::string content;
    };
    const struct {
        std::vector<Log> logs;
        uint64_t frames, other;
    } CASES[] = {
        {{{INTERNAL, 1, begun}, {INTERNAL, 0, rest}}, 3, 0},
        // Trimmed where the numbers follow each other.
        {{{INTERNAL, 2, begun}, {INTERNAL, 1, "hole" + rest}, {INTERNAL, 0, one}}, 3, 27},
        // On the other medium; a set of another handset may be begun between.
        {{{INTERNAL, 0, begun}, {CARD_SET, 1, rest}, {CARD_SET, 0, one}}, 4, 0},
        {{{INTERNAL, 0, begun}, {OTHER_SET, 0, one}, {CARD_SET, 0, rest}}, 4, 0},
        {{{INTERNAL, 0, begun}, {OTHER_SET, 0, rest}}, 2, 23},
        // The end of the older set or the start of the newer one is not there.
        {{{INTERNAL, 1, begun}, {CARD_SET, 0, rest}}, 2, 23},
        {{{INTERNAL, 0, begun}, {CARD_SET, 1, one}, {CARD_SET, 0, rest}}, 3, 23},
    };
    const auto sum = [this](const std::string& key) {
        uint64_t all = 0;
        for (size_t at = 0, end; (end = m_out.find('\n', at)) != std::string::npos; at = end + 1) {
            all += Json::parse(m_out.substr(at, end - at)).value(key, uint64_t{0});
        }
        return all;
    };
    for (const auto& c : CASES) {
        SCOPED_TRACE(&c - CASES);
        for (const Log& log : c.logs) {
            write_log("all/" + log.set, "cp_wcn", log.number, log.set.substr(log.set.size() - 9, 8),
                      log.content);
        }
        const std::string roots = m_root.exists("all/other") ? " all all/other" : " all";
        EXPECT_EQ(run("report --json" + roots), 0) << m_err;
        const Json cp = Json::parse(m_out)["cps"][0];
        EXPECT_EQ(cp["frames"], c.frames);
        EXPECT_EQ(cp["other_bytes"], c.other);
        EXPECT_EQ(run("export --json -o all/capture" + roots), 0) << m_err;
        EXPECT_EQ(sum("packets"), c.frames);
        EXPECT_EQ(sum("other_bytes"), c.other);
        EXPECT_EQ(run("extract --json --type 0x9d -o all/to" + roots), 0) << m_err;
        EXPECT_EQ(sum("frames"), c.frames);
        EXPECT_EQ(sum("other_bytes"), c.other);
        ASSERT_EQ(sh("rm -r all"), 0);
    }
}

// A dump of 3 MiB in frames, its image byte for byte.
TEST_F(KestlogStreamsTest, ExtractTakesThePayloadOutOfFrames) {
    const std::string memory = pattern_bytes(3 << 20, 9);
    std::string dump;
    for (size_t at = 0; at < memory.size(); at += 32000) {
        dump += frame(memory.substr(at, 32000));
    }
    write_good_tree();
    write(MODEM_DUMP, dump + raw_frame("1234567\x7e" + END_TEXT));
    const std::string image = "cp_wcdma_memory_" + STAMP + ".bin";
    EXPECT_EQ(run("extract " + MODEM_DUMP + " -o to"), 0) << m_err;
    EXPECT_EQ(m_out, "to/" + image +
                         ": memory image, 3145728 bytes of 99 frames; left out: "
                         "the end marker\n");
    EXPECT_EQ(m_root.read_file("to/" + image), memory);
    EXPECT_EQ(run("extract " + MODEM_DUMP + " -o to"), 4);
    // Under any name the same.
    write("crash", m_root.read_file(MODEM_DUMP));
    EXPECT_EQ(run("extract crash -o to"), 0) << m_err;
    EXPECT_EQ(m_root.read_file("to/crash.image.bin"), memory);

    const std::string broken = altered(frame("lost"), 5, 99);
    write(MODEM_DUMP, "junk" + broken + frame("kept") + frame("x", 1));
    EXPECT_EQ(run("extract --force " + MODEM_DUMP + " --type 0x9d -o to"), 3);
    const std::string typed = "to/cp_wcdma_memory_" + STAMP + ".type-9d.bin";
    EXPECT_EQ(m_root.read_file(typed), "kept");
    EXPECT_EQ(m_out, typed +
                         ": payload, 4 bytes of 1 frames; left out: 1 other frames, 1 broken "
                         "frames, 18 bytes outside intact frames\n");
    EXPECT_TRUE(complained(".dmp: damage: 1 frames with a wrong length")) << m_err;
    EXPECT_EQ(run("extract " + WCN_LOG + " -o to"), 2);
    EXPECT_EQ(m_err, "kestlog: found nothing to extract\n");
    for (const char* args : {"--type 256", "--type x", "--sub-type ''", "-o ''"}) {
        EXPECT_EQ(run("extract . -o to " + std::string(args)), 1) << args;
    }

    // From a tree: every image, ring buffer and sleep log, those in logs as well.
    // The last begins in the file before.
    const std::string sleep = frame("sleep~", 0x3b, 0x64), older = "-cp_wcdma-2016-03-01_09-00-00";
    write(MODEM + "1" + older + ".log",
          TIME_RECORD + frame("x") + std::string(140000, '\0') + sleep.substr(0, 9));
    write(MODEM_LOG, TIME_RECORD + sleep.substr(9) + frame("ring", 0x3a, 0x64) +
                         frame("end", 0x3a, 1) + "tail");
    write(MODEM_DUMP, frame(LOG_DATA) + DUMP_END);
    // A dump over two files, the whole one behind it, and one without its middle.
    const std::string full = pattern_bytes(32748, 4), dsp = "agdsp_memory_2016-03-01_09-00-00";
    write(OLD_DSP_LOG, chunk(7, LOG, "") + chunk(8, DUMP, full));
    write(DSP_LOG, chunk(9, DUMP, full) + chunk(10, LOG, "") + chunk(11, DUMP, LOG_DATA) +
                       chunk(12, DUMP, "2") + chunk(13, DUMP, full) + chunk(16, DUMP, "3"));
    unlink(m_root.path("crash").c_str());
    const std::string name = "cp_wcdma-" + STAMP;
    const std::pair<std::string, std::string> FILES[] = {
        {"0-" + name + ".ringbuf.bin", "ring"},
        {"1" + older + ".sleeplog.bin", "sleep~"},
        {dsp + ".bin", full + full + LOG_DATA},
        {"agdsp_memory_" + STAMP + ".bin", "2"},
        {"agdsp_memory_" + STAMP + "-1.bin", full + "3"},
        {image, LOG_DATA},
        {"cp_wcdma_memory_" + STAMP + "-1.bin", "x"},  // of the kernel's copy
        {"cp_wcdma_ringbuf_" + STAMP + ".bin", "x"},
        {"cp_wcdma_sleeplog_" + STAMP + ".bin", "x"},
        {"cp_wcn_memory_" + STAMP + ".bin", LOG_DATA},
    };
    EXPECT_EQ(run("extract . --json -o all"), 0) << m_err;
    EXPECT_EQ(m_root.list("all").size(), std::size(FILES));
    for (const auto& [file, content] : FILES) {
        EXPECT_EQ(m_root.read_file("all/" + file), content) << file;
    }
    const Json first = Json::parse(m_out.substr(0, m_out.find('\n')));
    EXPECT_EQ(first,
              Json::parse(R"({"file":"./)" + OLD_DSP_LOG + R"(","output":"all/)" + dsp +
                          R"(.bin","content":"memory image","framed":true,"bytes":66496,"frames":3,
        "other_frames":1,"files":2,"missing_frames":0,"has_start":true,"has_end":true})"));
    EXPECT_EQ(run("extract . --force -o all"), 0);
    EXPECT_TRUE(m_out.find("part of a memory image, 32749 bytes of 2 chunks in 1 files; left out: "
                           "nothing; missing: 2 chunks\n") != std::string::npos)
        << m_out;

    // FILEs may be links.
    ASSERT_EQ(sh("mkdir links; ln -sr " + MODEM + "?-* links"), 0);
    EXPECT_EQ(run("extract links/* -o linked"), 0) << m_err;
    EXPECT_EQ(m_root.read_file("linked/1" + older + ".sleeplog.bin"), "sleep~");
    EXPECT_EQ(run("export links/* -o linked/pcapng"), 0) << m_err;
    EXPECT_TRUE(said(": 3 packets on 1 interfaces")) << m_out;
}

// As long as the numbers of the chunks follow each other, and those of another handset do not
// count.
TEST_F(KestlogStreamsTest, AnAudioDspsDumpGoesOnInTheNextSet) {
    const std::string full = pattern_bytes(32748, 4), to = "to/agdsp_memory_2016-03-01_";
    write_log(INTERNAL, "agdsp", 0, "09-00-00", chunk(7, LOG, "") + chunk(8, DUMP, full));
    write_log(INTERNAL, "cp_wcn", 0, "09-00-00", frame("ring", 0x3a, 0x64));
    write_log(OTHER_SET, "agdsp", 0, "09-30-00", chunk(9, DUMP, "other"));
    write_log(CARD_SET, "agdsp", 1, "10-00-00", chunk(9, DUMP, full));
    write_log(CARD_SET, "agdsp", 0, "10-01-00", chunk(10, DUMP, "end"));
    EXPECT_EQ(run("extract . other -o to"), 0) << m_err;
    EXPECT_EQ(m_root.list("to").size(), 3u);
    EXPECT_EQ(m_root.read_file(to + "09-00-00.bin"), full + full + "end");
    EXPECT_EQ(m_root.read_file(to + "09-30-00.bin"), "other");
    EXPECT_EQ(run("report --json . other"), 0) << m_err;
    const Json crashes = Json::parse(m_out)["crashes"];
    ASSERT_EQ(crashes.size(), 2u);
    EXPECT_EQ(crashes[0]["what"], "memory dump");
    EXPECT_EQ(crashes[0]["files"].size(), 3u);
    EXPECT_EQ(crashes[1]["what"], "part of a memory dump, without its start");
    EXPECT_EQ(run("bundle . --crash 09:00 --minutes 0 -o one.tar"), 0) << m_err;
    EXPECT_EQ(run("report --json one.tar"), 0) << m_err;
    EXPECT_EQ(Json::parse(m_out)["crashes"], Json::array({crashes[0]}));

    write_log(CARD_SET, "agdsp", 1, "10-00-00", chunk(6, DUMP, full));
    EXPECT_EQ(run("extract . --force -o to"), 0) << m_err;
    EXPECT_EQ(occurrences(m_out, ": part of a memory image, "), 2u) << m_out;
    EXPECT_EQ(m_root.read_file(to + "09-00-00.bin"), full);
}

// Stereo samples of 16 bits in chunks that end within a sample; the log's chunks lie between.
TEST_F(KestlogStreamsTest, WavHoldsTheSamplesAndSaysWhatIsMissing) {
#ifndef KEST_WAV
    GTEST_SKIP() << "kestlog is built without libsndfile";
#endif
    const std::string samples = pattern_bytes(4001, 5);
    const std::string sound = "--rate 1000 --channels 2 --format s16le -o ";
    write_log(INTERNAL, "agdsp", 1, "09-00-00",
              chunk(1, PCM, samples.substr(0, 1001)) + chunk(2, LOG, "log"));
    write_log(INTERNAL, "agdsp", 0, "09-10-00",
              chunk(3, PCM, samples.substr(1001, 999)) + chunk(6, PCM, samples.substr(2000)));
    EXPECT_EQ(run("wav . " + sound + "gap.wav"), 0) << m_err;
    EXPECT_EQ(m_out,
              "gap.wav: 1.000 seconds of 3 chunks; 1 gaps, 0 of them filled with 0.000 "
              "seconds of silence; 1 bytes of unfinished samples left out\n");
    EXPECT_TRUE(complained("note: chunk 6 where 4 was expected (at byte 1019)\n")) << m_err;
    const std::string wav = m_root.read_file("gap.wav");
    EXPECT_EQ(wav.substr(0, 4) + wav.substr(8, 4), "RIFFWAVE");
    EXPECT_EQ(wav.substr(wav.size() - 4000), samples.substr(0, 4000));

    EXPECT_EQ(run("wav . --json --fill-gaps " + sound + "-"), 0) << m_err;
    EXPECT_EQ(m_out.substr(m_out.size() - 5996),
              samples.substr(0, 2000) + std::string(1996, '\0') + samples.substr(2000, 2000));
    EXPECT_TRUE(complained("\"gaps\":1,\"gaps_filled\":1,\"silence_frames\":499,")) << m_err;

    // Numbers that go back or far ahead are no silence.
    write("renamed", chunk(9, PCM, "one.") + chunk(2, PCM, "two.") + chunk(70000, PCM, "far."));
    const std::string backwards = "--rate 10 --channels 1 --format u8 --fill-gaps -o ";
    EXPECT_EQ(run("wav renamed " + backwards + "b.wav"), 0) << m_err;
    EXPECT_EQ(m_root.read_file("b.wav").substr(m_root.read_file("b.wav").size() - 12),
              "one.two.far.");
    EXPECT_EQ(run("wav renamed " + backwards + "b.wav"), 4);
    // More than an hour of it is damage; and another set begins with the first channel.
    std::string far;
    for (uint32_t i = 0; i < 100; ++i) {
        far += chunk(i * 150, PCM, "far.");
    }
    write("renamed", TIME_RECORD + far);
    EXPECT_EQ(run("wav renamed --force " + backwards + "b.wav"), 0) << m_err;
    EXPECT_NE(m_out.find(" 99 gaps, 60 of them filled with 3576.000 "), std::string::npos) << m_out;
    write("a/1-agdsp-2016-03-01_09-00-00.log", chunk(8, PCM, "abc"));
    write("b/0-agdsp-2016-03-01_09-00-00.log", chunk(1, PCM, "EFgh"));
    EXPECT_EQ(run("wav ?/*.log --rate 9 --channels 2 --format u8 -o b2.wav"), 0) << m_err;
    EXPECT_NE(m_root.read_file("b2.wav").find("abEFgh"), std::string::npos);
    write("renamed", "foreign");
    write("short", chunk(1, PCM, "abc"));
    for (const std::string args :
         {"renamed ", "short ", "nowhere ", "data/modem_log/../.. --until -99999999d "}) {
        EXPECT_EQ(run("wav " + args + sound + "none.wav"), 2) << args;
    }
    for (const char* args :
         {"--rate 1 --channels 1 --format s16 -o x", "--rate 0 --format u8 -o x",
          "--rate 9 --channels 2000 --format u8 -o x",
          "--rate 9999999 --channels 1024 --format s16le -o x", "--rate 1 --format u8"}) {
        EXPECT_EQ(run("wav . " + std::string(args)), 1) << args;
    }
    EXPECT_FALSE(m_root.exists("none.wav"));
    EXPECT_EQ(run("--version; TMPDIR=/nowhere '" KESTLOG "' wav . " + sound + "-"), 4);
    EXPECT_TRUE(m_root.find(".kestlog-").empty());

    // A file that does not belong there costs only itself.
    write(INTERNAL + "agdsp/7-cp_wcdma-2016-03-01_08-00-00.log", "x");
    EXPECT_EQ(run("wav . " + sound + "c.wav"), 3);
    EXPECT_EQ(m_root.read_file("c.wav"), wav);
    EXPECT_EQ(run("join . --kind pcm"), 3) << m_err;
    EXPECT_EQ(m_out, samples);

    if (run("--version >/dev/null && soxi gap.wav") == 127) {
        GTEST_SKIP() << "soxi is not installed";
    }
    for (const char* line : {"Channels       : 2\n", "Sample Rate    : 1000\n", "= 1000 samples",
                             "Sample Encoding: 16-bit Signed Integer PCM\n"}) {
        EXPECT_TRUE(said(line)) << line << m_out;
    }
}

TEST_F(KestlogStreamsTest, SigmfDescribesACaptureThatStaysWhereItIs) {
    const std::string stem = INTERNAL + "cp_wcdma/cp_wcdma_wiq_2016-03-01_09-15-00";
    const std::string told = " --datatype ci16_le --rate 3.84e6 --frequency 2112400000.5";
    write(stem + ".bin", pattern_bytes(400003, 1));
    write(INTERNAL + "cp_wcdma/cp_wcdma.version", "MOC\xff\"1\x1b");
    EXPECT_EQ(run("sigmf " + stem + ".bin" + told), 3);
    EXPECT_EQ(m_out, stem + ".sigmf-meta: 100000 samples, 0.026042 seconds\n");
    EXPECT_TRUE(complained("damage: 3 bytes are left behind the last sample of 4 bytes")) << m_err;
    const Json meta = Json::parse(m_root.read_file(stem + ".sigmf-meta"));
    EXPECT_EQ(meta["global"]["core:dataset"], "cp_wcdma_wiq_2016-03-01_09-15-00.bin");
    EXPECT_EQ(meta["global"]["core:sample_rate"], 3840000);
    EXPECT_EQ(meta["global"].value("core:trailing_bytes", 0), 3);
    EXPECT_EQ(meta["global"]["core:hw"], "cp_wcdma, firmware MOC\u00ff\"1\x1b");
    EXPECT_EQ(meta["captures"][0]["core:frequency"], 2112400000.5);
    EXPECT_FALSE(meta["captures"][0].contains("core:datetime"));  // there is no zone
    EXPECT_NE(meta["global"]["core:description"].get<std::string>().find("2016-03-01 09:15:00"),
              std::string::npos);
    EXPECT_EQ(run("sigmf " + stem + ".bin" + told), 4);
    write(INTERNAL + "cp_wcdma/cp_wcdma.version", "caf\u00e9");
    EXPECT_EQ(run("sigmf -o - " + stem + ".bin" + told), 3);
    EXPECT_EQ(Json::parse(m_out)["global"]["core:hw"], "cp_wcdma, firmware caf\u00e9");

    // A renamed capture says nothing of itself.
    write("caf\u00e9.bin", "12");
    EXPECT_EQ(run("sigmf --json --force caf* --datatype ri8 --rate 1 --frequency 0"), 0) << m_err;
    EXPECT_EQ(Json::parse(m_out)["samples"], 2);
    EXPECT_EQ(run("sigmf --force caf*n -o caf*.bin --datatype ri8 --rate 1 --frequency 0"), 4);
    EXPECT_EQ(m_root.read_file("caf\u00e9.bin"), "12");
    EXPECT_EQ(Json::parse(m_root.read_file("caf\u00e9.sigmf-meta")), Json::parse(R"({"global":{
        "core:version":"1.0.0","core:datatype":"ri8","core:sample_rate":1,"core:num_channels":1,
        "core:dataset":"caf\u00e9.bin","core:recorder":"kestmodem","core:description":"I/Q capture"},
        "captures":[{"core:sample_start":0,"core:frequency":0}],"annotations":[]})"));
    write(MODEM_DUMP, "12345678");
    for (const std::string& file : {std::string("caf*"), MODEM_DUMP, std::string("nowhere")}) {
        EXPECT_EQ(run("sigmf " + file + told + " -o x"), file == "caf*" ? 1 : 2) << file;
    }
    write("tiny", "123");
    EXPECT_EQ(run("sigmf tiny" + told), 2);
    for (const char* wrong : {"--datatype ci16", "--datatype xi8", "--rate 0", "--rate 2e12",
                              "--frequency x", "--rate nan", "--datatype ''"}) {
        EXPECT_EQ(run("sigmf tiny" + told + " " + wrong), 1) << wrong;
    }
    EXPECT_EQ(run("sigmf tiny --datatype ci8 --frequency 1"), 1);
}

// Each command that writes its result to standard output, but for bundle: libarchive keeps memory
// of an archive that it could not close.
TEST_F(KestlogStreamsTest, AFullOutputIsToldOnce) {
    write_good_tree();
    write("iq", "iqiq");
    for (const char* args : {"ls .", "ls --tree .", "--json ls .", "verify .", "report --json .",
                             "report . -o -", "join . --cp cp_wcn", "export .", "frames */*/*/*",
                             "wav modem_log/*/agdsp/0-* --rate 8000 --channels 1 --format u8 -o -",
                             "sigmf iq --datatype ci8 --rate 1 --frequency 1 -o -"}) {
        EXPECT_EQ(run(std::string(args) + " >/dev/full 2>err; exit $?; true"), 4) << args;
        m_err = m_root.read_file("err");
        EXPECT_EQ(m_err, "kestlog: standard output: No space left on device\n") << args;
    }
    EXPECT_EQ(run("wav . --rate 8000 --channels 1 --format u8 --force -o /dev/full"), 4);
    EXPECT_EQ(m_err, "kestlog: /dev/full: No space left on device\n");
    for (const std::string& args : {std::string("extract . -o -"), "split -o - " + DSP_LOG}) {
        EXPECT_EQ(run(args), 1);
        EXPECT_TRUE(complained("not standard output")) << m_err;
    }
}

TEST_F(KestlogStreamsTest, ASignalLeavesNoHalfFile) {
    const std::string data(50000, 'x');  // more than stays in memory
    const std::string chunks = chunk(1, LOG, data) + chunk(2, PCM, data) + chunk(3, DUMP, data);
    const auto files = [this](uintmax_t least) {
        size_t count = 0;
        for (const auto& entry : std::filesystem::directory_iterator(m_root.path("parts"))) {
            std::error_code gone;
            count += std::filesystem::file_size(entry, gone) >= least ? 1 : 0;
        }
        return count;
    };
    std::filesystem::create_directory(m_root.path("parts"));
    for (const int signo : {SIGINT, SIGTERM, SIGHUP}) {
        int in[2];
        ASSERT_EQ(pipe2(in, O_CLOEXEC), 0);
        const pid_t pid = fork();
        if (pid == 0) {
            signal(signo, SIG_DFL);
            dup2(in[0], STDIN_FILENO);
            execl(KESTLOG, "kestlog", "split", "-", "-o", m_root.path("parts").c_str(), nullptr);
            _exit(127);
        }
        EXPECT_EQ(::write(in[1], chunks.data(), chunks.size()),
                  static_cast<ssize_t>(chunks.size()));
        EXPECT_TRUE(wait_until([&] { return files(1) == 3u; }));
        kill(pid, signo);
        int status = 0;
        waitpid(pid, &status, 0);
        EXPECT_TRUE(WIFSIGNALED(status) && WTERMSIG(status) == signo) << status;
        EXPECT_EQ(files(0), 0u) << signo;
        close(in[0]);
        close(in[1]);
    }
}

}  // namespace
