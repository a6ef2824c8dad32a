// SPDX-License-Identifier: Apache-2.0
// What the commands of kestlog do. Each reads its options and parameters from the command line,
// prints everything and returns the exit status. The table in program.cpp has a row for each.
#ifndef KESTLOG_COMMANDS_H_
#define KESTLOG_COMMANDS_H_

class CommandLine;

int run_ls(const CommandLine& line);
int run_info(const CommandLine& line);
int run_verify(const CommandLine& line);
int run_frames(const CommandLine& line);
int run_follow(const CommandLine& line);
int run_report(const CommandLine& line);
int run_bundle(const CommandLine& line);
int run_join(const CommandLine& line);
int run_extract(const CommandLine& line);
int run_split(const CommandLine& line);
int run_export(const CommandLine& line);
int run_wav(const CommandLine& line);  // only with libsndfile
int run_sigmf(const CommandLine& line);

#endif  // KESTLOG_COMMANDS_H_
