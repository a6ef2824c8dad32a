// The options of kestctl, for the parser, --help and completion.
#ifndef KESTCTL_OPTIONS_H_
#define KESTCTL_OPTIONS_H_

enum OptionId : int { OPT_HELP = 'h', OPT_JSON = 256, OPT_TIMEOUT, OPT_VERSION };

struct Option {
    OptionId id;
    const char* name;
    const char* param;  // null without one
    const char* help;
};

// clang-format off
constexpr Option OPTIONS[] = {
    {OPT_HELP,    "help",    nullptr,   "this text"},
    {OPT_JSON,    "json",    nullptr,   "print results and errors as JSON, one object a line"},
    {OPT_TIMEOUT, "timeout", "SECONDS", "wait so long (default 10, save-* 60; 0: no limit)"},
    {OPT_VERSION, "version", nullptr,   "print the version"},
};
// clang-format on

#endif  // KESTCTL_OPTIONS_H_
