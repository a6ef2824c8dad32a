// kestlog: reads and checks what the service writes.
#include <getopt.h>
#include <stdio.h>
#include <string.h>

#include <vector>

#include "kestlog/Commands.h"
#include "kestlog/ExitStatus.h"
#include "kestlog/Report.h"

namespace {

// As the first argument it asks for what the last word may become. For scripts only.
constexpr char COMPLETE_OPTION[] = "--complete";

const Command* find_command(const std::string& name) {
    for (const Command& command : COMMANDS) {
        if (name == command.name) {
            return &command;
        }
    }
    return nullptr;
}

void print_help() {
    printf(
        "usage: kestlog [options] command ROOT|FILE\n"
        "Reads and checks what the service kestmodem writes.\n\nCommands:\n");
    for (const Command& command : COMMANDS) {
        printf("  %-6s %-12s %s\n", command.name, command.param, command.help);
    }
    printf("\nOptions:\n");
    for (const Option& option : OPTIONS) {
        const std::string usage =
            std::string(option.name) + (option.param ? std::string(" ") + option.param : "");
        printf("  --%-17s %s%s%s\n", usage.c_str(), option.command ? option.command : "",
               option.command ? ": " : "", option.help);
    }
    printf(
        "\nROOT is a medium's top directory, its modem_log, a set or a CP's directory.\n"
        "\nExit status:\n  %d  fine\n  %d  wrong usage\n  %d  something could not be read\n"
        "  %d  damage found\n  %d  the output could not be written, or it exists\n",
        ES_OK, ES_USAGE, ES_UNREADABLE, ES_DAMAGE, ES_OUTPUT);
}

// Prints the completions of the last word; nothing where a path is due.
void complete(const std::vector<std::string>& words) {
    const std::string typed = words.empty() ? "" : words.back();
    const Command* command = nullptr;
    for (size_t i = 0; i + 1 < words.size(); ++i) {
        command = command ? command : find_command(words[i]);
    }
    const auto offer = [&typed](const std::string& word) {
        if (word.compare(0, typed.size(), typed) == 0) {
            printf("%s\n", word.c_str());
        }
    };
    if (!typed.empty() && typed[0] == '-') {
        for (const Option& option : OPTIONS) {
            if (!option.command || !command || strcmp(option.command, command->name) == 0) {
                offer(std::string("--") + option.name);
            }
        }
    } else if (!command && (words.size() < 2 || words[words.size() - 2] != "--output")) {
        for (const Command& each : COMMANDS) {
            offer(each.name);
        }
    }
}

int usage_error(const std::string& reason) {
    if (!reason.empty()) {
        failure(ES_USAGE, reason);
    }
    fprintf(stderr, "usage: kestlog [options] command ROOT|FILE; see kestlog --help\n");
    return ES_USAGE;
}

int run(int argc, char** argv) {
    std::vector<struct option> long_options;
    for (const Option& option : OPTIONS) {
        long_options.push_back(
            {option.name, option.param ? required_argument : no_argument, nullptr, option.id});
    }
    long_options.push_back({nullptr, 0, nullptr, 0});
    Settings settings;
    const char* only = nullptr;  // the command that an option given is for
    int index = 0;
    for (int opt; (opt = getopt_long(argc, argv, "h", long_options.data(), &index)) != -1;) {
        switch (opt) {
            case OPT_HELP:
                print_help();
                return ES_OK;
            case OPT_VERSION:
                printf("kestlog %s\n", KEST_VERSION);
                return ES_OK;
            case OPT_JSON:
                settings.json = true;
                break;
            case OPT_FORCE:
                settings.force = true;
                break;
            case OPT_OUTPUT:
                settings.output = optarg;
                break;
            default:
                return usage_error("");  // getopt_long has said why
        }
        only = OPTIONS[index].command ? OPTIONS[index].command : only;
    }
    if (optind == argc) {
        return usage_error("no command given");
    }
    const Command* command = find_command(argv[optind]);
    if (!command) {
        return usage_error(std::string("no command '") + argv[optind] + "'");
    }
    if (argc - optind != 2 || !*argv[optind + 1]) {
        return usage_error(std::string(command->name) + " takes one " + command->param);
    }
    if (only && strcmp(only, command->name) != 0) {
        return usage_error(std::string("an option is only for ") + only);
    }
    return command->run(argv[optind + 1], settings);
}

}  // namespace

int main(int argc, char** argv) {
    if (argc > 1 && strcmp(argv[1], COMPLETE_OPTION) == 0) {
        complete(std::vector<std::string>(argv + 2, argv + argc));
        return ES_OK;
    }
    const int status = run(argc, argv);
    if (fflush(stdout) != 0 || ferror(stdout)) {
        perror("kestlog: standard output");
        return ES_OUTPUT;
    }
    return status;
}
