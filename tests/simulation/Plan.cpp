// SPDX-License-Identifier: Apache-2.0

#include "simulation/Plan.h"

#include <errno.h>
#include <stdlib.h>

#include <algorithm>
#include <sstream>

#include "simulation/Calls.h"
#include "simulation/Chance.h"
#include "simulation/Clients.h"

namespace {

const char* const NAMES[EV_KIND_COUNT] = {
    "feed",    "device-fails", "device-gone", "device-back", "card-out", "card-in",
    "card-ro", "full",         "room",        "delete",      "stranger", "clock",
    "zone",    "request",      "pieces",      "flood",       "leave",    "supervisor",
    "time",    "diag",         "property",    "iq",          "image",    "kest-conf",
    "option",  "fault",        "no-fault",    "kill",        "calm",     "check"};

struct Weight {
    EventKind kind;
    unsigned weight;
    Weather from;  // the mildest weather in which it happens
};

const Weight WEIGHTS[] = {
    {EV_FEED, 500, WEATHER_FAIR},
    {EV_REQUEST, 100, WEATHER_FAIR},
    {EV_PIECES, 10, WEATHER_FAIR},
    {EV_FLOOD, 5, WEATHER_FAIR},
    {EV_CLIENT_LEAVES, 15, WEATHER_FAIR},
    {EV_SUPERVISOR, 40, WEATHER_FAIR},
    {EV_TIME_SERVICE, 10, WEATHER_FAIR},
    {EV_DIAG, 20, WEATHER_FAIR},
    {EV_PROPERTY, 10, WEATHER_FAIR},
    {EV_CHECK, 20, WEATHER_FAIR},
    {EV_IQ, 25, WEATHER_FAIR},
    {EV_IMAGE, 8, WEATHER_FAIR},
    {EV_KEST_CONF, 8, WEATHER_FAIR},
    {EV_DEVICE_FAILS, 6, WEATHER_OUTSIDE},
    {EV_DEVICE_GONE, 6, WEATHER_OUTSIDE},
    {EV_DEVICE_BACK, 12, WEATHER_OUTSIDE},
    {EV_CARD_OUT, 12, WEATHER_OUTSIDE},
    {EV_CARD_IN, 24, WEATHER_OUTSIDE},
    {EV_CARD_READ_ONLY, 5, WEATHER_OUTSIDE},
    {EV_MEDIUM_FULL, 8, WEATHER_OUTSIDE},
    {EV_MEDIUM_ROOM, 12, WEATHER_OUTSIDE},
    {EV_DELETE, 20, WEATHER_OUTSIDE},
    {EV_STRANGER, 10, WEATHER_OUTSIDE},
    {EV_CLOCK, 10, WEATHER_OUTSIDE},
    {EV_ZONE, 5, WEATHER_OUTSIDE},
    {EV_FAULT, 40, WEATHER_FAULTS},
    {EV_NO_FAULTS, 15, WEATHER_FAULTS},
    {EV_CALM, 8, WEATHER_FAULTS},
    {EV_KILL, 10, WEATHER_STORM},
    {EV_OPTION, 3, WEATHER_STORM},
};

bool is_request(EventKind kind) {
    return kind == EV_REQUEST || kind == EV_PIECES;
}

EventKind pick_kind(Chance& chance, Weather weather) {
    unsigned total = 0;
    for (const Weight& each : WEIGHTS) {
        total += each.from <= weather ? each.weight : 0;
    }
    uint64_t at = chance.below(total);
    for (const Weight& each : WEIGHTS) {
        if (each.from > weather) {
            continue;
        }
        if (at < each.weight) {
            return each.kind;
        }
        at -= each.weight;
    }
    return EV_FEED;
}

// Mostly at once or soon, sometimes much later.
uint64_t pause_ms(Chance& chance) {
    switch (chance.below(10)) {
        case 0:
        case 1:
        case 2:
            return 0;
        case 3:
        case 4:
        case 5:
            return chance.below(50);
        case 6:
        case 7:
            return chance.below(1000);
        case 8:
            return chance.below(4000);
        default:
            return chance.one_in(30) ? chance.below(3600000) : chance.below(10000);
    }
}

uint64_t feed_size(Chance& chance) {
    switch (chance.below(6)) {
        case 0:
            return 1 + chance.below(100);
        case 1:
            return 32768;
        case 2:
            return 1 + chance.below(200000);
        default:
            return 1 + chance.below(40000);
    }
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
    Event event = {at_ms, pick_kind(chance, weather), chance.next() >> 16, chance.next() >> 16};
    switch (event.kind) {
        case EV_FEED:
            event.a %= STREAM_COUNT;
            if (event.a == ST_DUMP && !chance.one_in(4)) {
                event.a = ST_DSP;  // the DSP seldom crashes
            }
            event.b = feed_size(chance);
            break;
        case EV_DEVICE_FAILS:
        case EV_DEVICE_GONE:
        case EV_DEVICE_BACK:
        case EV_DIAG:
            event.a %= STREAM_COUNT;
            break;
        case EV_CLOCK: {
            static const int64_t JUMPS[] = {-86400, -3600, -60, -2, -1, 1, 60, 3600, 86400};
            event.a = static_cast<uint64_t>(chance.pick(JUMPS));
            break;
        }
        case EV_MEDIUM_FULL:
            event.a %= MEDIUM_COUNT;
            event.b = chance.one_in(2) ? 0 : chance.below(300000);
            break;
        case EV_MEDIUM_ROOM:
            event.a %= MEDIUM_COUNT;
            break;
        case EV_DELETE:
            event.a = chance.one_in(3) ? chance.below(DEL_COUNT) : chance.below(DEL_CP_DIR);
            break;
        case EV_SUPERVISOR:
            event.a %= 2;
            event.b = chance.one_in(2) ? uint64_t{SUP_ALIVE} : chance.below(SUP_COUNT);
            break;
        case EV_IMAGE:
            event.a = 1 + chance.below(100);
            event.b = chance.below(8) < 4 ? 0 : chance.below(4);
            break;
        case EV_KEST_CONF:
            event.a =
                chance.one_in(3) ? chance.below(8) : uint64_t{KEST_ON | KEST_MODEM | KEST_WCN};
            break;
        case EV_IQ:
            event.b = iq_size(chance);
            break;
        case EV_REQUEST:
        case EV_PIECES:
            event.a = chance.below(8);
            event.b = chance.below(Clients::request_count());
            break;
        case EV_FAULT:
            event.a = chance.below(CALL_COUNT) + PLAN_PLACE * chance.below(PLACE_COUNT);
            event.b = fault_size(chance, event.a % PLAN_PLACE);
            break;
        case EV_KILL:
            event.a = chance.one_in(2) ? chance.below(300) : chance.below(10);
            break;
        default:
            break;
    }
    return event;
}

}  // namespace

