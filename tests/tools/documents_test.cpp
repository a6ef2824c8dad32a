// The documents against the programs: requests and commands are listed once in code, and
// whoever adds one has to describe it.
#include <gtest/gtest.h>

#include <fstream>
#include <map>
#include <regex>
#include <set>
#include <sstream>

#include "client/RequestTable.h"

namespace {

std::string output_of(const std::string& command) {
    std::string text;
    FILE* const pipe = popen(command.c_str(), "r");
    for (int c; pipe && (c = fgetc(pipe)) != EOF;) {
        text += static_cast<char>(c);
    }
    pclose(pipe);
    return text;
}

// The lines of a document between two headings.
std::vector<std::string> section(const std::string& name, const std::string& first,
                                 const std::string& next) {
    std::ifstream file(KEST_SOURCE_DIR "/docs/" + name);
    std::vector<std::string> lines;
    bool inside = false;
    for (std::string line; std::getline(file, line);) {
        inside = line == first || (inside && line.compare(0, next.size(), next) != 0);
        if (inside) {
            lines.push_back(line);
        }
    }
    return lines;
}

// What a line of a manual page shows: ".BR get\-log \fICP" shows "get-logCP".
std::string shown(const std::string& line) {
    std::string text;
    bool quoted = false;
    for (const char c : line.substr(line.find(' ') + 1)) {
        quoted ^= c == '"';
        text += c == '"' || (c == ' ' && !quoted) ? "" : std::string(1, c);
    }
    text = std::regex_replace(text, std::regex(R"(\\f.|\\(?=-))"), "");
    return std::regex_replace(text, std::regex(R"(\\\(aq)"), "'");
}

// What a manual page lists under .TP and .TQ in its section of commands.
std::set<std::string> manual_usages(const std::string& name) {
    std::set<std::string> usages;
    std::string before;
    for (const std::string& line : section(name, ".SH COMMANDS", ".SH")) {
        if (before == ".TP" || before == ".TQ") {
            usages.insert(shown(line));
        }
        before = line;
    }
    return usages;
}

TEST(Documents, TheProtocolListsTheRequestsOfTheService) {
    std::map<std::string, bool> requests;  // and whether each replies with a value
    for (const ControlRequest& request : CONTROL_REQUESTS) {
        const std::string params = *request.params ? std::string(" ") + request.params : "";
        requests[request.words + params] = request.reply == RK_NUMBER || request.reply == RK_WORD;
    }
    std::set<std::string> listed;
    for (const std::string& line : section("protocol.md", "## Requests", "## ")) {
        static const std::regex ROW(R"(\| (`.*`) \| .* \| ?(.*)\|)");
        static const std::regex CODE("`([^`]*)`");
        std::smatch row;
        if (!std::regex_match(line, row, ROW)) {
            continue;
        }
        const std::string names = row[1];
        bool has_value = false;
        for (std::sregex_iterator it(names.begin(), names.end(), CODE), end; it != end; ++it) {
            const std::string request = std::regex_replace((*it)[1].str(), std::regex(R"(\\)"), "");
            EXPECT_EQ(requests.count(request), 1u) << request << " is not a request";
            has_value |= requests[request];
            listed.insert(request);
        }
        EXPECT_EQ(row[2].length() > 0, has_value) << line;
    }
    for (const auto& request : requests) {
        EXPECT_EQ(listed.count(request.first), 1u) << request.first << " is not described";
    }
}

TEST(Documents, KestctlsManualPageListsItsCommands) {
    const std::string help = output_of(KESTCTL " --help");
    std::set<std::string> names;
    for (const std::string& usage : manual_usages("man/kestctl.1")) {
        EXPECT_NE(help.find("\n  " + usage + " "), std::string::npos) << usage;
        names.insert(usage.substr(0, usage.find(' ')));
    }
    std::istringstream completions(output_of(KESTCTL " --complete ''"));
    for (std::string name; completions >> name;) {
        EXPECT_EQ(names.count(name), 1u) << name << " is not described";
    }
    EXPECT_EQ(names.count("get-log-state"), 1u);
}

}  // namespace
