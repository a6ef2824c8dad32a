// SPDX-License-Identifier: Apache-2.0

#include "common/CommandLine.h"

#include <ctype.h>
#include <getopt.h>
#include <stdio.h>
#include <string.h>
#include <strings.h>

#include <algorithm>
#include <sstream>

#include "common/text.h"

namespace {

// As the first argument: print the completions of the last word that follows. Used by the
// completion scripts only, so --help does not list it.
constexpr char COMPLETE_OPTION[] = "--complete";

constexpr Option HELP = {"help", nullptr, nullptr, "print this text", 'h'};
constexpr Option VERSION = {"version", nullptr, nullptr, "print the version"};

std::vector<Option> all_options(const Syntax& syntax) {
    std::vector<Option> options = {HELP};
    options.insert(options.end(), syntax.options.begin(), syntax.options.end());
    options.push_back(VERSION);
    return options;
}

std::string option_usage(const Option& option) {
    const std::string letter = option.letter ? std::string("-") + option.letter + ", " : "";
    return letter + "--" + option.name + (option.param ? std::string(" ") + option.param : "");
}

Args option_commands(const Option& option) {
    Args commands;
    std::istringstream words(option.commands ? option.commands : "");
    for (std::string word; words >> word;) {
        commands.push_back(word);
    }
    return commands;
}

bool takes_option(const std::string& command, const Option& option) {
    const Args commands = option_commands(option);
    return commands.empty() ||
           std::find(commands.begin(), commands.end(), command) != commands.end();
}

// "split, extract", or "" for an option that all take.
std::string option_owners(const Option& option) {
    std::string text;
    for (const std::string& command : option_commands(option)) {
        text += (text.empty() ? "" : ", ") + command;
    }
    return text;
}

// The number of letters to insert, remove or replace to turn one word into the other.
size_t distance(const std::string& a, const std::string& b) {
    std::vector<size_t> row(b.size() + 1);
    for (size_t j = 0; j <= b.size(); ++j) {
        row[j] = j;
    }
    for (size_t i = 1; i <= a.size(); ++i) {
        size_t diagonal = row[0];
        row[0] = i;
        for (size_t j = 1; j <= b.size(); ++j) {
            const size_t replaced = diagonal + (a[i - 1] == b[j - 1] ? 0 : 1);
            diagonal = row[j];
            row[j] = std::min({replaced, row[j] + 1, row[j - 1] + 1});
        }
    }
    return row[b.size()];
}

// Has getopt_long print what is wrong with the options, which may be names of files from anywhere.
void print_fault(int argc, char** argv, const std::string& letters, const struct option* known) {
    std::vector<std::string> shown(argv, argv + argc);
    std::vector<char*> args;
    for (std::string& arg : shown) {
        arg = escape_text(arg);
        args.push_back(arg.data());
    }
    args.push_back(nullptr);
    optind = 0;
    opterr = 1;
    for (int opt = 0; opt != -1 && opt != '?';) {
        opt = getopt_long(argc, args.data(), letters.c_str(), known, nullptr);
    }
}

}  // namespace

bool CommandLine::parse(int argc, char** argv) {
    if (argc > 1 && strcmp(argv[1], COMPLETE_OPTION) == 0) {
        print_completions(Args(argv + 2, argv + argc));
        return end(0);
    }
    if (!read_options(argc, argv)) {
        return false;
    }
    if (optind == argc) {
        return end(usage_error("no command given"));
    }
    const std::string name = argv[optind];
    if (!find_command(name)) {
        const std::string nearest = nearest_command(name);
        return end(complain("unknown command '" + name + "'",
                            nearest.empty() ? "" : " (did you mean '" + nearest + "'?)"));
    }
    m_command = name;
    m_params.assign(argv + optind + 1, argv + argc);
    // Two commands may have an option of the same name, each with a row of its own.
    for (const auto& [given, value] : m_options) {
        std::string owners;
        bool taken = false;
        for (const Option& option : m_syntax.options) {
            if (given == option.name) {
                owners += (owners.empty() ? "" : ", ") + option_owners(option);
                taken = taken || takes_option(name, option);
            }
        }
        if (!taken) {
            return end(
                usage_error(std::string("--").append(given) + " is for " + owners + " only"));
        }
    }
    return true;
}

bool CommandLine::read_options(int argc, char** argv) {
    const std::vector<Option> options = all_options(m_syntax);
    std::vector<struct option> known;
    known.reserve(options.size() + 1);
    std::string letters;
    for (const Option& option : options) {
        known.push_back({option.name, option.param ? required_argument : no_argument, nullptr, 0});
        if (option.letter) {
            letters += std::string(1, option.letter) + (option.param ? ":" : "");
        }
    }
    known.push_back({nullptr, 0, nullptr, 0});
    int index = 0;
    optind = 0;  // from the start, whatever was read before
    opterr = 0;
    for (int opt; (opt = getopt_long(argc, argv, letters.c_str(), known.data(), &index)) != -1;) {
        if (opt == '?') {
            print_fault(argc, argv, letters, known.data());
            return end(usage_error(""));
        }
        const auto found = opt == 0
                               ? options.begin() + index
                               : std::find_if(options.begin(), options.end(),
                                              [opt](const Option& o) { return o.letter == opt; });
        const std::string name = found->name;
        if (name == HELP.name) {
            print_help();
            return end(0);
        }
        if (name == VERSION.name) {
            printf("%s %s\n", m_syntax.program.c_str(), KEST_VERSION);
            return end(0);
        }
        m_options[name] = optarg ? optarg : "";
    }
    return true;
}

