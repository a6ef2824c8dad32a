// SPDX-License-Identifier: Apache-2.0

#include "simulation/Clients.h"

#include <errno.h>
#include <poll.h>
#include <stdlib.h>
#include <string.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <utility>
#include <vector>

#include "sim/local_socket.h"
#include "simulation/Calls.h"
#include "simulation/Ledger.h"
#include "simulation/World.h"

namespace {

enum Kind {
    DOES,     // OK
    MAY,      // OK or this error: it depends on what is going on
    WRONG,    // this error
    TELLS,    // OK; dumps of the stream are told from now on, or not
    SETS,     // OK; sets the setting to the argument
    GETS,     // OK and the setting
    RELOADS,  // OK; switches the logging of streams as the other service's file says
    SAVES     // OK or an error, when the transaction ends; the argument when the CP refuses
};

struct Request {
    std::string text;
    Kind kind;
    unsigned what;  // setting, LOGGED + stream, stream or error
    unsigned argument;
};

// The logging of the streams are settings like others.
constexpr unsigned LOGGED = SETTING_COUNT;

Setting* setting_of(unsigned what) {
    return what < LOGGED ? &g_state->settings[what] : &g_state->streams[what - LOGGED].logged;
}

const char* const CP_NAMES[CHANNEL_COUNT] = {"WCDMA", "WCN", "GNSS", "AG-DSP"};

std::vector<Request> make_requests() {
    std::vector<Request> requests = {
        {"FLUSH", DOES, 0, 0},
        {"GET_LOG_FILE_SIZE", GETS, SET_FILE_MB, 0},
        {"GET_DATA_MAX_SIZE", GETS, SET_DATA_MB, 0},
        {"GET_SD_MAX_SIZE", GETS, SET_CARD_MB, 0},
        {"GET_LOG_OVERWRITE", GETS, SET_OVERWRITE, 0},
        {"GET_MD_STOR_POS", GETS, SET_MD_INTERNAL, 0},
        {"SET_LOG_FILE_SIZE 1", SETS, SET_FILE_MB, 1},
        {"SET_LOG_FILE_SIZE 2", SETS, SET_FILE_MB, 2},
        {"SET_DATA_MAX_SIZE 0", SETS, SET_DATA_MB, 0},
        {"SET_DATA_MAX_SIZE 4", SETS, SET_DATA_MB, 4},
        {"SET_DATA_MAX_SIZE\t12", SETS, SET_DATA_MB, 12},
        {"SET_SD_MAX_SIZE 4", SETS, SET_CARD_MB, 4},
        {"SET_SD_MAX_SIZE 14", SETS, SET_CARD_MB, 14},
        {"ENABLE_LOG_OVERWRITE", SETS, SET_OVERWRITE, 1},
        {"DISABLE_LOG_OVERWRITE", SETS, SET_OVERWRITE, 0},
        {"SET_MD_STOR_POS INTERNAL", SETS, SET_MD_INTERNAL, 1},
        {"SET_MD_STOR_POS EXTERNAL", SETS, SET_MD_INTERNAL, 0},
        {"ENABLE_MD", DOES, 0, 0},
        {"DISABLE_MD", DOES, 0, 0},
        {"MINI_DUMP", WRONG, 3, 0},
        {"GET_LOG_STATE NONE", WRONG, 9, 0},
        {"kestctl clear", MAY, 4, 0},
        {"kestctl reload", RELOADS, 0, 0},
        {"ENABLE_IQ WCDMA WCDMA", DOES, 0, 0},
        {"ENABLE_IQ WCDMA GSM", WRONG, 2, 0},
        {"DISABLE_IQ WCDMA", MAY, 3, 0},
        {"SUBSCRIBE WCDMA DUMP", TELLS, ST_WCDMA, 1},
        {"SUBSCRIBE WCN DUMP", TELLS, ST_WCN, 1},
        {"UNSUBSCRIBE WCN DUMP", TELLS, ST_WCN, 0},
        {"NONSENSE", WRONG, 1, 0},
        {"kestctl", WRONG, 1, 0},
        {"SET_LOG_FILE_SIZE ten", WRONG, 2, 0},
        {"FLUSH now", WRONG, 1, 0},
    };
    for (unsigned stream = 0; stream < CHANNEL_COUNT; ++stream) {
        const std::string name = CP_NAMES[stream];
        // As often as it is switched off and looked at, so that most streams flow.
        requests.push_back({"ENABLE_LOG " + name, SETS, LOGGED + stream, 1});
        requests.push_back({"ENABLE_LOG " + name, SETS, LOGGED + stream, 1});
        requests.push_back({"DISABLE_LOG " + name, SETS, LOGGED + stream, 0});
        requests.push_back({"GET_LOG_STATE " + name, GETS, LOGGED + stream, 0});
        if (stream != ST_DSP) {
            requests.push_back({"SAVE_RINGBUF " + name, SAVES, LOGGED + stream, 7});
            requests.push_back({"SAVE_SLEEP_LOG " + name, SAVES, LOGGED + stream, 6});
        }
    }
    return requests;
}

const std::vector<Request> REQUESTS = make_requests();
// The transactions' own limit is 33 seconds; a queue of them and a dump may come before.
constexpr int64_t MAX_WAIT_NS = int64_t{300} * 1000000000;
// 20 pieces of a modem's dump may come 2.5 seconds apart. The external chip's dump has no limit.
constexpr int64_t MAX_DUMP_NS = int64_t{120} * 1000000000;

const Request& request_of(uint64_t index) {
    return REQUESTS[static_cast<size_t>(index % REQUESTS.size())];
}

std::string value_text(unsigned which, unsigned value) {
    static const char* const WORDS[][2] = {
        {"DISABLE", "ENABLE"}, {"EXTERNAL", "INTERNAL"}, {"OFF", "ON"}};
    return "OK " + (which < SET_OVERWRITE ? std::to_string(value)
                                          : WORDS[std::min(which, LOGGED) - SET_OVERWRITE][value]);
}

unsigned value_of(unsigned which, const std::string& line) {
    return which < SET_OVERWRITE ? static_cast<unsigned>(strtoul(line.c_str() + 2, nullptr, 10))
                                 : line == value_text(which, 1);
}

bool is_error(const std::string& line, const char* codes) {
    return line.size() == 7 && line.compare(0, 6, "ERROR ") == 0 && strchr(codes, line[6]);
}

bool depends_on_setting(const Request& request) {
    return request.kind == GETS || request.kind == SAVES;
}

// What the request sets, each with its new value.
std::vector<std::pair<Setting*, unsigned>> set_by(const Request& request) {
    const uint32_t conf = g_state->kest_conf;
    switch (request.kind) {
        case SETS:
            return {{setting_of(request.what), request.argument}};
        case RELOADS:
            return {{&g_state->streams[ST_WCDMA].logged, conf & KEST_ON && conf & KEST_MODEM},
                    {&g_state->streams[ST_WCN].logged, conf & KEST_ON && conf & KEST_WCN}};
        default:
            return {};
    }
}

// Compares a value with what was set when it was asked for; one that was uncertain is known
// from now on, if it is the newest.
bool agrees(Setting& setting, unsigned value, const Setting& expected, bool contested,
            bool newest) {
    if (!expected.uncertain && !contested) {
        return value == expected.value;
    }
    if (setting.uncertain && !contested && newest) {
        setting.value = value;
        setting.uncertain = false;
    }
    return true;
}

bool acceptable(const Request& request, const std::string& line, const Setting& expected,
                bool contested, bool newest) {
    const std::string error = "ERROR " + std::to_string(request.what);
    switch (request.kind) {
        case DOES:
        case SETS:
        case TELLS:
            return line == "OK";
        case RELOADS:
            return line == "OK" || (g_state->faulted && is_error(line, "3"));
        case MAY:
            return line == "OK" || line == error;
        case SAVES:
            if (!expected.uncertain && !contested && (line == "ERROR 5") == (expected.value != 0)) {
                return false;
            }
            return line == "OK" || is_error(line, request.argument == 6 ? "34568" : "34578");
        case WRONG:
            return line == error;
        case GETS: {
            const unsigned value = value_of(request.what, line);
            return line == value_text(request.what, value) &&
                   agrees(*setting_of(request.what), value, expected, contested, newest);
        }
    }
    return false;
}

}  // namespace

