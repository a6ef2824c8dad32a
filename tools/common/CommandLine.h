// SPDX-License-Identifier: Apache-2.0
// The command line of a tool: options, a command and its parameters. The tool describes
// its syntax once; parsing, --help, completion and usage errors follow from that.
#ifndef COMMON_COMMANDLINE_H_
#define COMMON_COMMANDLINE_H_

#include <functional>
#include <map>
#include <string>
#include <vector>

typedef std::vector<std::string> Args;

// An option whose parameter or meaning depends on the command has a row for each.
struct Option {
    const char* name;
    const char* param;     // null without one
    const char* commands;  // the only ones that take it, separated by spaces, or null
    const char* help;
    char letter = 0;  // the short option, or 0
};

struct Syntax {
    struct Command {
        std::string name;
        std::string usage;  // the name and the parameters
        std::string help;   // one line
    };

    std::string program;
    std::string operands;         // what follows the options
    std::string purpose;          // one line
    std::vector<Option> options;  // without --help and --version
    std::vector<Command> commands;
    std::string notes;  // the end of --help
    // The words that may follow the command and these parameters. Null, or no words: the shell
    // completes file names.
    std::function<Args(const std::string& command, const Args& params)> next_words;
    // The words that the option takes; the same of null or none.
    std::function<Args(const std::string& option)> option_words = nullptr;
};

class CommandLine {
public:
    // The exit status of every tool after wrong usage.
    static constexpr int WRONG_USAGE = 1;

    // The syntax has to outlive the object.
    explicit CommandLine(const Syntax& syntax) : m_syntax(syntax) {}

    // Reads the command line. False when the program must exit with status(): it has printed
    // the help, the version or completions, or a usage error.
    bool parse(int argc, char** argv);
    int status() const { return m_status; }

    const std::string& command() const { return m_command; }
    const Args& params() const { return m_params; }
    // Whether the option was given, and its parameter.
    bool has(const std::string& option) const { return m_options.count(option) > 0; }
    std::string value(const std::string& option, const std::string& otherwise) const;

    // Prints the reason and the usage on standard error; returns WRONG_USAGE. An empty reason
    // has already been printed.
    int usage_error(const std::string& reason) const { return complain(reason, ""); }

private:
    bool end(int status);
    int complain(const std::string& reason, const std::string& hint) const;
    bool read_options(int argc, char** argv);
    const Syntax::Command* find_command(const std::string& name) const;
    std::string nearest_command(const std::string& name) const;
    void print_help() const;
    void print_completions(const Args& words) const;

    const Syntax& m_syntax;
    int m_status = 0;
    std::string m_command;
    Args m_params;
    std::map<std::string, std::string> m_options;
};

#endif  // COMMON_COMMANDLINE_H_
