// SPDX-License-Identifier: Apache-2.0
// The part of World that makes the events of the plan happen.
#include <stdlib.h>
#include <time.h>

#include <algorithm>
#include <iterator>

#include "simulation/Ledger.h"
#include "simulation/World.h"

void World::act(const Event& event) {
    State& state = *g_state;
    trace("event %s", to_text(event).c_str());
    static const EventKind DISTURBING_NOBODY[] = {EV_FEED,       EV_REQUEST, EV_CHECK,
                                                  EV_SUPERVISOR, EV_IQ,      EV_IMAGE};
    if (std::count(std::begin(DISTURBING_NOBODY), std::end(DISTURBING_NOBODY), event.kind) == 0) {
        state.calm_ns = 0;
    }
    Chance chance(event.b, event.a);
    switch (event.kind) {
        case EV_FEED:
            m_devices.feed(static_cast<unsigned>(event.a % STREAM_COUNT), event.b);
            break;
        case EV_DEVICE_FAILS:
            m_devices.fail(static_cast<unsigned>(event.a % STREAM_COUNT));
            break;
        case EV_DEVICE_GONE:
            m_devices.pull(static_cast<unsigned>(event.a % STREAM_COUNT));
            break;
        case EV_DEVICE_BACK:
            state.streams[event.a % STREAM_COUNT].gone = false;
            break;
        case EV_CARD_OUT:
            if (state.card_in && event.a % 4 == 1) {
                state.tampered = true;  // it may be back before the service is told
                state.card_told_ns = state.boot_ns + 2000 * NS_PER_MS;
            }
            m_media.pull_card();
            write_props();
            break;
        case EV_CARD_IN:
            state.card_told_ns = 0;
            m_media.insert_card(static_cast<Media::Card>(event.a % 4 % 3));
            write_props();
            break;
        case EV_CARD_READ_ONLY:
            state.card_read_only = state.card_in;
            state.tampered = true;
            state.card_fresh = false;
            break;
        case EV_MEDIUM_FULL:
            state.room[event.a % MEDIUM_COUNT] = event.b;
            break;
        case EV_MEDIUM_ROOM:
            state.room[event.a % MEDIUM_COUNT] = UINT64_MAX;
            m_refused = 0;
            break;
        case EV_DELETE:
            m_media.remove_something(event.a, chance);
            m_refused_since_deletion = 0;
            break;
        case EV_STRANGER:
            m_media.make_something(event.a, chance);
            break;
        case EV_CLOCK:
            state.wall_ns += static_cast<int64_t>(event.a) * 1000000000;
            break;
        case EV_ZONE:
            state.zone = static_cast<uint32_t>(event.a % 4);
            setenv("TZ", ZONES[state.zone], 1);
            tzset();
            break;
        case EV_REQUEST:
            m_clients.request(static_cast<unsigned>(event.a), event.b, false);
            break;
        case EV_PIECES:
            m_clients.request(static_cast<unsigned>(event.a), event.b, true);
            break;
        case EV_FLOOD:
            m_clients.flood(static_cast<unsigned>(event.a), event.b);
            break;
        case EV_CLIENT_LEAVES:
            m_clients.leave(static_cast<unsigned>(event.a));
            break;
        case EV_SUPERVISOR:
            act_on_supervisor(event.a, event.b);
            break;
        case EV_TIME_SERVICE:
            state.time_answers = static_cast<uint32_t>(event.a % TIME_COUNT);
            break;
        case EV_DIAG:
            state.streams[event.a % STREAM_COUNT].answers = static_cast<uint8_t>(event.b % 8);
            break;
        case EV_PROPERTY:
            if (event.a % 4 == 0) {
                ++state.version;
            } else {
                state.cp_reset[event.a % 2] = event.b % 3 == 0;
            }
            write_props();
            break;
        case EV_IMAGE:
            m_media.install_image(event.a, event.b);
            break;
        case EV_KEST_CONF:
            if (m_clients.quiet()) {  // a reload on its way might see either
                state.kest_conf = static_cast<uint32_t>(event.a);
                write_kest_conf();
            }
            break;
        case EV_OPTION:
            state.next_layout = event.a % 2;
            break;
        case EV_IQ:
            m_thread.set_pace(event.a);
            m_iq.fill(event.a, event.b);
            break;
        case EV_FAULT:
            add_fault(event);
            break;
        case EV_NO_FAULTS:
            for (FaultRule& rule : state.faults) {
                rule.active = false;
            }
            break;
        case EV_KILL:
            state.kill_at = state.counters.calls + 1 + event.a;
            break;
        case EV_CALM:
            calm();
            break;
        case EV_CHECK:
            check(event.a == 1 || event.a == 2);
            if (event.a == 3) {
                ledger::check_read();
            }
            if (event.a == 2) {
                IqDevice::check_saved();
                m_clients.check_dumps_told(1);
            }
            break;
        case EV_KIND_COUNT:
            break;
    }
}

