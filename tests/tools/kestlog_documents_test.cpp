// SPDX-License-Identifier: Apache-2.0
// docs/json.md and the manual page against what kestlog prints and does.
#include <fstream>
#include <map>
#include <nlohmann/json.hpp>
#include <regex>
#include <set>
#include <sstream>

#include "tools/KestlogFixture.h"

namespace {

class KestlogDocuments : public KestlogTest {};

using Json = nlohmann::ordered_json;

// A kind of line as its table describes it.
struct Table {
    std::map<std::string, std::string> types;  // of the members
    std::set<std::string> optional, seen;

    bool fits(const std::map<std::string, std::string>& members) const {
        for (const auto& [name, type] : members) {
            const auto it = types.find(name);
            if (it == types.end() || it->second != type) {
                return false;
            }
        }
        for (const auto& row : types) {
            if (optional.count(row.first) + members.count(row.first) == 0) {
                return false;
            }
        }
        return true;
    }
};

std::map<std::string, std::vector<Table>> read_tables() {
    std::map<std::string, std::vector<Table>> tables;
    std::ifstream file(KEST_SOURCE_DIR "/docs/json.md");
    std::string command;
    for (std::string line; std::getline(file, line);) {
        std::istringstream row(line);
        std::string bar, name, type, mark;
        row >> bar >> name >> bar >> type >> mark;
        if (line.compare(0, 3, "## ") == 0) {
            command = line.substr(3);
        } else if (line.compare(0, 9, "| member ") == 0) {
            tables[command].emplace_back();
        } else if (line.compare(0, 3, "| `") == 0) {
            Table& table = tables[command].back();
            name = name.substr(1, name.size() - 2);
            table.types[name] = type;
            if (mark == "?") {
                table.optional.insert(name);
            }
        }
    }
    return tables;
}

void flatten(const std::string& name, const Json& json, std::map<std::string, std::string>* out) {
    if (json.is_object()) {
        for (const auto& [key, value] : json.items()) {
            flatten(name.empty() ? key : name + "." + key, value, out);
        }
    } else if (json.is_array()) {
        for (const Json& each : json) {
            flatten(name + "[]", each, out);
        }
    } else {
        (*out)[name] = json.is_number_integer() ? "integer" : json.type_name();
    }
}

// What happens while follow watches, which ends with its reader.
const std::string CHANGES = R"(modem_log | {
    upto() { while read -r line; do echo "$line"; case $line in *"$1"*) return;; esac; done; }
    upto ready
    cd modem_log && touch sha1.txt && cd 2016-03-01-09-15-00/agdsp
    echo x >0-agdsp-2016-03-01_09-16-00.log
    upto '"offset":'
    echo x >agdsp_memory_2016-03-01_09-15-00.mem
    upto complete
    ln -s x link && mv -T link 1-agdsp-2016-03-01_09-00-00.log
    upto '"event":"notice"'
    rm 0*_09-15-00.log
    upto deleted
    cd ../.. && cp -r 2016-03-01-09-15-00 2016-03-01-09-16-00
    upto '"event":"set"'
    mv 2016-03-01-09-16-00 ../gone
    upto '"event":"gone"'
})";

// What makes each command print every kind of line and member that it has.
const struct {
    const char* command;
    std::vector<std::string> args;
} RUNS[] = {
    {"ls", {"."}},
    {"info", {WCN_LOG + " " + DSP_LOG, MODEM_LOG, MODEM_DUMP, MODEM + "cp_wcdma.version"}},
    {"verify", {"."}},
    {"frames", {MODEM_LOG, "--hex " + OLD_DSP_LOG + " " + WCN_LOG}},
    {"report",
     {". many nowhere", "--iq-rate 1e6 --iq-format ci8 --pcm-rate 8000 --pcm-format s8 ."}},
    {"bundle", {"--crash 2016-03-01 -o crash.tar ."}},
    {"split", {"-o . " + OLD_DSP_LOG}},
    {"export", {"-o capture ."}},
    {"join", {"--cp agdsp -o all ."}},
    {"extract", {"-o images ."}},
#ifdef KEST_WAV
    {"wav", {"--rate 8000 --channels 1 --format u8 -o sound.wav ."}},
#endif
    {"sigmf", {"--datatype ci16_le --rate 1 --frequency 1 -o meta iq"}},
    {"follow", {CHANGES}},  // the last: it deletes
};

TEST_F(KestlogDocuments, EveryLineOfJsonIsAsTheDocumentSays) {
    write_good_tree();
    write(DSP_LOG, "no chunks");
    write("iq", "12345");
    std::string types;
    for (uint32_t lost = 1; lost < 202; ++lost) {
        m_root.write_file(DSP_LOG,
                          m_root.read_file(DSP_LOG) + chunk(2 * lost, lost % 2 ? PCM : DUMP, "x"));
        m_root.write_file(
            "many/cp_gnss/cp_gnss_sleeplog_" + std::to_string(2000 + lost) + "-03-01_09-15-00.log",
            "");
        types += frame("", 1, static_cast<int>(lost));
    }
    write("many/cp_gnss/0-cp_gnss-" + STAMP + ".log", types);
    std::map<std::string, std::vector<Table>> tables = read_tables();
    for (const auto& command : RUNS) {
        std::vector<Table>& kinds = tables[command.command];
        for (const std::string& args : command.args) {
            const int status = run("--json " + std::string(command.command) + " " + args);
            EXPECT_LE(static_cast<unsigned>(status), 4u) << command.command << " " << args << m_err;
            ASSERT_NE(m_out, "") << command.command << " " << args << m_err;
            std::istringstream lines(m_out);
            for (std::string line; std::getline(lines, line);) {
                std::map<std::string, std::string> members;
                flatten("", Json::parse(line), &members);
                const auto kind = std::find_if(kinds.begin(), kinds.end(), [&](const Table& table) {
                    return table.fits(members);
                });
                ASSERT_NE(kind, kinds.end()) << command.command << " prints " << line;
                for (const auto& member : members) {
                    kind->seen.insert(member.first);
                }
            }
        }
        for (const Table& kind : kinds) {
            for (const auto& row : kind.types) {
                EXPECT_EQ(kind.seen.count(row.first), 1u)
                    << command.command << " never prints " << row.first;
            }
        }
    }
    run("--complete ''");
    std::istringstream commands(m_out);
    for (std::string command; commands >> command;) {
        EXPECT_EQ(tables.count(command), 1u) << command << " is not described";
        tables.erase(command);
    }
#ifndef KEST_WAV
    tables.erase("wav");
#endif
    EXPECT_TRUE(tables.empty()) << tables.begin()->first << " is no command";
}