uint64_t Clients::request_count() {
    return REQUESTS.size();
}

std::string Clients::request_text(uint64_t index) {
    return request_of(index).text;
}

uint64_t Clients::request_named(const char* text) {
    for (size_t index = 0; index < REQUESTS.size(); ++index) {
        if (REQUESTS[index].text == text) {
            return index;
        }
    }
    fail_run("simulation", "no request '%s' is known", text);
}

// Connects it. Requests behind one that waits for a transaction would be answered before it.
bool Clients::may_ask(Client& client) const {
    if (!client.asked.empty() && request_of(client.asked.back().index).kind == SAVES) {
        return false;
    }
    client.fd = client.fd >= 0 ? client.fd : connect_local("kestmodem", m_root);
    return client.fd >= 0 && client.rest.empty();
}

void Clients::drop(Client& client) {
    mark_uncertain(client);
    m_ghosts = m_ghosts || !client.asked.empty();
    if (client.fd >= 0) {
        close(client.fd);
    }
    client = Client();
    for (Client& other : m_clients) {
        for (Asked& asked : other.asked) {
            asked.at = g_state->boot_ns;  // it may have waited for this place
        }
    }
}

void Clients::ask(Client& client, uint64_t index) {
    const Request& request = request_of(index);
    bool contested = m_ghosts;
    for (Client& other : m_clients) {
        if (&other != &client && !other.asked.empty()) {
            contested = true;
            for (Asked& asked : other.asked) {
                asked.contested = true;
            }
        }
    }
    for (const auto& set : set_by(request)) {
        *set.first = {set.second, contested};
        if (request.kind == SETS && request.what < LOGGED) {
            g_state->save_failed = false;
        }
    }
    client.asked.push_back({index, g_state->boot_ns, contested,
                            depends_on_setting(request) ? *setting_of(request.what) : Setting()});
    ++g_state->counters.requests;
}

