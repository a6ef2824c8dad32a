// SPDX-License-Identifier: Apache-2.0

#include "simulation/Plan.h"

#include <errno.h>
#include <stdlib.h>
#include <string.h>

#include <algorithm>
#include <fstream>
#include <initializer_list>
#include <iterator>
#include <sstream>

#include "simulation/Calls.h"
#include "simulation/Chance.h"
#include "simulation/Clients.h"
#include "simulation/Media.h"

namespace {

// By EventKind: how often it happens, from which weather on, and the limits of a and b, where
// they have any.
struct KindInfo {
    const char* name;
    unsigned weight;
    Weather from;
    uint64_t a;
    uint64_t b;
};
constexpr uint64_t ANY = uint64_t{1} << 48;
const KindInfo KINDS[EV_KIND_COUNT] = {
    {"feed", 500, WEATHER_FAIR, STREAM_COUNT, ANY},
    {"device-fails", 6, WEATHER_OUTSIDE, STREAM_COUNT, ANY},
    {"device-gone", 6, WEATHER_OUTSIDE, STREAM_COUNT, ANY},
    {"device-back", 12, WEATHER_OUTSIDE, STREAM_COUNT, ANY},
    {"card-out", 12, WEATHER_OUTSIDE, 4, ANY},
    {"card-in", 24, WEATHER_OUTSIDE, 4, ANY},
    {"card-ro", 5, WEATHER_OUTSIDE, ANY, ANY},
    {"full", 8, WEATHER_OUTSIDE, MEDIUM_COUNT, 300000},
    {"room", 12, WEATHER_OUTSIDE, MEDIUM_COUNT, ANY},
    {"delete", 20, WEATHER_OUTSIDE, DEL_COUNT, ANY},
    {"stranger", 10, WEATHER_OUTSIDE, ANY, ANY},
    {"clock", 10, WEATHER_OUTSIDE, ANY, ANY},
    {"zone", 5, WEATHER_OUTSIDE, 4, ANY},
    {"request", 100, WEATHER_FAIR, 2 * Clients::COUNT, ANY},
    {"pieces", 10, WEATHER_FAIR, 2 * Clients::COUNT, ANY},
    {"flood", 5, WEATHER_FAIR, Clients::COUNT, ANY},
    {"leave", 15, WEATHER_FAIR, Clients::COUNT, ANY},
    {"supervisor", 40, WEATHER_FAIR, 2, SUP_COUNT},
    {"time", 10, WEATHER_FAIR, 4, ANY},
    {"diag", 20, WEATHER_FAIR, STREAM_COUNT, 8},
    {"property", 10, WEATHER_FAIR, 4, 3},
    {"iq", 25, WEATHER_FAIR, ANY, 300000},
    {"image", 8, WEATHER_FAIR, 100, 8},
    {"kest-conf", 8, WEATHER_FAIR, 24, ANY},
    {"option", 3, WEATHER_STORM, 2, ANY},
    {"fault", 40, WEATHER_FAULTS, ANY, ANY},
    {"no-fault", 15, WEATHER_FAULTS, ANY, ANY},
    {"kill", 10, WEATHER_STORM, 300, ANY},
    {"calm", 8, WEATHER_FAULTS, ANY, ANY},
    {"check", 20, WEATHER_FAIR, 1, ANY},
};

bool is_request(EventKind kind) {
    return kind == EV_REQUEST || kind == EV_PIECES;
}

EventKind pick_kind(Chance& chance, Weather weather) {
    unsigned total = 0;
    for (const KindInfo& each : KINDS) {
        total += each.from <= weather ? each.weight : 0;
    }
    uint64_t at = chance.below(total);
    int kind = 0;
    for (; KINDS[kind].from > weather || at >= KINDS[kind].weight; ++kind) {
        at -= KINDS[kind].from <= weather ? KINDS[kind].weight : 0;
    }
    return static_cast<EventKind>(kind);
}

// Mostly at once or soon, sometimes much later.
uint64_t pause_ms(Chance& chance) {
    static const uint64_t LIMITS[] = {1, 1, 1, 50, 50, 50, 1000, 1000, 4000, 10000};
    const uint64_t limit = chance.pick(LIMITS);
    return chance.below(limit == 10000 && chance.one_in(30) ? 3600000 : limit);
}

uint64_t feed_size(Chance& chance) {
    static const uint64_t LIMITS[] = {100, 200000, 40000, 40000, 40000};
    return chance.one_in(6) ? 32768 : 1 + chance.below(chance.pick(LIMITS));
}

// The thread looks for a command behind each 10 MiB.
uint64_t iq_size(Chance& chance) {
    constexpr uint64_t CHUNK = 10 << 20;
    switch (chance.below(12)) {
        case 0:
            return CHUNK + chance.below(3 * CHUNK / 2);
        case 1:
            return CHUNK - 1 + chance.below(3);
        case 2:
            return (100 << 20) + chance.below(uint64_t{1} << 31);
        default:
            return chance.below(300000);
    }
}

// The error, how many calls go well before, and how many fail.
uint64_t fault_size(Chance& chance, uint64_t call) {
    static const int ERRORS[] = {EIO, ENOSPC, EMFILE, ENFILE, EINTR, EAGAIN, ENOMEM, EROFS, 0, EIO};
    int error = chance.pick(ERRORS);
    if (error == 0 && call != CALL_WRITE && call != CALL_READ) {
        error = EIO;
    }
    return static_cast<uint64_t>(error) + PLAN_SKIP * chance.below(20) +
           PLAN_TIMES * (chance.one_in(5) ? 200 : 1 + chance.below(3));
}

Event make_event(uint64_t at_ms, Weather weather, Chance chance) {
    const EventKind kind = pick_kind(chance, weather);
    Event event = {at_ms, kind, chance.below(KINDS[kind].a), chance.below(KINDS[kind].b)};
    switch (kind) {
        case EV_FEED:
            if (event.a == ST_DUMP && !chance.one_in(4)) {
                event.a = ST_DSP;  // the DSP seldom crashes
            }
            event.b = feed_size(chance);
            break;
        case EV_CLOCK: {
            static const int64_t JUMPS[] = {-86400, -3600, -60, -2, -1, 1, 60, 3600, 86400};
            event.a = static_cast<uint64_t>(chance.pick(JUMPS));
            break;
        }
        case EV_MEDIUM_FULL:
            event.b = chance.one_in(2) ? 0 : event.b;
            break;
        case EV_DELETE:
            event.a %= chance.one_in(3) ? DEL_COUNT : DEL_CP_DIR;
            break;
        case EV_SUPERVISOR:
            event.b = chance.one_in(2) ? uint64_t{SUP_ALIVE} : event.b;
            break;
        case EV_KEST_CONF:
            event.a = event.a < 8 ? event.a : uint64_t{KEST_ON | KEST_MODEM | KEST_WCN};
            break;
        case EV_IQ:
            event.b = iq_size(chance);
            break;
        case EV_REQUEST:
        case EV_PIECES:
            event.b = chance.below(Clients::request_count());
            break;
        case EV_FAULT:
            event.a = chance.below(CALL_COUNT) + PLAN_PLACE * chance.below(PLACE_COUNT);
            event.b = fault_size(chance, event.a % PLAN_PLACE);
            break;
        case EV_KILL:
            event.a %= chance.one_in(2) ? 300 : 10;
            break;
        default:
            break;
    }
    return event;
}

// Requests of one client, so long apart; each time the last one's.
void add_requests(Plan& plan, uint64_t& at_ms, uint64_t pause, uint64_t client,
                  std::initializer_list<const char*> requests) {
    for (const char* request : requests) {
        plan.push_back({at_ms += pause, EV_REQUEST, client, Clients::request_named(request)});
    }
}

// The other service changes its file, and has it read.
void add_kest_conf(Plan& plan, uint64_t& at_ms, uint64_t conf) {
    plan.push_back({at_ms, EV_KEST_CONF, conf, 0});
    add_requests(plan, at_ms, 1, 0, {"kestctl reload", "GET_LOG_STATE WCDMA", "GET_LOG_STATE WCN"});
}

}  // namespace

