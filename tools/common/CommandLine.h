// The command line of a tool: options, a command and the command's parameters. What it may
// hold is described once; --help, completion and the checks come from the description.
#ifndef COMMON_COMMANDLINE_H_
#define COMMON_COMMANDLINE_H_

#include <functional>
#include <map>
#include <string>
#include <vector>

typedef std::vector<std::string> Args;

struct Option {
    const char* name;
    const char* param;    // null without one
    const char* command;  // the only one that takes it, or null
    const char* help;
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
    std::vector<Option> options;  // besides --help and --version
    std::vector<Command> commands;
    std::string notes;  // the end of --help
    // The words that the next parameter may be, after the command and these parameters;
    // none leave completion to the shell.
    std::function<Args(const std::string& command, const Args& params)> next_words;
};

class CommandLine {
public:
    // The exit status after wrong usage, that of every tool.
    static constexpr int WRONG_USAGE = 1;

    // The syntax has to outlive the object.
    explicit CommandLine(const Syntax& syntax) : m_syntax(syntax) {}

    // Reads the command line. False when the program ends now with status(): help, version or
    // completions were asked for and printed, or the usage is wrong.
    bool parse(int argc, char** argv);
    int status() const { return m_status; }

    const std::string& command() const { return m_command; }
    const Args& params() const { return m_params; }
    // Whether the option is there, and its parameter.
    bool has(const std::string& option) const { return m_options.count(option) > 0; }
    std::string value(const std::string& option, const std::string& otherwise) const;

    // Says on standard error what is wrong and how it is right; WRONG_USAGE. An empty reason
    // has been told already.
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