void Clients::send_text(Client& client, const std::string& text) {
    if (send(client.fd, text.data(), text.size(), MSG_NOSIGNAL) !=
        static_cast<ssize_t>(text.size())) {
        drop(client);
    }
}

void Clients::request(unsigned number, uint64_t index, bool in_pieces) {
    Client& client = m_clients[number % COUNT];
    if (!may_ask(client)) {
        return;
    }
    std::string text = request_of(index).text + (number < COUNT ? "\n" : std::string(1, '\0'));
    trace("client %u: %s", number % COUNT, request_of(index).text.c_str());
    ask(client, index);
    if (in_pieces) {
        client.rest = text.substr(text.size() / 2);
        text.resize(text.size() / 2);
    }
    send_text(client, text);
}

void Clients::flood(unsigned number, uint64_t index) {
    Client& client = m_clients[number % COUNT];
    if (!may_ask(client)) {
        return;
    }
    std::string text;
    for (uint64_t i = index; i < index + 10; ++i) {
        if (request_of(i).kind == SAVES) {
            continue;
        }
        text.append(request_of(i).text).append("\n");
        ask(client, i);
    }
    send_text(client, text);
}

void Clients::leave(unsigned number) {
    drop(m_clients[number % COUNT]);
}

void Clients::finish_pieces() {
    for (Client& client : m_clients) {
        if (client.fd >= 0 && !client.rest.empty()) {
            const std::string rest = client.rest;
            client.rest.clear();
            if (!client.asked.empty()) {
                client.asked.back().at = g_state->boot_ns;
            }
            send_text(client, rest);
        }
    }
}

void Clients::pump() {
    // One look at all: a read that finds nothing costs more.
    struct pollfd fds[COUNT];
    for (unsigned i = 0; i < COUNT; ++i) {
        fds[i] = {m_clients[i].fd, POLLIN, 0};
    }
    if (poll(fds, COUNT, 0) <= 0) {
        return;
    }
    for (unsigned i = 0; i < COUNT; ++i) {
        Client& client = m_clients[i];
        char bytes[1024];
        while (fds[i].revents && client.fd >= 0) {
            const ssize_t n = recv(client.fd, bytes, sizeof(bytes), 0);
            if (n <= 0) {
                if (n == 0 || errno != EAGAIN) {
                    if (!g_state->fault_seen) {
                        fail_run("reply", "a client was disconnected");
                    }
                    drop(client);
                }
                break;
            }
            client.received.append(bytes, static_cast<size_t>(n));
            for (size_t end; (end = client.received.find('\n')) != std::string::npos;) {
                const std::string line = client.received.substr(0, end);
                client.received.erase(0, end + 1);
                take_line(client, line);
            }
        }
    }
}

