// The commands and options of kestlog in tables. Dispatch, --help and completion all come
// from them.
#ifndef KESTLOG_COMMANDS_H_
#define KESTLOG_COMMANDS_H_

#include <string>

// What the options say.
struct Settings {
    bool json = false;
    bool force = false;
    std::string output = ".";
};

struct Command {
    const char* name;
    const char* param;  // every command takes one
    // Prints everything; returns the exit status.
    int (*run)(const std::string& path, const Settings&);
    const char* help;
};

enum OptionId : int { OPT_HELP = 'h', OPT_JSON = 256, OPT_OUTPUT, OPT_FORCE, OPT_VERSION };

struct Option {
    OptionId id;
    const char* name;
    const char* param;    // null without one
    const char* command;  // the only one that takes it, or null
    const char* help;
};

int run_ls(const std::string& path, const Settings& settings);
int run_info(const std::string& path, const Settings& settings);
int run_verify(const std::string& path, const Settings& settings);
int run_frames(const std::string& path, const Settings& settings);
int run_split(const std::string& path, const Settings& settings);

// clang-format off
constexpr Command COMMANDS[] = {
    {"ls",     "ROOT", run_ls,     "list sets, CPs and files with sizes and time spans"},
    {"info",   "FILE", run_info,   "tell what a file is, its time record, frames and damage"},
    {"verify", "ROOT", run_verify, "check names, numbers, headers and frames of all files"},
    {"frames", "FILE", run_frames, "list the frames, or an audio DSP log's chunks"},
    {"split",  "FILE", run_split,  "write an audio DSP log's log, PCM and dump data to files"},
};

constexpr Option OPTIONS[] = {
    {OPT_HELP,    "help",    nullptr, nullptr, "this text"},
    {OPT_JSON,    "json",    nullptr, nullptr, "print results as JSON, one object a line"},
    {OPT_OUTPUT,  "output",  "DIR",   "split", "write the files there, not here"},
    {OPT_FORCE,   "force",   nullptr, "split", "replace files that exist"},
    {OPT_VERSION, "version", nullptr, nullptr, "print the version"},
};
// clang-format on

#endif  // KESTLOG_COMMANDS_H_
