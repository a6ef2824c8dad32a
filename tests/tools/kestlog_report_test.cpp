// SPDX-License-Identifier: Apache-2.0
// kestlog report: its data from trees with events, its page, and the page in a real browser.
#include <math.h>

#include <algorithm>
#include <fstream>
#include <nlohmann/json.hpp>

#include "KestlogFixture.h"

namespace {

using Json = nlohmann::ordered_json;

const std::string HANDSET = "handset/data/";
const std::string DAY = HANDSET + "modem_log/2016-03-01-08-00-00/cp_wcdma/";
const std::string OTHER = "other/data/modem_log/";
const std::string CARD = "handset/storage/sdcard0/modem_log/";
// The name is text, wherever it is shown.
const std::string HOSTILE = "<script>alert(1)<\xff";
const std::string CARD_TEXT = CARD + "<script>alert(1)<\xc3\xbf";

std::string log_at(int number, const std::string& time) {
    return std::to_string(number) + "-cp_wcdma-2016-03-01_" + time + ".log";
}

bool by_level(char a, char b) {
    return static_cast<uint8_t>(a) < static_cast<uint8_t>(b);
}

// A number as the page shows it: "1,234".
std::string grouped(const Json& number) {
    std::string text = number.dump();
    for (size_t at = text.size(); at > 3; at -= 3) {
        text.insert(at - 3, ",");
    }
    return text;
}

class ReportTest : public KestlogTest {
protected:
    ReportTest() { setenv("TZ", "CST-8", 1); }  // where the fixture's files are of 09:15
    ~ReportTest() override { unsetenv("TZ"); }

