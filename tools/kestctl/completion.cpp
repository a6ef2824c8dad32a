#include "kestctl/completion.h"

#include <stdio.h>
#include <strings.h>

#include <algorithm>

#include "kestctl/Commands.h"
#include "kestctl/options.h"

namespace {

// Case does not matter: neither does it to the names of CPs on a command line.
void offer(const std::string& candidate, const std::string& typed) {
    if (strncasecmp(candidate.c_str(), typed.c_str(), typed.size()) == 0) {
        printf("%s\n", candidate.c_str());
    }
}

bool given(const Args& args, const char* word) {
    return std::any_of(args.begin(), args.end(), [word](const std::string& arg) {
        return strcasecmp(arg.c_str(), word) == 0;
    });
}

bool takes_param(const std::string& word) {
    return std::any_of(std::begin(OPTIONS), std::end(OPTIONS), [&word](const Option& option) {
        return option.param && word == std::string("--") + option.name;
    });
}

}  // namespace

void print_completions(std::vector<std::string> words) {
    const std::string typed = words.empty() ? "" : words.back();
    Args args;  // the command and its parameters, without options
    for (size_t i = 0; i + 1 < words.size(); ++i) {
        if (takes_param(words[i])) {
            if (++i + 1 == words.size()) {
                return;  // the option's parameter is being typed
            }
        } else if (words[i].empty() || words[i][0] != '-') {
            args.push_back(words[i]);
        }
    }
    if (!typed.empty() && typed[0] == '-') {
        for (const Option& option : OPTIONS) {
            offer(std::string("--") + option.name, typed);
        }
        return;
    }
    if (args.empty()) {
        for (const Command& command : commands()) {
            offer(command.name, typed);
        }
        return;
    }
    const Command* command = find_command(args[0]);
    args.erase(args.begin());
    if (!command || args.size() >= command->params->max) {
        return;
    }
    const ParamKind kind = command->params->kinds[!args.empty()];
    for (size_t i = 0; const char* word = param_word(kind, i); ++i) {
        // No name may be given twice, unless it is one of another kind.
        if (kind != command->params->kinds[0] || !given(args, word)) {
            offer(word, typed);
        }
    }
}
