// SPDX-License-Identifier: Apache-2.0
// What the commands do once the connection is open: Command::run.
#ifndef KESTCTL_HANDLERS_H_
#define KESTCTL_HANDLERS_H_

#include "kestctl/Commands.h"

// Sends the command's request with the parameters and prints the reply.
int run_request(const Command& command, const Args& args, Session& session);

// As run_request, then asks whether the CPs are logged now: the service also answers OK for
// a CP that it cannot log.
int run_enable_log(const Command& command, const Args& args, Session& session);

// Asks for every setting and for the log state of every CP. What no request returns is
// read from the settings file, and shown as UNKNOWN when that cannot be read.
int run_status(const Command& command, const Args& args, Session& session);

// Subscribes, prints notifications and runs the session's action for each of them, until SIGINT
// ends the program with status 0.
int run_watch(const Command& command, const Args& args, Session& session);

// Sends the line unchanged and prints the reply unchanged.
int run_raw(const Command& command, const Args& args, Session& session);

#endif  // KESTCTL_HANDLERS_H_