Plan make_plan(uint64_t seed, Weather weather, uint64_t events) {
    Plan plan;
    uint64_t now = 0;
    if (seed % 5 == 0) {
        plan.push_back({now, EV_OPTION, 1, 0});
    }
    if (seed % 3 == 0) {
        add_kest_conf(plan, now, Chance(seed).below(8));
        add_requests(plan, now, 1000, 0, {"ENABLE_LOG WCDMA", "ENABLE_LOG WCN"});
    }
    for (uint64_t i = 0; i < events; ++i) {
        Chance chance(seed, i);
        now += pause_ms(chance);
        const Event event = make_event(now, weather, chance);
        if (event.kind == EV_KEST_CONF) {
            add_kest_conf(plan, now, event.a);
        } else {
            plan.push_back(event);
        }
        if (weather == WEATHER_STORM && chance.one_in(60)) {
            // Dies while the parsing library is replaced.
            plan.push_back({now, EV_KILL, 20 + chance.below(120), 0});
            plan.push_back({now, EV_IMAGE, 1 + chance.below(100), 0});
            add_requests(plan, now, 0, 0, {"DISABLE_LOG WCDMA", "ENABLE_LOG WCDMA"});
        }
    }
    // Now and then so much that the quota of the card has to be kept in the calm.
    append_end(plan, now, seed % 16 < WEATHER_COUNT ? 20 : 3);
    return plan;
}

