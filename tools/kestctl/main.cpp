// SPDX-License-Identifier: Apache-2.0
// kestctl: the command-line client of the service's control socket.
#include <stdio.h>
#include <stdlib.h>
#include <string.h>

#include "common/CommandLine.h"
#include "common/standard_streams.h"
#include "kestctl/Commands.h"
#include "kestctl/ExitStatus.h"
#include "kestctl/Session.h"

namespace {

// A number of seconds, at most a day; 0 means no limit.
bool parse_timeout(const std::string& text, double* timeout) {
    char* end;
    *timeout = strtod(text.c_str(), &end);
    return !text.empty() && text.find_first_not_of("0123456789.") == std::string::npos &&
           *end == '\0' && *timeout <= 86400;
}

std::string help_notes() {
    std::string notes = "Names of CPs, in any case:";
    for (size_t i = 0; param_word(PK_CP, i); ++i) {
        notes += std::string(" ") + param_word(PK_CP, i);
    }
    notes += "\n\nExit status:\n";
    const auto add = [&notes](int status, const std::string& meaning) {
        notes += (status < 10 ? "   " : "  ") + std::to_string(status) + "  " + meaning + "\n";
    };
    add(ES_OK, "done");
    add(ES_USAGE, "wrong usage; nothing was sent");
    add(ES_NO_CONNECTION, "no connection");
    add(ES_TIMEOUT, "no reply in time");
    add(ES_BAD_REPLY, "unexpected reply, or the connection was closed");
    add(ES_OUTPUT, "the result could not be written");
    add(ES_STILL_OFF, "enable-log: a CP is still not logged");
    for (int code = 1; code <= MAX_ERROR_CODE; ++code) {
        add(ES_SERVICE_ERROR + code, "error " + std::to_string(code) + ": " + error_meaning(code));
    }
    return notes;
}

Syntax make_syntax() {
    Syntax syntax = {
        "kestctl",
        "command [parameters]",
        "Controls the running service kestmodem.",
        {{"json", nullptr, nullptr, "print results and errors as JSON, one object per line"},
         {"timeout", "SECONDS", nullptr, "wait that long (default 10, save-* 60; 0: no limit)"},
         {"time", nullptr, "watch", "print the time of each notification"},
         {"exec", "COMMAND", "watch", "run COMMAND with each notification's two words"}},
        {},
        help_notes(),
        next_words,
    };
    for (const Command& command : commands()) {
        syntax.commands.push_back({command.name, command.usage(), command.help});
    }
    return syntax;
}

int run(const CommandLine& line) {
    const Command& command = *find_command(line.command());
    Args args = line.params();
    std::string reason;
    if (!check_args(command, &args, &reason)) {
        return line.usage_error(reason);
    }
    // The parameter of raw is a request, too.
    const bool is_raw = command.request.empty() && !args.empty();
    double timeout = default_timeout(is_raw ? args[0] : command.request);
    const std::string seconds = line.value("timeout", "");
    if (line.has("timeout") && !parse_timeout(seconds, &timeout)) {
        return line.usage_error("'" + seconds + "' is not a number of seconds up to 86400");
    }
    if (line.has("exec") && line.value("exec", "").empty()) {
        return line.usage_error("--exec needs a command");
    }
    Session session(Output(line.has("json"), line.has("time")), line.value("exec", ""));
    const int status = session.connection.open(timeout);
    if (status != ES_OK) {
        return session.output.failure(status, session.connection.failure());
    }
    return command.run(command, args, session);
}

}  // namespace

int main(int argc, char** argv) {
    hold_standard_streams();
    const Syntax syntax = make_syntax();
    CommandLine line(syntax);
    const int status = line.parse(argc, argv) ? run(line) : line.status();
    if ((fflush(stdout) != 0 || ferror(stdout)) && status == ES_OK) {
        perror("kestctl: standard output");
        return ES_OUTPUT;
    }
    return status;
}
