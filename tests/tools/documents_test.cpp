// SPDX-License-Identifier: Apache-2.0
// The documents against the programs: requests and commands are listed once in code, and
// whoever adds one has to describe it.

#include <fstream>
#include <map>
#include <regex>
#include <set>

#include "client/RequestTable.h"
#include "support/TestRoot.h"

namespace {

// The lines of a document after its heading of requests or commands, up to the next heading.
std::vector<std::string> section(const std::string& name, const std::string& heading) {
    std::ifstream file(KEST_SOURCE_DIR "/docs/" + name);
    std::string line;
    while (std::getline(file, line) && line != heading) {
    }
    std::vector<std::string> lines;
    while (std::getline(file, line) && line.compare(0, 3, heading, 0, 3) != 0) {
        lines.push_back(line);
    }
    return lines;
}

std::string without(const std::string& text, const char* pattern) {
    return std::regex_replace(text, std::regex(pattern), "");
}

TEST(Documents, TheProtocolListsTheRequestsOfTheService) {
    std::map<std::string, bool> requests;  // and whether each replies with a value
    for (const ControlRequest& request : CONTROL_REQUESTS) {
        const std::string params = *request.params ? std::string(" ") + request.params : "";
        requests[request.words + params] = request.reply == RK_NUMBER || request.reply == RK_WORD;
    }
    std::map<std::string, bool> listed = requests;
    for (const std::string& line : section("protocol.md", "## Requests")) {
        // | `REQUEST`, `REQUEST` | what they do | value |
        std::smatch row;
        if (std::regex_match(line, row, std::regex(R"(\| (`.*`) \| .* \| ?(.*)\|)"))) {
            std::string names = without(row[1], R"(\\)");
            bool has_value = false;
            for (std::smatch name; std::regex_search(names, name, std::regex("`([^`]*)`"));) {
                EXPECT_EQ(requests.count(name[1]), 1u) << name[1] << " is not a request";
                has_value |= requests[name[1]];
                listed.erase(name[1]);
                names = name.suffix();
            }
            EXPECT_EQ(row[2].length() > 0, has_value) << line;
        }
    }
    EXPECT_TRUE(listed.empty()) << listed.begin()->first << " is not described";
}

TEST(Documents, KestctlsManualPageListsItsCommands) {
    const TestRoot root;
    const std::string file = root.path("help");
    ASSERT_EQ(system((KESTCTL " --help >" + file).c_str()), 0);
    std::set<std::string> in_help, in_manual;  // as "setlogfilesizeMB"
    std::ifstream help(file);
    const char* const MARKUP = R"(\\f.|\\\(aq|[^\w|.[\]])";
    for (std::string line; std::getline(help, line);) {
        // "  set-log-file-size MB              set the limit"
        if (std::regex_match(line, std::regex("  [a-z]+(-| ).*"))) {
            in_help.insert(without(line.substr(0, 35), MARKUP));
        }
    }
    std::string before;
    for (const std::string& line : section("man/kestctl.1", ".SH COMMANDS")) {
        if (before == ".TP" || before == ".TQ") {
            in_manual.insert(without(line.substr(line.find(' ')), MARKUP));
        }
        before = line;
    }
    EXPECT_EQ(in_manual, in_help);
    EXPECT_EQ(in_help.count("getlogstateCP"), 1u);
}

}  // namespace