void World::act_on_supervisor(uint64_t which, uint64_t what) {
    static const char* const WORDS[2][3] = {
        {"Modem Assert: here\n", "Modem Alive\n", "Modem Blocked\n"},
        {"WCN-EXTERNAL-DUMP\n", "WCN-EXTERNAL-ALIVE\n", "WCN-EXTERNAL-DUMP\n"}};
    const unsigned supervisor = static_cast<unsigned>(which % Peers::SUPERVISORS);
    switch (what % SUP_COUNT) {
        case SUP_ASSERT:
        case SUP_ALIVE:
        case SUP_BLOCKED:
            m_peers.supervisor_says(supervisor, WORDS[supervisor][what % SUP_COUNT]);
            if (supervisor == 1 && what % SUP_COUNT != SUP_ALIVE) {
                m_devices.push_memory(ST_WCN, g_state->counters.events);
            }
            break;
        case SUP_BABBLE:
            m_peers.supervisor_says(supervisor, std::string(900, '\x1b') + "Modem Al");
            break;
        case SUP_DROP:
            m_peers.supervisor_drops(supervisor);
            break;
        case SUP_GONE:
            m_peers.supervisor_goes(supervisor);
            break;
        default:
            m_peers.supervisor_comes(supervisor);
            break;
    }
}

void World::add_fault(const Event& event) {
    for (FaultRule& rule : g_state->faults) {
        if (rule.active) {
            continue;
        }
        rule.call = static_cast<uint8_t>(event.a % PLAN_PLACE);
        rule.place = static_cast<uint8_t>(event.a / PLAN_PLACE);
        rule.error = static_cast<int>(event.b % PLAN_SKIP);
        rule.skip = static_cast<uint32_t>(event.b % PLAN_TIMES / PLAN_SKIP);
        rule.times = static_cast<uint32_t>(event.b / PLAN_TIMES);
        rule.active = true;
        return;
    }
}

void World::calm() {
    State& state = *g_state;
    for (FaultRule& rule : state.faults) {
        rule.active = false;
    }
    for (unsigned client = 0; client < Clients::COUNT; ++client) {
        m_clients.leave(client);
    }
    state.fault_seen = state.reply_lost = false;
    state.kill_at = 0;
    m_thread.set_pace(0);
    state.calm_ns = state.boot_ns;
    state.card_told_ns = 0;
    m_media.insert_card(Media::SAME);
    state.card_read_only = false;
    state.room[MED_DATA] = state.room[MED_CARD] = UINT64_MAX;
    state.time_answers = TIME_PROMPT;
    state.cp_reset[0] = state.cp_reset[1] = false;
    write_props();
    for (unsigned stream = 0; stream < STREAM_COUNT; ++stream) {
        state.streams[stream].gone = false;
        state.streams[stream].answers = 0;
    }
    for (unsigned supervisor = 0; supervisor < Peers::SUPERVISORS; ++supervisor) {
        m_peers.supervisor_comes(supervisor);
        act_on_supervisor(supervisor, SUP_ALIVE);
    }
}
