// SPDX-License-Identifier: Apache-2.0
// kestlog: reads and checks what the service writes.
#include <stdio.h>

#include <algorithm>

#include "common/CommandLine.h"
#include "kestlog/Commands.h"
#include "kestlog/ExitStatus.h"

namespace {

struct Command {
    const char* name;
    const char* param;  // every command takes one
    // Prints everything; returns the exit status.
    int (*run)(const std::string& path, const Settings&);
    const char* help;
};

// clang-format off
constexpr Command COMMANDS[] = {
    {"ls",     "ROOT", run_ls,     "list sets, CPs and files with sizes and time spans"},
    {"info",   "FILE", run_info,   "print what a file is, its time record, frames and damage"},
    {"verify", "ROOT", run_verify, "check names, numbers, headers and frames of all files"},
    {"frames", "FILE", run_frames, "list the frames, or the chunks of an audio DSP log"},
    {"split",  "FILE", run_split,  "write the log, PCM and dump data of an audio DSP log to files"},
};
// clang-format on

Syntax make_syntax() {
    Syntax syntax = {
        "kestlog",
        "command ROOT|FILE",
        "Reads and checks what the service kestmodem writes.",
        {{"json", nullptr, nullptr, "print results as JSON, one object per line"},
         {"output", "DIR", "split", "write the files to DIR instead of the current directory"},
         {"force", nullptr, "split", "replace files that exist"}},
        {},
        "ROOT is a medium's top directory, its modem_log, a set or a CP's directory.\n"
        "\nExit status:\n"
        "  0  no damage\n"
        "  1  wrong usage\n"
        "  2  something could not be read\n"
        "  3  damage found\n"
        "  4  the output could not be written, or already exists\n",
        nullptr,
    };
    for (const Command& command : COMMANDS) {
        const std::string usage = std::string(command.name) + " " + command.param;
        syntax.commands.push_back({command.name, usage, command.help});
    }
    return syntax;
}

int run(const CommandLine& line) {
    const Command& command =
        *std::find_if(std::begin(COMMANDS), std::end(COMMANDS),
                      [&line](const Command& each) { return line.command() == each.name; });
    if (line.params().size() != 1 || line.params()[0].empty()) {
        return line.usage_error(line.command() + " takes one " + command.param);
    }
    const Settings settings = {line.has("json"), line.has("force"), line.value("output", ".")};
    return command.run(line.params()[0], settings);
}

}  // namespace

int main(int argc, char** argv) {
    const Syntax syntax = make_syntax();
    CommandLine line(syntax);
    const int status = line.parse(argc, argv) ? run(line) : line.status();
    if (fflush(stdout) != 0 || ferror(stdout)) {
        perror("kestlog: standard output");
        return ES_OUTPUT;
    }
    return status;
}
