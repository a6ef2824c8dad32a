// The commands of kestctl in one table. Dispatch, --help, completion and the checks of
// the parameters all come from it: a new request is one more row.
#ifndef KESTCTL_COMMANDS_H_
#define KESTCTL_COMMANDS_H_

#include <stddef.h>

#include <string>
#include <vector>

class ControlConnection;
class Output;

// What one parameter may be.
enum ParamKind : int {
    PK_CP,    // name of a CP
    PK_IQ,    // name of an I/Q type
    PK_POS,   // place of the mini dumps
    PK_MB,    // number of megabytes
    PK_LINE,  // a request as it is sent
};

// The parameters of a command.
struct ParamForm {
    const char* usage;
    size_t min, max;
    ParamKind kinds[2];  // of the first, of all others
    const char* fill;    // stands for the last one if it is left out, or null
};

// What follows OK in the reply to a command.
enum ReplyKind : int { RK_NONE, RK_NUMBER, RK_WORD };

typedef std::vector<std::string> Args;

struct Command {
    const char* name;
    const char* request;  // what is sent before the parameters; null when run knows it
    const ParamForm* params;
    ReplyKind reply;
    int timeout;  // default, in seconds
    // Gets the open connection and the parameters as the service wants them. Returns the
    // exit status, having printed everything.
    int (*run)(const Command&, const Args&, ControlConnection&, const Output&);
    const char* help;  // one line
};

constexpr size_t COMMAND_NUM = 27;
extern const Command COMMANDS[COMMAND_NUM];

// The command of that name, or null.
const Command* find_command(const std::string& name);

// The command that sends the same request as the line, or null.
const Command* find_request(const std::string& line);

// Word i that a parameter of that kind may be, as it is sent; null when there is none.
const char* param_word(ParamKind kind, size_t i);

// Checks the parameters and turns them into what is sent. False with the reason in words.
bool check_args(const Command& command, Args* args, std::string* reason);

#endif  // KESTCTL_COMMANDS_H_