    Json report(const std::string& args, int status = 0) {
        EXPECT_EQ(run("report --json " + args), status) << m_err;
        return Json::parse(m_out, nullptr, false);
    }
    // The object of a list in which these members have these values.
    static Json only(const Json& list, const Json& like) {
        Json found;
        for (const Json& each : list) {
            bool same = true;
            for (const auto& [name, value] : like.items()) {
                same = same && each.value(name, Json()) == value;
            }
            EXPECT_FALSE(same && !found.is_null()) << "two of " << like;
            found = same ? each : found;
        }
        EXPECT_FALSE(found.is_null()) << "no " << like << " in " << list;
        return found.is_null() ? Json::object() : found;
    }
    void written_last(const std::string& rel, int seconds_after_nine) {
        const struct timespec time = {1456794000 + seconds_after_nine, 0};
        const struct timespec times[2] = {time, time};
        EXPECT_EQ(utimensat(AT_FDCWD, m_root.path(rel).c_str(), times, 0), 0);
    }
    // The internal medium from 09:00 to 09:15, then the card.
    void write_day() {
        const std::string modem = DAY;
        write(modem + log_at(3, "09-00-00"), TIME_RECORD + frame("one") + frame("two", 5, 6));
        written_last(modem + log_at(3, "09-00-00"), 300);
        write(modem + log_at(2, "09-05-00"), std::string(3000, 'x'));
        written_last(modem + log_at(2, "09-05-00"), 400);
        write(modem + log_at(0, "09-12-00"), TIME_RECORD);
        write(modem + "cp_wcdma.version", "baseband 1");
        write(modem + "mini_dump_2016-03-01_09-06-00.bin", "mini");
        write(modem + "smsg_2016-03-01_09-06-01.log", "s");
        write(modem + "cp_wcdma_memory_2016-03-01_09-06-02.dmp", frame("x"));
        write(modem + "mini_dump_2016-03-01_09-08-00.bin", "again");
        write(modem + "cp_wcdma_ringbuf_2016-03-01_09-10-00.log", "r");
        const std::string on_card = CARD + "2016-03-01-09-30-00/cp_wcdma/";
        write(on_card + log_at(0, "09-31-00"), TIME_RECORD);
        write(on_card + "cp_wcdma.version", "baseband 2");
        write(CARD + HOSTILE + "/x", "x");
        write(OTHER + "2016-03-01-09-13-00/cp_wcdma/cp_wcdma.version", "b\u00e4seband 9");
        write(OTHER + "1970-01-01-00-00-05/cp_wcdma/0-cp_wcdma-1970-01-01_00-00-06.log", "x");
    }
};

TEST_F(ReportTest, TheTimeLineTellsWhatIsThereAndWhatIsNot) {
    write_day();
    const Json json = report("handset", 3);
    EXPECT_EQ(json["totals"].dump(),
              R"({"sets":2,"cps":1,"files":11,"size":3116,"damages":2,"notes":2,"unreadable":0})");
    const struct {
        const char *kind, *from, *to;
        Json more;
    } ITEMS[] = {
        {"trimmed", "08:00:00", "09:00:00", {{"medium", "internal"}}},
        {"log", "09:00:00", "09:05:00", {{"size", 42}, {"damages", 0}}},
        {"log", "09:05:00", "09:06:40", {{"rate", 30}}},
        {"missing", "09:06:40", "09:12:00", {{"words", "number 1 is missing"}}},
        {"crash",
         "09:06:00",
         "09:06:02",
         {{"words", "mini dump, IPC record, memory dump"}, {"damages", 1}}},
        {"crash", "09:08:00", "09:08:00", {{"words", "mini dump"}, {"size", 5}}},
        {"ring buffer", "09:10:00", "09:10:00", {{"size", 1}}},
        {"log", "09:12:00", "09:15:00", {{"medium", "internal"}}},
        {"silence", "09:15:00", "09:30:00", Json::object()},
        {"firmware", "09:30:00", "09:30:00", {{"words", "baseband 1 -> baseband 2"}}},
        {"trimmed", "09:30:00", "09:31:00", {{"medium", "card"}}},
        {"log", "09:31:00", "09:31:00", {{"medium", "card"}}},
    };
    const std::string day = "2016-03-01 ";
    EXPECT_EQ(json["timeline"].size(), std::size(ITEMS));
    for (const auto& item : ITEMS) {
        Json like = {{"kind", item.kind}, {"from", day + item.from}, {"to", day + item.to}};
        like.update(item.more);
        only(json["timeline"], like);
    }
    const Json cp = only(json["cps"], {{"cp", "cp_wcdma"}, {"seconds", 580}, {"frames", 2}});
    EXPECT_EQ(cp["types"].dump(), R"([{"type":5,"sub_type":6,"count":1,"bytes":3,"rate":0},)"
                                  R"({"type":157,"sub_type":1,"count":1,"bytes":3,"rate":0}])");
    only(json["findings"], {{"code", "name"}, {"path", CARD_TEXT}});
    // Another handset changes nothing, nor does its clock that was not set.
    const Json both = report("handset other", 3);
    EXPECT_EQ(both["from"].dump() + both["to"].dump(), json["from"].dump() + json["to"].dump());
    EXPECT_EQ(both["timeline"].size(), json["timeline"].size() + 1);
    only(both["timeline"], {{"from", "1970-01-01 00:00:06"}, {"to", "1970-01-01 00:00:06"}});
    for (const Json& item : json["timeline"]) {
        only(both["timeline"], item);
    }
    // A copy that has its own times does not tell how long the newest file lasts, nor its rate.
    write(DAY + log_at(0, "09-12-00"), TIME_RECORD + frame(std::string(60000, 'y')));
    const std::string wcn = DAY + "../cp_wcn/0-cp_wcn-2016-03-01_09-00-00.log";
    write(wcn, "");
    written_last(wcn, 100000);
    written_last(DAY + log_at(3, "09-00-00"), 5000);
    const Json copy = report("handset", 3);
    only(copy["timeline"], {{"size", 60026}, {"from", day + "09:12:00"}, {"to", day + "09:12:00"}});
    EXPECT_EQ(copy["timeline"].dump().find("silence"), std::string::npos);
    only(copy["timeline"], {{"kind", "missing"}, {"from", day + "09:05:00"}});
    EXPECT_EQ(only(copy["cps"], {{"rate", 42 / 300}})["types"][0]["rate"], 0);
    only(report("handset --since 09:31", 3)["timeline"], {{"kind", "log"}, {"medium", "card"}});
    // Of a part nobody can say what was there before.
    const Json part = report("handset --since 09:05", 3);
    EXPECT_FALSE(part["timeline"].empty());
    for (const Json& item : part["timeline"]) {
        EXPECT_NE(item["kind"], "trimmed");
    }
}

TEST_F(ReportTest, ALotIsMergedAndStillCounted) {
    const std::string dir = "modem_log/2016-03-01-00-00-00/cp_gnss/";
    m_root.make_dir(dir);
    for (int i = 0; i < 6000; ++i) {
        char name[64];
        snprintf(name, sizeof(name), "%d-cp_gnss-2016-03-01_%02d-%02d-%02d.log", 5999 - i, i / 3600,
                 i / 60 % 60, i % 60);
        std::ofstream(m_root.path(dir + name)) << "12";
    }
    // What the clock was set behind has no length.
    write(dir + "6000-cp_gnss-1970-01-01_00-00-05.log", std::string(1000, 'x'));
    const Json json = report(".");
    EXPECT_EQ(json["most_merged"], 2);
    uint64_t files = 0, size = 0;
    for (const Json& item : json["timeline"]) {
        files += item.value("files", 0u);
        size += item.value("size", 0u);
        EXPECT_GE(item["from"], "2016");
        EXPECT_LE(item.value("rate", 0u), 2u) << item;
    }
    EXPECT_LE(json["timeline"].size(), 5003u);
    EXPECT_EQ(files, 6001u);
    EXPECT_EQ(size, 13000u);
}

// A tone an eighth of the rate above the middle, half of full scale: -6 dB.
TEST_F(ReportTest, SamplesArePicturesWhereRateAndFormatAreGiven) {
    std::string iq, pcm;
    for (int k = 0; k < 4096; ++k) {
        for (const double value : {cos(k * M_PI / 4), sin(k * M_PI / 4)}) {
            const int number = 32768 + static_cast<int>(lround(value * 16384));
            iq += static_cast<char>(number >> 8);
            iq += static_cast<char>(number & 0xff);
        }
    }
    for (int k = 0; k < 3000; ++k) {
        pcm += static_cast<char>(k % 3 == 0 ? 64 : k % 3 == 1 ? -32 : 0);
        pcm += static_cast<char>(k == 2000 ? -128 : 0);  // of the other channel
    }
    write(MODEM + "cp_wcdma_wiq_" + STAMP + ".bin", iq);
    // Cut within a sample, in two files, with a log between.
    write(OLD_DSP_LOG, chunk(1, PCM, pcm.substr(0, 1001)) + chunk(2, LOG, "no sample"));
    write(DSP_LOG, chunk(3, PCM, pcm.substr(1001)));
    const std::string pictures =
        " --iq-rate 3.84e6 --iq-format cu16_be --pcm-rate 8000 --pcm-format s8 --pcm-channels 2";
    const Json json = report("." + pictures);
    const Json spectrum =
        only(json["spectra"], {{"samples", 4096}, {"columns", 16}, {"bins", 256}});
    write("levels", spectrum["levels"]);
    ASSERT_EQ(sh("base64 -d levels >out"), 0);
    const std::string levels = m_root.read_file("out");
    ASSERT_EQ(levels.size(), 16 * 256u);
    EXPECT_EQ(levels.substr(0, 256), levels.substr(15 * 256));
    EXPECT_EQ(std::max_element(levels.begin(), levels.begin() + 256, by_level) - levels.begin(),
              128 + 32);
    EXPECT_EQ(static_cast<uint8_t>(levels[160]), 243);  // 2 levels are 1 dB
    EXPECT_LT(static_cast<uint8_t>(levels[96]), 128);   // the mirror image is far below
    const Json waveform = only(json["waveforms"], {{"samples", 3000}, {"samples_per_point", 4}});
    ASSERT_TRUE(waveform.contains("channels"));
    EXPECT_EQ(waveform["channels"][0][0], -250);
    EXPECT_EQ(waveform["channels"][0][1], 500);
    EXPECT_EQ(waveform["channels"][1][1000], -1000);
    EXPECT_EQ(waveform["channels"][1].size(), 1500u);
    write("all/" + DSP_LOG, chunk(1, PCM, "\x3f\x20\xa0\xbe"));
    std::string firsts;
    for (const std::string format :
         {"u8", "s8", "s16le", "s16be", "s24le", "s24be", "s32le", "s32be", "f32le", "f32be"}) {
        const Json all = report("all --pcm-rate 1 --pcm-format " + format);
        firsts += all["waveforms"][0]["channels"][0][0].dump() + " ";
    }
    EXPECT_EQ(firsts, "-508 492 252 493 -749 493 -511 493 -313 627 ");
    for (int day = 10; day < 32; ++day) {
        const std::string date = "2016-03-" + std::to_string(day);
        write("many/modem_log/" + date + "-00-00-00/agdsp/0-agdsp-" + date + "_00-00-00.log",
              chunk(1, day == 10 ? LOG : PCM, "12"));
    }
    const Json many = report("many --pcm-rate 1 --pcm-format s8");
    EXPECT_EQ(many["waveforms"].size() + many.value("more_waveforms", 0u), 21u);
    EXPECT_TRUE(report(".")["spectra"].empty());
    EXPECT_EQ(m_err, "");
    report(". --until 2000-01-01" + pictures);
    EXPECT_EQ(m_err, "kestlog: no I/Q captures to show\nkestlog: no PCM chunks to show\n");
    for (const char* wrong :
         {"--iq-rate 1", "--iq-rate 0 --iq-format ci8", "--iq-rate 1 --iq-format s8",
          "--pcm-rate 1 --pcm-format s8 --pcm-channels 17", "--pcm-channels 2"}) {
        EXPECT_EQ(run("report --json . " + std::string(wrong)), 1) << wrong;
    }
}

// The object in the page, as the page itself reads it.
Json data_of(const std::string& page) {
    const std::string start = "id=\"data\">";
    const size_t at = page.find(start) + start.size();
    return Json::parse(page.substr(at, page.find("</script>", at) - at), nullptr, false);
}

TEST_F(ReportTest, ThePageIsOneFileAndTextFromACardIsText) {
    write_day();
    const Json json = report("handset", 3);
    EXPECT_EQ(run("report handset -o page.html"), 3) << m_err;
    EXPECT_EQ(m_out, "page.html: 11 files, 2 damages, 2 notes\n");
    const std::string page = m_root.read_file("page.html");
    EXPECT_EQ(data_of(page), json);
    EXPECT_EQ(occurrences(page, "<script"), 2u);
    EXPECT_EQ(occurrences(page, "</script"), 2u);
    EXPECT_EQ(occurrences(page, "alert(1)"), 1u);
    for (const char* loads : {"src=", "href=", "@import", "url(http", "{{"}) {
        EXPECT_EQ(page.find(loads), std::string::npos) << loads;
    }
    EXPECT_EQ(run("report handset -o page.html"), 4);
    EXPECT_EQ(run("report handset --force -o - | cmp - page.html"), 0) << m_out;
    EXPECT_EQ(run("report handset"), 1);
    EXPECT_EQ(run("report handset -o no/where.html"), 4);
}

// Needs a Chromium; without one it is skipped.
TEST_F(ReportTest, ABrowserShowsTheNumbersAndNoError) {
    const std::string browse =
        "B=$(command -v chromium || command -v chromium-browser) && cd " + m_root.root() +
        " && HOME=$PWD timeout 300 $B --headless --no-sandbox --disable-gpu "
        "--disable-dev-shm-usage --user-data-dir=$PWD/b --virtual-time-budget=20000 "
        "--enable-logging=stderr --dump-dom >dom 2>console ";
    write("p.html", "shown");
    if (system((browse + "p.html && grep -q shown dom").c_str()) != 0) {
        GTEST_SKIP() << "no chromium that shows a page: " << m_root.read_file("console");
    }
    write_day();
    const std::string dsp_log = "2016-03-01-09-13-00/agdsp/0-agdsp-2016-03-01_09-14-00.log";
    write(OTHER + dsp_log, chunk(1, PCM, "one") + chunk(3, LOG, "three"));
    // A second that only a name has, and a time before 1970.
    write(OTHER + "2016-03-01-09-13-00/cp_wcdma/mini_dump_2016-03-01_09-13-60.bin", "leap");
    write(OTHER + "1969-12-31-19-00-00/cp_wcdma/mini_dump_1969-12-31_19-00-05.bin", "west");
    write(OTHER + "2016-03-01-09-13-00/cp_wcdma/cp_wcdma_wiq_2016-03-01_09-13-30.bin", "short");
    const std::string args =
        "handset other --iq-rate 1 --iq-format ci8 --pcm-rate 0.0001 --pcm-format s8";
    const Json json = report(args, 3);
    only(json["timeline"], {{"cp", "agdsp"}, {"kind", "log"}, {"sequence_gaps", 1}});
    run("report " + args + " -o page.html");
    // Keys, wheel and pointer as a reader would use them, then what they show.
    write("page.html", m_root.read_file("page.html") + R"(<script>
        const chart = document.querySelector('#chart svg');
        const range = () => document.getElementById('range').textContent;
        const press = (key) => chart.dispatchEvent(new KeyboardEvent('keydown', {key: key}));
        const strays = [['down', 2], ['move', 2], ['down', 1], ['cancel', 0], ['move', 1],
            ['down', 1], ['move', 0]];  // none of these drags
        const stray = ([type, buttons], i) => chart.dispatchEvent(new PointerEvent('pointer' + type,
            {clientX: 300 + 50 * i, buttons: buttons, button: buttons & 2, bubbles: true}));
        const seen = [];
        const todo = [() => press('+'),
            () => { strays.forEach(stray); press('ArrowRight'); }, () => press('n'),
            () => chart.dispatchEvent(new WheelEvent('wheel', {deltaY: 1})), () => press('0'),
            () => document.querySelectorAll('td button')[2].click(), () => press('0'), more];
        function more() {  // the page again, without times and with what a far larger tree has
            const title = document.title, again = document.createElement('script');
            const had = JSON.parse(data.textContent);
            document.body.append(unset.cloneNode(true));
            data.textContent = JSON.stringify({...had, sets: [], more_sets: 11, more_spectra: 12,
                more_waveforms: 13, cps: had.cps.map((cp) => ({...cp, more_types: 7})),
                timeline: [1, 2, 3, 4, 5].map((i) => ({medium: 'no ' + i, from: '-', to: '-'}))});
            again.textContent = document.scripts[1].textContent;
            document.body.append(again);
            document.title = title;
        }
        setInterval(() => {
            if (range() !== seen[seen.length - 1]) {  // the last action has been drawn
                seen.push(range());
                document.title = seen.join('|') + '|';
                (todo.shift() || (() => {}))();
            }
        }, 10);</script>)");
    ASSERT_EQ(system((browse + "page.html").c_str()), 0) << m_root.read_file("console");
    const std::string console = m_root.read_file("console"), dom = m_root.read_file("dom");
    EXPECT_EQ(console.find("CONSOLE"), std::string::npos) << console;
    for (const auto& [name, value] : json["totals"].items()) {
        const std::string total = "id=\"total-" + name + "\" class=\"" +
                                  (name == "damages" ? "bad" : "") + "\">" + grouped(value) + "<";
        EXPECT_NE(dom.find(total), std::string::npos) << total;
    }
    std::string cells;
    for (const char* key :
         {"files", "size", "logs", "log_size", "seconds", "rate", "frames", "chunks", "broken",
          "payload", "other_bytes", "sequence_gaps", "missing", "damages", "notes"}) {
        cells += "<td class=\"number\">" + grouped(only(json["cps"], {{"cp", "cp_wcdma"}})[key]) +
                 "</td>";
    }
    EXPECT_NE(dom.find("<td class=\"cp\">cp_wcdma</td>" + cells), std::string::npos) << cells;
    EXPECT_EQ(occurrences(dom, "class=\"item\""), json["timeline"].size() - 2);
    EXPECT_EQ(occurrences(dom, "title=\"Show it\""), json["crashes"].size() - 1);
    EXPECT_EQ(occurrences(dom, "class=\"lost\""), 2u);  // with the one of the legend
    for (const char* shown :
         {"not set for 2 of 18 items and 2 of 5 sets",
          ">handset/storage/sdcard0/modem_log/&lt;script&gt;alert(1)&lt;\xc3\xbf<",
          "<p id=\"detail\" aria-live=\"polite\">cp_wcdma · nothing since the start",
          "drawn and listed; there are 11 more", "and 12 more", "and 13 more", "and 14 more",
          "\"m4\" fill-opacity=\"0.55\"></rect></svg><span>log on no 5<", ">b\u00e4seband 9<",
          ", 30,000 s at", "short for a spectrum (256",
          "<div id=\"line\" hidden=", ">Nothing here has a time.<"}) {
        EXPECT_NE(dom.find(shown), std::string::npos) << shown;
    }
    const std::string ALL = "2016-03-01 07:58:10 to 2016-03-01 09:32:49|";
    const std::string shown =
        ALL +
        "2016-03-01 08:21:50 to 2016-03-01 09:09:09|2016-03-01 08:33:40 to 2016-03-01 09:20:59|"
        "2016-03-01 07:58:10 to 2016-03-01 08:45:30|2016-03-01 07:58:10 to 2016-03-01 08:57:19|" +
        ALL + "2016-03-01 09:09:00 to 2016-03-01 09:19:00|" + ALL;
    EXPECT_NE(dom.find("<title>" + shown), std::string::npos)
        << dom.substr(dom.find("<title>"), 400);
}

TEST_F(ReportTest, ABundleHoldsOneCrashAndIsReadAsATree) {
    write_day();
    // Another CP at the time; the library is on the other medium only.
    const std::string wcn = HANDSET + "modem_log/2016-03-01-08-00-00/cp_wcn/";
    write(wcn + "0-cp_wcn-2016-03-01_09-04-00.log", "around");
    write(wcn + "cp_wcn_memory_2016-03-01_09-06-30.dmp", "of another crash");
    write(wcn + "cp_wcn_sleeplog_2016-03-01_09-20-00.log", "much later");
    write(CARD + "modem_db.gz", "db");
    write(CARD + "sha1.txt", std::string(40, 'A'));
    EXPECT_EQ(run("bundle handset --crash 09:05 --minutes 2 -o crash.tar"), 0) << m_err;
    EXPECT_EQ(m_out,
              "crash.tar: 2016-03-01 09:06:00 cp_wcdma on internal: mini dump, IPC record, memory "
              "dump; 9 files, 3116 bytes\n");
    EXPECT_EQ(run("bundle handset -o new.tar"), 1);
    EXPECT_NE(m_err.find("kestlog: 2016-03-01 09:06:00 cp_wcdma on internal: mini dump, "),
              std::string::npos)
        << m_err;
    m_root.make_dir("unpacked");
    ASSERT_EQ(sh("tar xf crash.tar -C unpacked"), 0);
    const std::string modem = "data/modem_log/2016-03-01-08-00-00/cp_wcdma/";
    const std::vector<std::string> FILES = {
        modem + log_at(2, "09-05-00"),
        modem + log_at(3, "09-00-00"),
        modem + "cp_wcdma.version",
        modem + "cp_wcdma_memory_2016-03-01_09-06-02.dmp",
        modem + "mini_dump_2016-03-01_09-06-00.bin",
        modem + "smsg_2016-03-01_09-06-01.log",
        "data/modem_log/2016-03-01-08-00-00/cp_wcn/0-cp_wcn-2016-03-01_09-04-00.log",
        "data/modem_log/modem_db.gz",
        "data/modem_log/sha1.txt",
        "report.html",
    };
    EXPECT_EQ(m_root.tree("unpacked"), FILES);
    for (size_t i = 0; i < 7; ++i) {
        EXPECT_EQ(m_root.read_file("unpacked/" + FILES[i]),
                  m_root.read_file("handset/" + FILES[i]));
    }
    // Its own report is that of the crash, and of the tree in the tar.
    const Json inside = data_of(m_root.read_file("unpacked/report.html"));
    EXPECT_EQ(inside["totals"]["files"], 9);
    EXPECT_EQ(inside["crashes"].size(), 1u);
    for (const char* args : {"report nosuch", "bundle nosuch --crash 09:05"}) {
        EXPECT_EQ(run(args + std::string(" --force -o crash.tar")), 2);
        EXPECT_EQ(m_err, "kestlog: nosuch: No such file or directory\n");
    }
    const Json again = report("crash.tar", 3);
    EXPECT_EQ(again["crashes"], inside["crashes"]);
    EXPECT_EQ(only(again["timeline"], {{"kind", "log"}, {"cp", "cp_wcdma"}, {"size", 3000}}),
              only(inside["timeline"], {{"kind", "log"}, {"cp", "cp_wcdma"}, {"size", 3000}}));

    EXPECT_EQ(run("bundle handset --crash 09:05 -o crash.tar"), 4);
    EXPECT_EQ(run("bundle handset --crash 09:05 --cp CP_WCN --minutes 0 -o wcn.tar"), 0);
    EXPECT_EQ(m_out.find("wcn.tar: 2016-03-01 09:06:30 cp_wcn on internal: memory dump; "), 0u);
    EXPECT_EQ(run("bundle handset --crash 2016-03-03 --cp cp_wcn -o none.tar"), 2);
    EXPECT_NE(m_err.find("no crash of cp_wcn within a day of 2016-03-03 00:00:00; there are:\n"
                         "kestlog: 2016-03-01 09:06:00 cp_wcdma on internal: mini dump, "),
              std::string::npos)
        << m_err;
    EXPECT_FALSE(m_root.exists("none.tar"));
    // An audio DSP's dump is in its logs, here in two.
    const std::string dsp = HANDSET + "modem_log/2016-03-01-08-00-00/agdsp/";
    write(dsp + "1-agdsp-2016-03-01_11-00-00.log", chunk(0, DUMP, std::string(32748, 'x')));
    write(dsp + "0-agdsp-2016-03-01_11-01-00.log", chunk(1, DUMP, "end") + chunk(3, DUMP, "x"));
    EXPECT_EQ(run("bundle handset --crash 11:00 -o dsp.tar"), 0) << m_err;
    EXPECT_NE(m_out.find(" 11:00:00 agdsp on internal: memory dump; "), std::string::npos);
    const Json dumps = report("dsp.tar");
    only(dumps["timeline"], {{"kind", "crash"}, {"cp", "agdsp"}, {"size", 32751}});
    only(dumps["crashes"], {{"what", "part of a memory dump, without its start"}, {"size", 1}});
    write(dsp + "0-agdsp-2016-03-01_11-01-00.log", "junk" + chunk(1, DUMP, "end"));
    only(report("handset", 3)["crashes"], {{"what", "memory dump"}, {"damages", 1}});
    for (const char* wrong :
         {"-o x", "--crash noon -o x", "--crash 9:06", "--crash 9:06 -o x --minutes 9999"}) {
        EXPECT_EQ(run("bundle handset " + std::string(wrong)), 1) << wrong;
    }
}

}  // namespace
