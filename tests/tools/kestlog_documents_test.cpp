// SPDX-License-Identifier: Apache-2.0
// docs/json.md and the manual page against what kestlog prints and does.
#include <fstream>
#include <map>
#include <nlohmann/json.hpp>
#include <set>
#include <sstream>

#include "tools/KestlogFixture.h"

namespace {

class KestlogDocuments : public KestlogTest {};

typedef nlohmann::ordered_json Json;

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

// What makes each command print every kind of line and member that it has.
const struct {
    const char* command;
    std::vector<std::string> args;
} RUNS[] = {
    {"ls", {"."}},
    {"info", {WCN_LOG + " " + DSP_LOG, MODEM_LOG, MODEM_DUMP, MODEM + "cp_wcdma.version"}},
    {"verify", {"."}},
    {"frames", {MODEM_LOG, "--hex " + OLD_DSP_LOG + " " + WCN_LOG}},
    {"split", {"-o . " + OLD_DSP_LOG}},
    {"export", {"-o capture ."}},
};

TEST_F(KestlogDocuments, EveryLineOfJsonIsAsTheDocumentSays) {
    write_good_tree();
    write(DSP_LOG, "no chunks");
    for (uint32_t lost = 1; lost < 30; ++lost) {
        m_root.write_file(DSP_LOG, m_root.read_file(DSP_LOG) + chunk(2 * lost, LOG, "x"));
    }
    std::map<std::string, std::vector<Table>> tables = read_tables();
    for (const auto& command : RUNS) {
        std::vector<Table>& kinds = tables[command.command];
        for (const std::string& args : command.args) {
            run("--json " + std::string(command.command) + " " + args);
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
    run("--help");
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
    EXPECT_TRUE(headings.empty()) << *headings.begin() << " is no command";
}

TEST_F(KestlogDocuments, TheExamplesOfTheManualPageRun) {
    write_good_tree();
    for (const char* line :
         {"mkdir -p card handset/data && cp -a modem_log card && cp -a modem_log handset/data",
          "tar czf card.tar.gz card", "find modem_log -name '*.log' -exec cp {} . ';'"}) {
        ASSERT_EQ(system(("cd " + m_root.root() + " && " + line).c_str()), 0) << line;
    }
    const std::string tools = std::string(KESTLOG).substr(0, std::string(KESTLOG).rfind('/'));
    bool section = false, example = false;
    int examples = 0;
    for (const std::string& line : manual()) {
        section =
            line[0] == '.' && line.compare(0, 3, ".SH") == 0 ? line == ".SH EXAMPLES" : section;
        example = line == ".nf" || (example && line != ".fi");
        if (section && example && line[0] != '.') {
            ++examples;
            write("example", "set -e -o pipefail\nPATH=" + tools + ":$PATH\n" + line + "\n");
            EXPECT_EQ(system(("cd " + m_root.root() + " && bash example >o 2>&1").c_str()), 0)
                << line << "\n"
                << m_root.read_file("o");
        }
    }
    EXPECT_GE(examples, 8);
}

}  // namespace