void Clients::take_line(Client& client, const std::string& line) {
    trace("reply %s", line.c_str());
    if (line.compare(0, 8, "CP_DUMP_") == 0) {
        take_notice(client, line);
        return;
    }
    ++g_state->counters.replies;
    if (client.asked.empty()) {
        fail_run("reply", "'%s' answers no request", line.c_str());
    }
    std::string request;
    do {
        const Asked asked = client.asked.front();
        client.asked.pop_front();
        request = request_of(asked.index).text;
        const Request& done = request_of(asked.index);
        // What is still to be carried out may change the value that was asked for.
        const bool newest = std::none_of(
            client.asked.begin(), client.asked.end(),
            [](const Asked& later) { return !set_by(request_of(later.index)).empty(); });
        if (acceptable(done, line, asked.expected, asked.contested, newest)) {
            if (done.kind == SAVES && line == "OK") {
                world().check_saved(done.what - LOGGED,
                                    done.argument == 6 ? "_sleeplog_" : "_ringbuf_");
            }
            if (done.kind == TELLS && client.dumps[done.what].told != (done.argument == 1)) {
                client.dumps[done.what] = {done.argument == 1};
            }
            if (done.kind == SETS && done.what >= LOGGED && !done.argument && !asked.contested &&
                client.asked.empty()) {
                ledger::check_written(done.what - LOGGED);  // its file is closed
            }
            return;
        }
    } while (g_state->reply_lost && !client.asked.empty());
    fail_run("reply", "'%s' is answered '%s'", request.c_str(), line.c_str());
}

void Clients::take_notice(Client& client, const std::string& line) {
    const bool start = line.compare(0, 14, "CP_DUMP_START ") == 0;
    const std::string cp = line.substr(start ? 14 : 12);
    const unsigned stream = cp == "WCDMA" ? ST_WCDMA : cp == "WCN" ? ST_WCN : ST_GNSS;
    Dump& dump = client.dumps[stream];
    ++g_state->counters.dumps;
    if (!dump.told && !g_state->reply_lost) {
        fail_run("notice", "'%s', which the client did not ask for", line.c_str());
    }
    // A client that subscribed during a dump hears its end only.
    if (start ? dump.open : !dump.open && dump.heard) {
        fail_run("notice", "'%s', a dump is %s", line.c_str(), dump.open ? "open" : "not open");
    }
    dump = {dump.told, true, start, g_state->boot_ns};
}

int64_t Clients::connected_count() const {
    return std::count_if(std::begin(m_clients), std::end(m_clients),
                         [](const Client& client) { return client.fd >= 0; });
}

void Clients::service_rests() {
    m_ghosts = m_ghosts && connected_count() >= SERVED;
}

void Clients::check_waiting() const {
    if (connected_count() > SERVED) {
        return;
    }
    for (const Client& client : m_clients) {
        const Dump& dump = client.dumps[ST_WCDMA];
        if (dump.open && g_state->boot_ns - dump.since > MAX_DUMP_NS && !g_state->reply_lost) {
            fail_run("notice", "a modem dump that a client was told of does not end");
        }
        if (!client.asked.empty() && client.rest.empty() &&
            g_state->boot_ns - client.asked.front().at > MAX_WAIT_NS && !g_state->fault_seen) {
            fail_run("reply", "'%s' is not answered",
                     request_of(client.asked.front().index).text.c_str());
        }
    }
}

void Clients::check_dumps_told(unsigned number) const {
    for (unsigned stream : {ST_WCDMA, ST_WCN}) {
        const Dump& dump = m_clients[number].dumps[stream];
        if (!dump.heard || dump.open) {
            fail_run("notice", "dump of stream %u: its %s was not told", stream,
                     dump.heard ? "end" : "start");
        }
    }
}

bool Clients::waiting() const {
    return std::any_of(std::begin(m_clients), std::end(m_clients),
                       [](const Client& client) { return !client.asked.empty(); });
}

void Clients::mark_uncertain() {
    for (Client& client : m_clients) {
        mark_uncertain(client);
    }
}

void Clients::mark_uncertain(Client& client) {
    for (const Asked& asked : client.asked) {
        for (const auto& set : set_by(request_of(asked.index))) {
            set.first->uncertain = true;
        }
    }
    // What was asked behind it has the value of before as well.
    for (Asked& asked : client.asked) {
        const Request& request = request_of(asked.index);
        asked.expected.uncertain =
            asked.expected.uncertain ||
            (depends_on_setting(request) && setting_of(request.what)->uncertain);
    }
}