// The lines of the manual page, without markup.
std::vector<std::string> manual() {
    std::vector<std::string> lines;
    std::ifstream file(KEST_SOURCE_DIR "/docs/man/kestlog.1");
    for (std::string line; std::getline(file, line);) {
        for (const auto& [markup, text] :
             {std::pair<std::string, std::string>{"\\-", "-"}, {"\\(aq", "'"}, {"\\(dq", "\""}}) {
            for (size_t at; (at = line.find(markup)) != std::string::npos;) {
                line.replace(at, markup.size(), text);
            }
        }
        lines.push_back(line);
    }
    return lines;
}

TEST_F(KestlogDocuments, TheManualPageHasEveryCommandAndOption) {
    const std::vector<std::string> lines = manual();
    std::set<std::string> headings;
    std::string all;
    for (const std::string& line : lines) {
        if (line.compare(0, 4, ".SS ") == 0) {
            headings.insert(line.substr(4));
        }
        all += line + "\n";
    }
    EXPECT_EQ(run("--help"), 0);
    std::istringstream help(m_out.substr(0, m_out.find("\n\nROOT is")));
    bool commands = false;
    for (std::string line; std::getline(help, line);) {
        commands |= line == "Commands:";
        std::string usage = line.substr(0, line.find("  ", 2)).erase(0, 2);
        const size_t option = line.find("--");
        if (commands && line[0] == ' ') {
            EXPECT_EQ(headings.erase(usage), 1u) << usage << " is not described";
        } else if (!commands && option != std::string::npos) {
            usage = line.substr(option, line.find(' ', option) - option);
            EXPECT_NE(all.find(usage), std::string::npos) << usage << " is not described";
        }
    }
#ifndef KEST_WAV
    headings.erase("wav FILE|ROOT...");
#endif
    EXPECT_TRUE(headings.empty()) << *headings.begin() << " is no command";
}

// Around each example: absolute paths lead into the test's root, what opens a window or is not
// installed takes what it is given, and while somebody follows, one crash comes after the other.
const std::string AROUND = R"(set -e -o pipefail
mkdir -p stubs && PATH=$TOOLS:$PWD/stubs:$PATH
missing=$(for program in jq tshark sox; do type $program >/dev/null || echo $program; done)
for program in wireshark xdg-open audacity inspectrum $missing; do
    printf '#!/bin/sh\n[ ! -p /dev/stdin ] || cat >/dev/null\n' >stubs/$program
    chmod +x stubs/$program
done
crashes() {
    for time in 1{0..9}-{00..59}-{00..59}; do
        [ ! -e done ] || return 0
        cp version $DIR/cp_wcn_memory_2016-03-01_$time.dmp
    done
}
if grep -q ' follow ' example; then
    crashes &
fi
status=0
bash -o pipefail example || status=$?
touch done
wait
rm -f done $DIR/cp_wcn_memory_2016-03-01_1*
exit $status
)";

TEST_F(KestlogDocuments, TheExamplesOfTheManualPageRun) {
    write_good_tree();
    write("version", "1");
    write(MODEM + "cp_wcdma_wiq_2016-03-01_09-16-00.bin", "iqiqiqiq");
    const std::string before =
        "mkdir -p card handset/data media tmp usr/share && cp -a modem_log card && cp -a modem_log "
        "handset/data && cp -a modem_log data && cp -a card media && tar czf card.tar.gz card && "
        "find modem_log -name '*.log' -exec cp {} . ';' && ln -s '" KEST_SOURCE_DIR
        "/share/kestmodem' usr/share";
    ASSERT_EQ(sh(before), 0);
    const std::string tools = std::string(KESTLOG).substr(0, std::string(KESTLOG).rfind('/'));
    write("around", "TOOLS='" + tools + "' DIR=data/" + WCN + "\n" + AROUND);
    bool section = false, example = false;
    int examples = 0;
    for (const std::string& line : manual()) {
        section =
            line[0] == '.' && line.compare(0, 3, ".SH") == 0 ? line == ".SH EXAMPLES" : section;
        example = line == ".nf" || (example && line != ".fi");
#ifndef KEST_WAV
        if (line.compare(0, 11, "kestlog wav") == 0) {
            continue;
        }
#endif
        if (section && example && line[0] != '.') {
            ++examples;
            write("example", std::regex_replace(line, std::regex("(^|[ =:])/(?!dev/)"),
                                                "$1" + m_root.root() + "/") +
                                 "\n");
            EXPECT_EQ(sh("bash around >o 2>&1"), 0) << line << "\n" << m_root.read_file("o");
        }
    }
    EXPECT_GE(examples, 8);
}

}  // namespace