void append_end(Plan& plan, uint64_t at_ms, unsigned rounds) {
    plan.push_back({at_ms, EV_CALM, 0, 0});
    plan.push_back({at_ms, EV_IMAGE, 200 + at_ms % 100, 0});
    // By then the supervisors are connected again.
    uint64_t now = at_ms + 60000;
    plan.push_back({now, EV_SUPERVISOR, 0, SUP_ALIVE});
    plan.push_back({now, EV_SUPERVISOR, 1, SUP_ALIVE});
    add_requests(
        plan, now, 100, 0,
        {"DISABLE_LOG WCDMA", "DISABLE_LOG AG-DSP", "ENABLE_IQ WCDMA WCDMA", "ENABLE_LOG_OVERWRITE",
         "SET_LOG_FILE_SIZE 1", "SET_DATA_MAX_SIZE\t12", "SET_SD_MAX_SIZE 14", "ENABLE_LOG WCDMA",
         "ENABLE_LOG WCN", "ENABLE_LOG GNSS", "ENABLE_LOG AG-DSP"});
    if (at_ms % 2) {
        // The service notices that the card goes, that another one comes, and the first again.
        for (uint64_t card : {Media::EMPTY, Media::FORMER}) {
            plan.push_back({now += 1000, EV_CARD_OUT, 0, 0});
            plan.push_back({now += 10, EV_FEED, ST_GNSS, 5000});
            plan.push_back({now += 1000, EV_CARD_IN, card, 0});
            plan.push_back({now += 10, EV_FEED, ST_GNSS, 5000});
            plan.push_back({now += 1000, EV_CHECK, 0, 0});
        }
        plan.push_back({now, EV_CALM, 0, 0});
        now += 70000;
    }
    add_requests(plan, now, 100, 1, {"SUBSCRIBE WCDMA DUMP", "SUBSCRIBE WCN DUMP"});
    for (uint64_t what : {SUP_ASSERT, SUP_ALIVE}) {
        plan.push_back({now += 30000, EV_SUPERVISOR, 0, what});
        plan.push_back({now, EV_SUPERVISOR, 1, what});
    }
    now += 700000;  // a card that failed rests for up to ten minutes
    plan.push_back({now, EV_IQ, 1000, 200000});
    now += 300000;  // with the thread as slow as it can be
    for (unsigned round = 0; round < rounds; ++round) {
        if (round % 8 == 7) {
            // What the quota of 14 MB leaves, others take; and give it back.
            plan.push_back({now, round % 16 == 7 ? EV_MEDIUM_FULL : EV_MEDIUM_ROOM, MED_CARD, 0});
        }
        for (unsigned stream = 0; stream < STREAM_COUNT; ++stream) {
            plan.push_back({now, EV_FEED, stream, round == 0 ? uint64_t{70000} : uint64_t{250000}});
        }
        now += 5000;
        plan.push_back({now - 1, EV_CHECK, 3, 0});
    }
    // The parsing library comes with a start, if the log root is there by then.
    add_requests(plan, now, 0, 0, {"DISABLE_LOG WCDMA", "ENABLE_LOG WCDMA", "FLUSH"});
    plan.push_back({now + 1000, EV_CHECK, 2, 0});
}

std::string to_text(const Event& event) {
    std::ostringstream text;
    text << event.at_ms << ' ' << KINDS[event.kind].name << ' ' << static_cast<int64_t>(event.a)
         << ' ';
    if (is_request(event.kind)) {
        text << Clients::request_text(event.b);
    } else {
        text << event.b;
    }
    return text.str();
}

bool add_line(Plan& plan, const std::string& line) {
    if (line.empty() || line[0] == '#') {
        return true;
    }
    std::istringstream text(line);
    uint64_t at_ms;
    std::string name;
    int64_t a;
    if (!(text >> at_ms >> name >> a)) {
        return false;
    }
    const KindInfo* const found = std::find_if(
        KINDS, std::end(KINDS), [&name](const KindInfo& each) { return name == each.name; });
    const EventKind kind = static_cast<EventKind>(found - KINDS);
    std::string rest;
    std::getline(text >> std::ws, rest);
    if (kind == EV_KIND_COUNT || rest.empty()) {
        return false;
    }
    const uint64_t b = is_request(kind) ? Clients::request_named(rest.c_str())
                                        : strtoull(rest.c_str(), nullptr, 10);
    plan.push_back({at_ms, kind, static_cast<uint64_t>(a), b});
    return true;
}

std::string read_plan(const std::string& path, Plan& plan) {
    std::ifstream in(path);
    if (!in) {
        return path + ": " + strerror(errno);
    }
    for (std::string line; std::getline(in, line);) {
        if (!add_line(plan, line)) {
            return path + ": not an event: " + line;
        }
    }
    return "";
}
