// SPDX-License-Identifier: Apache-2.0
// What happens to the service in one run, event by event. A plan is made from a seed, or read
// from a text: one event a line, its time in virtual milliseconds, its name and two numbers, or a
// number and the text of a request.
#ifndef SIMULATION_PLAN_H_
#define SIMULATION_PLAN_H_

#include <stdint.h>

#include <string>
#include <vector>

enum EventKind {
    EV_FEED,            // a: stream, b: bytes that its device gives
    EV_DEVICE_FAILS,    // a: stream; reads fail until the device is opened again
    EV_DEVICE_GONE,     // a: stream; it cannot be opened either
    EV_DEVICE_BACK,     // a: stream
    EV_CARD_OUT,        // a: 1: the mount goes before the property tells it
    EV_CARD_IN,         // a: 1: another card, empty; 2: the one before
    EV_CARD_READ_ONLY,  // the card's file system gives up
    EV_MEDIUM_FULL,     // a: medium, b: bytes left
    EV_MEDIUM_ROOM,     // a: medium
    EV_DELETE,          // a: what (DeleteWhat), b: which
    EV_STRANGER,        // a: what somebody else makes, b: where
    EV_CLOCK,           // a: seconds, as a two's complement
    EV_ZONE,            // a: which
    EV_REQUEST,         // a: client (and from 4 on with the other terminator), b: request
    EV_PIECES,          // the same, in two pieces
    EV_FLOOD,           // a: client, b: requests from here on, ten of them in one write
    EV_CLIENT_LEAVES,   // a: client
    EV_SUPERVISOR,      // a: which, b: what (SupervisorDoes)
    EV_TIME_SERVICE,    // a: how it answers
    EV_DIAG,            // a: stream, b: how its diag device answers
    EV_PROPERTY,        // a: which, b: value
    EV_IQ,              // an I/Q buffer is filled; a: place and pace of its saving, b: bytes
    EV_IMAGE,           // the modem's firmware image changes; a: its number, b: what it is like
    EV_KEST_CONF,       // a: what the other service's file says from now on (KestConf)
    EV_OPTION,          // a: from the next start on, with the option -s or without it
    EV_FAULT,           // a: call and place, b: error, skipped calls and failing ones
    EV_NO_FAULTS,       // calls do not fail any more
    EV_KILL,            // a: so many calls from now
    EV_CALM,            // everything is in order again
    EV_CHECK,           // media and lists are compared; a: 1: at the end, 2: and
                        // dumps were told; 3: nothing waits in a device
    EV_KIND_COUNT
};

enum DeleteWhat { DEL_LOG, DEL_FILE, DEL_CP_DIR, DEL_SET, DEL_ROOT, DEL_COUNT };
enum SupervisorDoes {
    SUP_ASSERT,
    SUP_ALIVE,
    SUP_BLOCKED,
    SUP_BABBLE,
    SUP_DROP,
    SUP_GONE,
    SUP_BACK,
    SUP_COUNT
};

// What the parts of a fault's two numbers are multiplied with; the call and the error with 1.
constexpr uint64_t PLAN_PLACE = 100;
constexpr uint64_t PLAN_SKIP = 1000;
constexpr uint64_t PLAN_TIMES = 1000000;

struct Event {
    uint64_t at_ms;
    EventKind kind;
    uint64_t a;
    uint64_t b;
};

typedef std::vector<Event> Plan;

// How bad the days are.
enum Weather {
    WEATHER_FAIR,     // data, requests, crashes: nothing that loses a byte
    WEATHER_OUTSIDE,  // cards, devices, clocks and other people's hands
    WEATHER_FAULTS,   // and calls that fail
    WEATHER_STORM,    // and kills
    WEATHER_COUNT
};

// events: how many; each plan ends in calm, with a last check.
Plan make_plan(uint64_t seed, Weather weather, uint64_t events);
// The calm end alone, from that time on. rounds: how often each stream is fed in it.
void append_end(Plan& plan, uint64_t at_ms, unsigned rounds);

std::string to_text(const Event& event);
// False when the line is neither an event nor a comment nor empty.
bool add_line(Plan& plan, const std::string& line);
// What is wrong with the file, or "".
std::string read_plan(const std::string& path, Plan& plan);

#endif  // SIMULATION_PLAN_H_
