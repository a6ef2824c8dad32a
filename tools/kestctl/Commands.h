// The commands of kestctl: one for each request of the service's table and a few of its
// own. Dispatch, --help, completion and the checks of the parameters all come from here.
#ifndef KESTCTL_COMMANDS_H_
#define KESTCTL_COMMANDS_H_

#include <stddef.h>

#include <string>
#include <vector>

#include "client/RequestTable.h"
#include "common/CommandLine.h"

class ControlConnection;
class Output;

// What one parameter may be.
enum ParamKind : int {
    PK_CP,     // name of a CP
    PK_IQ,     // name of an I/Q type
    PK_PLACE,  // place of the mini dumps
    PK_MB,     // number of megabytes
    PK_LINE,   // a request as it is sent
};

// The parameters of a command.
struct ParamForm {
    const char* params;  // of the request, as its table has them; null for kestctl's own
    const char* usage;   // on the command line
    size_t min, max;
    ParamKind kinds[2];  // of the first, of all others
    const char* fill;    // stands for the last one if it is left out, or null
};

struct Command {
    std::string name;
    std::string request;  // what is sent before the parameters; empty when run knows it
    const ParamForm* params;
    ReplyKind reply;
    // Gets the open connection and the parameters as the service wants them. Returns the
    // exit status, having printed everything.
    int (*run)(const Command&, const Args&, ControlConnection&, const Output&);
    const char* help;  // one line

    std::string usage() const { return *params->usage ? name + " " + params->usage : name; }
};

// All commands, in the order of --help.
const std::vector<Command>& commands();

// The command of that name, or null.
const Command* find_command(const std::string& name);

// How many seconds the line's reply may take by default.
int default_timeout(const std::string& line);

// Word i that a parameter of that kind may be, as it is sent; null when there is none.
const char* param_word(ParamKind kind, size_t i);

// The words that the next parameter of the command may be.
Args next_words(const std::string& command, const Args& args);

// Checks the parameters and turns them into what is sent. False with the reason in words.
bool check_args(const Command& command, Args* args, std::string* reason);

#endif  // KESTCTL_COMMANDS_H_
