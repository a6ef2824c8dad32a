// SPDX-License-Identifier: Apache-2.0
// Runs another program to its end.
#ifndef SIM_RUN_PROGRAM_H_
#define SIM_RUN_PROGRAM_H_

#include <string>
#include <vector>

// args begin with the program's path. Its exit status, -1 when it cannot be run or ends by
// a signal. *output gets what it prints, errors included.
int run_program(const std::vector<std::string>& args, std::string* output);

#endif  // SIM_RUN_PROGRAM_H_
