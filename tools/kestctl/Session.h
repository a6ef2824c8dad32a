// SPDX-License-Identifier: Apache-2.0
// What a command of kestctl works with: the connection, what it prints through, and what the
// user wants to have done. main owns it.
#ifndef KESTCTL_SESSION_H_
#define KESTCTL_SESSION_H_

#include <string>

#include "kestctl/ControlConnection.h"
#include "kestctl/Output.h"

struct Session {
    Session(const Output& printer, const std::string& command) : output(printer), action(command) {}

    ControlConnection connection;
    const Output output;
    const std::string action;  // the program that watch runs for a notification, or empty
};

#endif  // KESTCTL_SESSION_H_
