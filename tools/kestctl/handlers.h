// What the commands do once the connection is open: the functions of the command table.
#ifndef KESTCTL_HANDLERS_H_
#define KESTCTL_HANDLERS_H_

#include "kestctl/Commands.h"

// Sends the command's request with the parameters and prints the reply.
int run_request(const Command& command, const Args& args, ControlConnection& connection,
                const Output& output);

// As run_request, and asks afterwards whether the CPs are logged now: the service answers
// OK also for one that it cannot log.
int run_enable_log(const Command& command, const Args& args, ControlConnection& connection,
                   const Output& output);

// Asks every parameterless getter of the table and the log state of every CP. What no
// request tells comes from the settings file; UNKNOWN when that cannot be read.
int run_status(const Command& command, const Args& args, ControlConnection& connection,
               const Output& output);

// Subscribes and prints notifications until SIGINT ends the program with status 0.
int run_watch(const Command& command, const Args& args, ControlConnection& connection,
              const Output& output);

// Sends the line and prints what comes back as it is.
int run_raw(const Command& command, const Args& args, ControlConnection& connection,
            const Output& output);

#endif  // KESTCTL_HANDLERS_H_
