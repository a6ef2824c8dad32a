// SPDX-License-Identifier: Apache-2.0

#include "kestctl/Commands.h"

#include <ctype.h>
#include <stdint.h>
#include <strings.h>

#include <algorithm>
#include <string_view>

#include "config/CpType.h"
#include "kestctl/Reply.h"
#include "kestctl/handlers.h"

namespace {

constexpr int TIMEOUT = 10;
// For RK_LATER: the CP has to deliver the data first.
constexpr int SAVE_TIMEOUT = 60;

// clang-format off
constexpr ParamForm FORMS[] = {
    // the request's       the command's
    {"",                  "",                  0, 0, {PK_CP, PK_CP},       nullptr},
    {"CP",                "CP",                1, 1, {PK_CP, PK_CP},       nullptr},
    {"CP...",             "CP...",             1, MAX_REQUEST_CPS, {PK_CP, PK_CP}, nullptr},
    {"CP WCDMA",          "CP [WCDMA]",        1, 2, {PK_CP, PK_IQ},       "WCDMA"},
    {"CP [WCDMA]",        "CP [WCDMA]",        1, 2, {PK_CP, PK_IQ},       "WCDMA"},
    {"CP DUMP",           "[CP...]",           0, CP_TYPE_NUM, {PK_CP, PK_CP}, nullptr},
    {"MB",                "MB",                1, 1, {PK_MB, PK_MB},       nullptr},
    {"INTERNAL|EXTERNAL", "INTERNAL|EXTERNAL", 1, 1, {PK_PLACE, PK_PLACE}, nullptr},
};
// clang-format on
constexpr ParamForm RAW_FORM = {nullptr, "'LINE'", 1, 1, {PK_LINE, PK_LINE}, nullptr};

// The row for the parameters of a request, or null.
constexpr const ParamForm* find_form(std::string_view params) {
    for (const ParamForm& form : FORMS) {
        if (params == form.params) {
            return &form;
        }
    }
    return nullptr;
}

constexpr bool all_forms_known() {
    for (const ControlRequest& request : CONTROL_REQUESTS) {
        if (!find_form(request.params)) {
            return false;
        }
    }
    return true;
}
static_assert(all_forms_known(), "a request has parameters that kestctl does not know");

// Has no command: a subscription ends with the connection. watch sends SUBSCRIBE.
bool is_subscription(const ControlRequest& request) {
    return find_form(request.params) == find_form("CP DUMP");
}

// "get-log-state" for GET_LOG_STATE, "reload" for kestctl reload.
std::string command_name(const std::string& words) {
    std::string name = words.substr(words.find(' ') + 1);
    for (char& c : name) {
        c = c == '_' ? '-' : static_cast<char>(tolower(c));
    }
    return name;
}

std::vector<Command> make_commands() {
    std::vector<Command> all = {
        {"status", "", find_form(""), RK_OK, run_status,
         "print every setting and the log state of every CP"},
        {"watch", "SUBSCRIBE", find_form("CP DUMP"), RK_OK, run_watch,
         "print when memory dumps of these CPs (or any) start and end, until Ctrl-C"},
    };
    for (const ControlRequest& request : CONTROL_REQUESTS) {
        if (!is_subscription(request)) {
            const bool checks = request.keyword() == "ENABLE_LOG";
            all.push_back({command_name(request.words), request.words, find_form(request.params),
                           request.reply, checks ? run_enable_log : run_request, request.help});
        }
    }
    all.push_back({"raw", "", &RAW_FORM, RK_WORD, run_raw,
                   "send the line unchanged and print the line that answers it"});
    return all;
}

}  // namespace

const std::vector<Command>& commands() {
    static const std::vector<Command> all = make_commands();
    return all;
}

const Command* find_command(const std::string& name) {
    for (const Command& command : commands()) {
        if (name == command.name) {
            return &command;
        }
    }
    return nullptr;
}

int default_timeout(const std::string& line) {
    const std::string word = line.substr(std::min(line.find_first_not_of(" \t\r"), line.size()));
    for (const ControlRequest& request : CONTROL_REQUESTS) {
        if (request.reply == RK_LATER &&
            request.keyword() == word.substr(0, word.find_first_of(" \t\r"))) {
            return SAVE_TIMEOUT;
        }
    }
    return TIMEOUT;
}

const char* param_word(ParamKind kind, size_t i) {
    static const char* const PLACES[] = {"INTERNAL", "EXTERNAL"};
    switch (kind) {
        case PK_CP:
            return i < CP_TYPE_NUM ? cp_type_to_request_name(static_cast<CpType>(i)) : nullptr;
        case PK_PLACE:
            return i < 2 ? PLACES[i] : nullptr;
        case PK_IQ:
            return i < 1 ? "WCDMA" : nullptr;
        default:
            return nullptr;
    }
}

Args next_words(const std::string& name, const Args& args) {
    const Command* const command = find_command(name);
    Args words;
    if (!command || args.size() >= command->params->max) {
        return words;
    }
    const ParamKind kind = command->params->kinds[!args.empty()];
    for (size_t i = 0; const char* word = param_word(kind, i); ++i) {
        // A name may not be given twice; the I/Q type WCDMA may follow the CP WCDMA.
        const bool given = std::any_of(args.begin(), args.end(), [word](const std::string& arg) {
            return strcasecmp(arg.c_str(), word) == 0;
        });
        if (kind != command->params->kinds[0] || !given) {
            words.push_back(word);
        }
    }
    return words;
}

namespace {

// Of the kinds that have words.
constexpr const char* KIND_NAMES[] = {"co-processor", "I/Q type", "medium"};

// Checks one parameter and gives it the spelling of the service.
bool check_arg(ParamKind kind, std::string* arg, std::string* reason) {
    if (kind == PK_MB) {
        *reason =
            "'" + *arg + "' is not a whole number of megabytes up to " + std::to_string(UINT32_MAX);
        return is_number(*arg);
    }
    if (kind == PK_LINE) {
        *reason = "a request is one non-blank line of at most " + std::to_string(MAX_REQUEST_LEN) +
                  " bytes";
        return arg->find('\n') == std::string::npos && arg->size() <= MAX_REQUEST_LEN &&
               arg->find_first_not_of(" \t\r") != std::string::npos;
    }
    *reason = "unknown " + std::string(KIND_NAMES[kind]) + " '" + *arg + "'; expected one of:";
    for (size_t i = 0; const char* word = param_word(kind, i); ++i) {
        if (strcasecmp(word, arg->c_str()) == 0) {
            *arg = word;
            return true;
        }
        *reason += std::string(i == 0 ? " " : ", ") + word;
    }
    return false;
}

}  // namespace

bool check_args(const Command& command, Args* args, std::string* reason) {
    const ParamForm& form = *command.params;
    if (args->size() < form.min || args->size() > form.max) {
        *reason = args->size() < form.min ? "a parameter is missing" : "too many parameters";
        return false;
    }
    for (size_t i = 0; i < args->size(); ++i) {
        std::string& arg = (*args)[i];
        const ParamKind kind = form.kinds[i > 0];
        if (!check_arg(kind, &arg, reason)) {
            return false;
        }
        const auto this_one = args->begin() + static_cast<Args::difference_type>(i);
        if (kind == form.kinds[0] && std::find(args->begin(), this_one, arg) != this_one) {
            *reason = "'" + arg + "' is given twice";
            return false;
        }
    }
    if (form.fill && args->size() < form.max) {
        args->push_back(form.fill);
    }
    return true;
}
