// SPDX-License-Identifier: Apache-2.0

#include "kestctl/handlers.h"

#include <errno.h>
#include <fcntl.h>
#include <signal.h>
#include <string.h>
#include <sys/wait.h>
#include <unistd.h>

#include "kestctl/ExitStatus.h"
#include "kestctl/Reply.h"
#include "kestctl/Session.h"
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
int ask(const Command& command, const Args& args, Session& session, std::string* value) {
    std::string request = command.request;
    for (const std::string& arg : args) {
        request += " " + arg;
    }
    std::string line;
    const int status = session.connection.request(request, &line);
    if (status != ES_OK) {
        return session.output.failure(status, session.connection.failure());
    }
    Reply reply;
    if (!parse_reply(line, &reply) || (reply.code == 0 && !fits(command.reply, reply.value))) {
        return session.output.failure(ES_BAD_REPLY, "unexpected reply to " + request + ": " + line);
    }
    *value = reply.value;
    return reply.code == 0 ? static_cast<int>(ES_OK) : session.output.error_reply(reply.code);
}

// Every line is flushed when it is printed, so nothing is lost. Not exit(): it would flush
// once more, and block when nobody reads the output.
extern "C" void end_watch(int) {
    _exit(ES_OK);
}

// Runs the user's command with what happened as its parameters, and waits for its end, so that
// the commands run in the order of the events. What comes meanwhile waits in the socket.
void run_action(const Notification& notification, const Session& session) {
    const pid_t child = fork();
    if (child == 0) {
        // What kestctl is given is not the command's.
        const int nothing = open("/dev/null", O_RDONLY);
        if (nothing >= 0) {
            dup2(nothing, STDIN_FILENO);
            close(nothing);
        }
        execlp(session.action.c_str(), session.action.c_str(), notification.event(),
               notification.cp.c_str(), nullptr);
        session.output.remark(session.action + ": " + strerror(errno));
        _exit(127);
    }
    int status;
    pid_t ended = child;
    while (child > 0 && (ended = waitpid(child, &status, 0)) < 0 && errno == EINTR) {
    }
    if (ended < 0) {
        session.output.remark(session.action + ": " + strerror(errno));
        return;
    }
    if (status != 0) {
        const bool killed = WIFSIGNALED(status);
        session.output.remark(session.action + (killed ? ": ended by signal " : ": exit status ") +
                              std::to_string(killed ? WTERMSIG(status) : WEXITSTATUS(status)));
    }
}

}  // namespace

int run_request(const Command& command, const Args& args, Session& session) {
    std::string value;
    const int status = ask(command, args, session, &value);
    if (status == ES_OK) {
        value.empty() ? session.output.ok() : session.output.value(value);
    }
    return status;
}

int run_enable_log(const Command& command, const Args& args, Session& session) {
    std::string value;
    int status = ask(command, args, session, &value);
    std::string off;
    for (size_t i = 0; status == ES_OK && i < args.size(); ++i) {
        status = ask(*find_command("get-log-state"), {args[i]}, session, &value);
        if (status == ES_OK && value != "ON") {
            off += " " + args[i];
        }
    }
    if (status != ES_OK) {
        return status;
    }
    if (!off.empty()) {
        return session.output.failure(ES_STILL_OFF,
                                      "still off:" + off +
                                          " (the device is unknown, or the settings had no "
                                          "stream line for it when the service started)");
    }
    session.output.ok();
    return ES_OK;
}

int run_status(const Command&, const Args&, Session& session) {
    Output::Table settings, logs, iqs;
    std::string value;
    for (const Command& getter : commands()) {
        if ((getter.reply != RK_NUMBER && getter.reply != RK_WORD) || getter.run != run_request) {
            continue;
        }
        if (getter.params->max == 0) {
            const int status = ask(getter, {}, session, &value);
            if (status != ES_OK) {
                return status;
            }
            settings.emplace_back(getter.name.substr(strlen("get-")), value);
            continue;
        }
        for (size_t i = 0; const char* cp = param_word(PK_CP, i); ++i) {
            const int status = ask(getter, {cp}, session, &value);
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
        session.output.remark(reason);
    }
    settings.emplace_back("md", !known ? UNKNOWN : file.md ? "ENABLE" : "DISABLE");
    for (size_t i = 0; const char* cp = param_word(PK_CP, i); ++i) {
        iqs.emplace_back(cp, !known ? UNKNOWN : file.iq[i].empty() ? "NONE" : file.iq[i]);
    }
    session.output.status(settings, logs, iqs);
    return ES_OK;
}

int run_watch(const Command& command, const Args& args, Session& session) {
    struct sigaction action = {};
    action.sa_handler = end_watch;
    sigaction(SIGINT, &action, nullptr);
    signal(SIGCHLD, SIG_DFL);  // ignored by the parent: statuses of actions would be lost

    session.connection.set_listener([&session](const Notification& n) {
        const bool printed = session.output.notification(n);
        if (printed && !session.action.empty()) {
            run_action(n, session);
        }
        return printed;
    });
    Args cps = args;
    for (size_t i = 0; args.empty() && param_word(PK_CP, i); ++i) {
        cps.push_back(param_word(PK_CP, i));
    }
    std::string value;
    for (const std::string& cp : cps) {
        const int status = ask(command, {cp, "DUMP"}, session, &value);
        if (status != ES_OK) {
            return status;
        }
    }
    session.connection.wait_without_limit();
    return session.output.failure(session.connection.listen(), session.connection.failure());
}

int run_raw(const Command&, const Args& args, Session& session) {
    std::string line;
    const int status = session.connection.request(args[0], &line);
    if (status != ES_OK) {
        return session.output.failure(status, session.connection.failure());
    }
    Reply reply;
    const bool valid = parse_reply(line, &reply);
    if (!session.output.json()) {
        session.output.line(line);
    } else if (valid && reply.code == 0) {
        reply.value.empty() ? session.output.ok() : session.output.value(reply.value);
    }
    if (!valid) {
        return session.output.failure(ES_BAD_REPLY, "unexpected reply: " + line);
    }
    return reply.code == 0 ? static_cast<int>(ES_OK) : session.output.error_reply(reply.code);
}
