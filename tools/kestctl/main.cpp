// kestctl: the command-line client of the service's control socket.
#include <getopt.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>

#include "kestctl/Commands.h"
#include "kestctl/ControlConnection.h"
#include "kestctl/ExitStatus.h"
#include "kestctl/Output.h"
#include "kestctl/completion.h"
#include "kestctl/options.h"

namespace {

// A number of seconds: 0 for no limit, a day at most.
bool parse_timeout(const char* text, double* timeout) {
    char* end;
    *timeout = strtod(text, &end);
    return *text && strspn(text, "0123456789.") == strlen(text) && *end == '\0' &&
           *timeout <= 86400;
}

void print_help() {
    printf(
        "usage: kestctl [options] command [parameters]\n"
        "Controls the running service kestmodem.\n\nOptions:\n");
    for (const Option& option : OPTIONS) {
        const std::string usage =
            std::string(option.name) + (option.param ? std::string(" ") + option.param : "");
        printf("  --%-31s %s\n", usage.c_str(), option.help);
    }
    printf("\nCommands:\n");
    for (const Command& command : commands()) {
        printf("  %-33s %s\n", command.usage().c_str(), command.help);
    }
    printf("\nNames of CPs, in any case:");
    for (size_t i = 0; param_word(PK_CP, i); ++i) {
        printf(" %s", param_word(PK_CP, i));
    }
    printf(
        "\n\nExit status:\n"
        "  %2d  done\n  %2d  wrong usage, nothing was sent\n  %2d  no connection\n"
        "  %2d  no reply in time\n  %2d  unexpected reply, or the connection was closed\n"
        "  %2d  the result could not be written\n  %2d  enable-log: a CP is not logged all the "
        "same\n",
        ES_OK, ES_USAGE, ES_NO_CONNECTION, ES_TIMEOUT, ES_BAD_REPLY, ES_OUTPUT, ES_STILL_OFF);
    for (int code = 1; code <= MAX_ERROR_CODE; ++code) {
        printf("  %2d  error %d: %s\n", ES_SERVICE_ERROR + code, code, error_meaning(code));
    }
}

int usage_error(const Command* command, const std::string& reason) {
    if (!reason.empty()) {
        fprintf(stderr, "kestctl: %s\n", reason.c_str());
    }
    if (command) {
        fprintf(stderr, "usage: kestctl %s\n", command->usage().c_str());
    } else {
        fprintf(stderr, "usage: kestctl [options] command [parameters]; see kestctl --help\n");
    }
    return ES_USAGE;
}

int run(int argc, char** argv) {
    std::vector<struct option> long_options;
    for (const Option& option : OPTIONS) {
        long_options.push_back(
            {option.name, option.param ? required_argument : no_argument, nullptr, option.id});
    }
    long_options.push_back({nullptr, 0, nullptr, 0});

    double timeout = -1;
    bool json = false;
    bool help = false;
    for (int opt; (opt = getopt_long(argc, argv, "h", long_options.data(), nullptr)) != -1;) {
        switch (opt) {
            case OPT_JSON:
                json = true;
                break;
            case OPT_TIMEOUT:
                if (!parse_timeout(optarg, &timeout)) {
                    return usage_error(nullptr, std::string("'") + optarg +
                                                    "' is no number of seconds up to 86400");
                }
                break;
            case OPT_VERSION:
                printf("kestctl %s\n", KEST_VERSION);
                return ES_OK;
            case OPT_HELP:
                help = true;
                break;
            default:
                return usage_error(nullptr, "");  // getopt_long has said why
        }
    }
    if (help) {
        print_help();
        return ES_OK;
    }
    if (optind == argc) {
        return usage_error(nullptr, "no command given");
    }
    const Command* command = find_command(argv[optind]);
    if (!command) {
        return usage_error(nullptr, std::string("no command '") + argv[optind] + "'");
    }
    Args args(argv + optind + 1, argv + argc);
    std::string reason;
    if (!check_args(*command, &args, &reason)) {
        return usage_error(command, reason);
    }
    if (timeout < 0) {
        // The line of raw is a request, too.
        const bool is_raw = command->request.empty() && !args.empty();
        timeout = default_timeout(is_raw ? args[0] : command->request);
    }

    const Output output(json);
    ControlConnection connection;
    const int status = connection.open(timeout);
    if (status != ES_OK) {
        return output.failure(status, connection.failure());
    }
    return command->run(*command, args, connection, output);
}

}  // namespace

int main(int argc, char** argv) {
    if (argc > 1 && strcmp(argv[1], COMPLETE_OPTION) == 0) {
        print_completions(std::vector<std::string>(argv + 2, argv + argc));
        return ES_OK;
    }
    const int status = run(argc, argv);
    if ((fflush(stdout) != 0 || ferror(stdout)) && status == ES_OK) {
        perror("kestctl: standard output");
        return ES_OUTPUT;
    }
    return status;
}
