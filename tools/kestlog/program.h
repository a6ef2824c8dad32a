// SPDX-License-Identifier: Apache-2.0
// The whole of kestlog: its table of commands and options.
#ifndef KESTLOG_PROGRAM_H_
#define KESTLOG_PROGRAM_H_

// Runs the command of the command line and prints everything; returns the exit status. May be
// called again.
int run_program(int argc, char** argv);

#endif  // KESTLOG_PROGRAM_H_