Plan make_plan(uint64_t seed, Weather weather, size_t events) {
    Plan plan;
    uint64_t now = 0;
    for (size_t i = 0; i < events; ++i) {
        Chance chance(seed, i);
        now += pause_ms(chance);
        plan.push_back(make_event(now, weather, chance));
    }
    // Now and then so much that the quota of the card has to be kept in the calm.
    if (seed % 5 == 0) {
        plan.insert(plan.begin(), {0, EV_OPTION, 1, 0});
    }
    append_end(plan, now, seed % 16 < WEATHER_COUNT ? 20 : 3);
    return plan;
}

void append_end(Plan& plan, uint64_t at_ms, unsigned rounds) {
    static const char* const REQUESTS[] = {
        "DISABLE_LOG WCDMA",    "DISABLE_LOG AG-DSP",  "ENABLE_IQ WCDMA WCDMA",
        "ENABLE_LOG_OVERWRITE", "SET_LOG_FILE_SIZE 1", "SET_DATA_MAX_SIZE\t12",
        "SET_SD_MAX_SIZE 14",   "ENABLE_LOG WCDMA",    "ENABLE_LOG WCN",
        "ENABLE_LOG GNSS",      "ENABLE_LOG AG-DSP",
    };
    plan.push_back({at_ms, EV_CALM, 0, 0});
    plan.push_back({at_ms, EV_IMAGE, 200 + at_ms % 100, 0});
    // By then the supervisors are connected again.
    uint64_t now = at_ms + 60000;
    plan.push_back({now, EV_SUPERVISOR, 0, SUP_ALIVE});
    plan.push_back({now, EV_SUPERVISOR, 1, SUP_ALIVE});
    for (const char* request : REQUESTS) {
        plan.push_back({now += 100, EV_REQUEST, 0, Clients::request_named(request)});
    }
    for (const char* request : {"SUBSCRIBE WCDMA DUMP", "SUBSCRIBE WCN DUMP"}) {
        plan.push_back({now += 100, EV_REQUEST, 1, Clients::request_named(request)});
    }
    for (uint64_t what : {SUP_ASSERT, SUP_ALIVE}) {
        plan.push_back({now += 30000, EV_SUPERVISOR, 0, what});
        plan.push_back({now, EV_SUPERVISOR, 1, what});
    }
    now += 700000;  // a card that failed rests for up to ten minutes
    plan.push_back({now, EV_IQ, 1000, 200000});
    now += 300000;  // with the thread as slow as it can be
    for (unsigned round = 0; round < rounds; ++round) {
        for (unsigned stream = 0; stream < STREAM_COUNT; ++stream) {
            plan.push_back({now, EV_FEED, stream, round == 0 ? uint64_t{70000} : uint64_t{250000}});
        }
        now += 5000;
    }
    // The parsing library comes with a start, if the log root is there by then.
    for (const char* request : {"DISABLE_LOG WCDMA", "ENABLE_LOG WCDMA", "FLUSH"}) {
        plan.push_back({now, EV_REQUEST, 0, Clients::request_named(request)});
    }
    plan.push_back({now + 1000, EV_CHECK, 2, 0});
}

std::string to_text(const Event& event) {
    std::ostringstream text;
    text << event.at_ms << ' ' << NAMES[event.kind] << ' ' << static_cast<int64_t>(event.a) << ' ';
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
    const char* const* const found = std::find(NAMES, NAMES + EV_KIND_COUNT, name);
    const EventKind kind = static_cast<EventKind>(found - NAMES);
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