bool CommandLine::end(int status) {
    m_status = status;
    return false;
}

std::string CommandLine::value(const std::string& option, const std::string& otherwise) const {
    const auto it = m_options.find(option);
    return it == m_options.end() ? otherwise : it->second;
}

int CommandLine::complain(const std::string& reason, const std::string& hint) const {
    const char* const program = m_syntax.program.c_str();
    if (const Syntax::Command* command = find_command(m_command)) {
        fprintf(stderr, "%s: %s\nusage: %s %s\n", program, escape_text(reason).c_str(), program,
                command->usage.c_str());
        return WRONG_USAGE;
    }
    if (!reason.empty()) {
        fprintf(stderr, "%s: %s; see %s --help%s\n", program, escape_text(reason).c_str(), program,
                hint.c_str());
    }
    fprintf(stderr, "usage: %s [options] %s\n", program, m_syntax.operands.c_str());
    return WRONG_USAGE;
}

const Syntax::Command* CommandLine::find_command(const std::string& name) const {
    for (const Syntax::Command& command : m_syntax.commands) {
        if (command.name == name) {
            return &command;
        }
    }
    return nullptr;
}

// Empty when none is similar. The service's spelling, ENABLE_LOG, finds enable-log.
std::string CommandLine::nearest_command(const std::string& name) const {
    std::string typed;
    for (const char c : name) {
        typed += c == '_' ? '-' : static_cast<char>(tolower(static_cast<unsigned char>(c)));
    }
    std::string nearest;
    size_t best = (typed.size() + 2) / 3 + 1;
    for (const Syntax::Command& command : m_syntax.commands) {
        const size_t letters = distance(typed, command.name);
        if (letters < best) {
            best = letters;
            nearest = command.name;
        }
    }
    return nearest;
}

namespace {

// The text in lines that end before column 100, all but the first behind an indent.
std::string wrapped(const std::string& text, size_t indent) {
    const size_t room = indent < 60 ? 100 - indent : 40;
    std::string lines;
    size_t start = 0;
    while (text.size() - start > room) {
        size_t blank = text.rfind(' ', start + room);
        if (blank == std::string::npos || blank <= start) {
            break;
        }
        lines += text.substr(start, blank - start) + "\n" + std::string(indent, ' ');
        start = blank + 1;
    }
    return lines + text.substr(start);
}

}  // namespace

void CommandLine::print_help() const {
    const std::vector<Option> options = all_options(m_syntax);
    size_t longest = 0;
    for (const Option& option : options) {
        longest = std::max(longest, option_usage(option).size());
    }
    for (const Syntax::Command& command : m_syntax.commands) {
        longest = std::max(longest, command.usage.size());
    }
    const int width = static_cast<int>(longest);
    printf("usage: %s [options] %s\n%s\n\nOptions:\n", m_syntax.program.c_str(),
           m_syntax.operands.c_str(), m_syntax.purpose.c_str());
    for (const Option& option : options) {
        const std::string owners = option_owners(option);
        const std::string text = (owners.empty() ? "" : owners + ": ") + option.help;
        printf("  %-*s  %s\n", width, option_usage(option).c_str(),
               wrapped(text, longest + 4).c_str());
    }
    printf("\nCommands:\n");
    for (const Syntax::Command& command : m_syntax.commands) {
        printf("  %-*s  %s\n", width, command.usage.c_str(), command.help.c_str());
    }
    printf("\n%s", m_syntax.notes.c_str());
}

// words: what follows the program's name; the last one is being typed and may be empty.
void CommandLine::print_completions(const Args& words) const {
    const std::string typed = words.empty() ? "" : words.back();
    // Case is ignored, as it is for the names of CPs on a command line.
    const auto offer = [&typed](const std::string& word) {
        if (strncasecmp(word.c_str(), typed.c_str(), typed.size()) == 0) {
            printf("%s\n", word.c_str());
        }
    };
    const std::vector<Option> options = all_options(m_syntax);
    Args args;  // the command and its parameters, without options
    for (size_t i = 0; i + 1 < words.size(); ++i) {
        const auto found = std::find_if(options.begin(), options.end(), [&](const Option& o) {
            return o.param && (words[i] == std::string("--") + o.name ||
                               (o.letter && words[i] == std::string("-") + o.letter));
        });
        const bool takes_param = found != options.end();
        if (takes_param) {
            i += words[i + 1] == "=" && i + 2 < words.size() ? 2 : 1;  // bash cuts at it
        }
        if (i + 1 == words.size()) {  // the option's parameter is being typed
            for (const std::string& word :
                 m_syntax.option_words ? m_syntax.option_words(found->name) : Args()) {
                offer(word);
            }
            return;
        }
        if (!takes_param && (words[i] == "-" || words[i].compare(0, 1, "-") != 0)) {
            args.push_back(words[i]);
        }
    }
    if (typed.compare(0, 1, "-") == 0) {
        Args offered;
        for (const Option& option : options) {
            if ((args.empty() || takes_option(args[0], option)) &&
                std::find(offered.begin(), offered.end(), option.name) == offered.end()) {
                offered.push_back(option.name);
                offer(std::string("--") + option.name);
            }
        }
    } else if (args.empty()) {
        for (const Syntax::Command& command : m_syntax.commands) {
            offer(command.name);
        }
    } else if (m_syntax.next_words) {
        const std::string command = args[0];
        args.erase(args.begin());
        for (const std::string& word : m_syntax.next_words(command, args)) {
            offer(word);
        }
    }
}
