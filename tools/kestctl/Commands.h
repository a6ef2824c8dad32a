// SPDX-License-Identifier: Apache-2.0
// The commands of kestctl: one for each request of the service's table, and status, watch
// and raw. Dispatch, --help, completion and the parameter checks all use this list.
#ifndef KESTCTL_COMMANDS_H_
#define KESTCTL_COMMANDS_H_

#include <stddef.h>

#include <string>
#include <vector>

#include "client/RequestTable.h"
#include "common/CommandLine.h"

struct Session;

// What one parameter may be.
enum ParamKind : int {
    PK_CP,     // name of a CP
    PK_IQ,     // I/Q type
    PK_PLACE,  // medium of the mini dumps
    PK_MB,     // number of megabytes
    PK_LINE,   // a whole request line
};

// The parameters of a command.
struct ParamForm {
    const char* params;  // of the request, as in its table; null for raw
    const char* usage;   // on the command line
    size_t min, max;
    ParamKind kinds[2];  // of the first, of all others
    const char* fill;    // replaces the last one when it is left out, or null
};

struct Command {
    std::string name;
    std::string request;  // what is sent before the parameters; empty for status and raw
    const ParamForm* params;
    ReplyKind reply;
    // Gets the open connection and the parameters in the service's spelling. Prints the
    // result or what failed, and returns the exit status.
    int (*run)(const Command&, const Args&, Session&);
    const char* help;  // one line

    std::string usage() const { return *params->usage ? name + " " + params->usage : name; }
};

// All commands, in the order of --help.
const std::vector<Command>& commands();

// The command of that name, or null.
const Command* find_command(const std::string& name);

// The default time-out, in seconds, for the reply to a request line.
int default_timeout(const std::string& line);

// The i-th word that a parameter of that kind may be, in the service's spelling; null after the
// last, and for kinds that are not words.
const char* param_word(ParamKind kind, size_t i);

// The words that may follow the command and these parameters.
Args next_words(const std::string& command, const Args& args);

// Checks the parameters and gives them the service's spelling. False, with a reason for the
// user, when one is wrong.
bool check_args(const Command& command, Args* args, std::string* reason);

#endif  // KESTCTL_COMMANDS_H_
