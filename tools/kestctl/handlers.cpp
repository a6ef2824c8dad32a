// SPDX-License-Identifier: Apache-2.0

#include "kestctl/handlers.h"

#include <signal.h>
#include <string.h>
#include <unistd.h>

#include "kestctl/ControlConnection.h"
#include "kestctl/ExitStatus.h"
#include "kestctl/Output.h"
#include "kestctl/Reply.h"
#include "kestctl/SettingsFile.h"

namespace {

// Shown for a setting that could not be read.
const char UNKNOWN[] = "UNKNOWN";

bool fits(ReplyKind kind, const std::string& value) {
    switch (kind) {
        case RK_NUMBER:
            return is_number(value);
        case RK_WORD:
            return !value.empty();
        default:
            return value.empty();
    }
}

// Sends the command's request and stores the value of the reply. Prints only failures.
int ask(const Command& command, const Args& args, ControlConnection& connection,
        const Output& output, std::string* value) {
    std::string request = command.request;
    for (const std::string& arg : args) {
        request += " " + arg;
    }
    std::string line;
    const int status = connection.request(request, &line);
    if (status != ES_OK) {
        return output.failure(status, connection.failure());
    }
    Reply reply;
    if (!parse_reply(line, &reply) || (reply.code == 0 && !fits(command.reply, reply.value))) {
        return output.failure(ES_BAD_REPLY, "unexpected reply to " + request + ": " + line);
    }
    *value = reply.value;
    return reply.code == 0 ? static_cast<int>(ES_OK) : output.error_reply(reply.code);
}

// Every line is flushed when it is printed, so nothing is lost. Not exit(): it would flush
// once more, and block when nobody reads the output.
extern "C" void end_watch(int) {
    _exit(ES_OK);
}

}  // namespace

int run_request(const Command& command, const Args& args, ControlConnection& connection,
                const Output& output) {
    std::string value;
    const int status = ask(command, args, connection, output, &value);
    if (status == ES_OK) {
        value.empty() ? output.ok() : output.value(value);
    }
    return status;
}

int run_enable_log(const Command& command, const Args& args, ControlConnection& connection,
                   const Output& output) {
    std::string value;
    int status = ask(command, args, connection, output, &value);
    std::string off;
    for (size_t i = 0; status == ES_OK && i < args.size(); ++i) {
        status = ask(*find_command("get-log-state"), {args[i]}, connection, output, &value);
        if (status == ES_OK && value != "ON") {
            off += " " + args[i];
        }
    }
    if (status != ES_OK) {
        return status;
    }
    if (!off.empty()) {
        return output.failure(ES_STILL_OFF, "still off:" + off +
                                                " (the device is unknown, or the settings had no "
                                                "stream line for it when the service started)");
    }
    output.ok();
    return ES_OK;
}

int run_status(const Command&, const Args&, ControlConnection& connection, const Output& output) {
    Output::Table settings, logs, iqs;
    std::string value;
    for (const Command& getter : commands()) {
        if ((getter.reply != RK_NUMBER && getter.reply != RK_WORD) || getter.run != run_request) {
            continue;
        }
        if (getter.params->max == 0) {
            const int status = ask(getter, {}, connection, output, &value);
            if (status != ES_OK) {
                return status;
            }
            settings.emplace_back(getter.name.substr(strlen("get-")), value);
            continue;
        }
        for (size_t i = 0; const char* cp = param_word(PK_CP, i); ++i) {
            const int status = ask(getter, {cp}, connection, output, &value);
            if (status != ES_OK) {
                return status;
            }
            logs.emplace_back(cp, value);
        }
    }
    FileSettings file;
    std::string reason;
    const bool known = file.read(&reason);
    if (!known) {
        output.remark(reason);
    }
    settings.emplace_back("md", !known ? UNKNOWN : file.md ? "ENABLE" : "DISABLE");
    for (size_t i = 0; const char* cp = param_word(PK_CP, i); ++i) {
        iqs.emplace_back(cp, !known ? UNKNOWN : file.iq[i].empty() ? "NONE" : file.iq[i]);
    }
    output.status(settings, logs, iqs);
    return ES_OK;
}

int run_watch(const Command& command, const Args& args, ControlConnection& connection,
              const Output& output) {
    struct sigaction action = {};
    action.sa_handler = end_watch;
    sigaction(SIGINT, &action, nullptr);

    connection.set_listener([&output](const Notification& n) { output.notification(n); });
    Args cps = args;
    for (size_t i = 0; args.empty() && param_word(PK_CP, i); ++i) {
        cps.push_back(param_word(PK_CP, i));
    }
    std::string value;
    for (const std::string& cp : cps) {
        const int status = ask(command, {cp, "DUMP"}, connection, output, &value);
        if (status != ES_OK) {
            return status;
        }
    }
    connection.wait_without_limit();
    return output.failure(connection.listen(), connection.failure());
}

int run_raw(const Command&, const Args& args, ControlConnection& connection, const Output& output) {
    std::string line;
    const int status = connection.request(args[0], &line);
    if (status != ES_OK) {
        return output.failure(status, connection.failure());
    }
    Reply reply;
    const bool valid = parse_reply(line, &reply);
    if (!output.json()) {
        output.line(line);
    } else if (valid && reply.code == 0) {
        reply.value.empty() ? output.ok() : output.value(reply.value);
    }
    if (!valid) {
        return output.failure(ES_BAD_REPLY, "unexpected reply: " + line);
    }
    return reply.code == 0 ? static_cast<int>(ES_OK) : output.error_reply(reply.code);
}
