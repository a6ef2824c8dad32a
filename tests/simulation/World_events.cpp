// SPDX-License-Identifier: Apache-2.0
// The part of World that makes the events of the plan happen.
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
    const unsigned stream = static_cast<unsigned>(event.a % STREAM_COUNT);
    const unsigned client = static_cast<unsigned>(event.a);
    switch (event.kind) {
        case EV_FEED:
            return m_devices.feed(stream, event.b);
        case EV_DEVICE_FAILS:
            return m_devices.fail(stream);
        case EV_DEVICE_GONE:
            return m_devices.pull(stream);
        case EV_DEVICE_BACK:
            state.streams[stream].gone = false;
            return;
        case EV_CARD_OUT:
            if (state.card_in && event.a % 4 == 1) {
                state.tampered = true;  // it may be back before the service is told
                state.card_told_ns = state.boot_ns + 2000 * NS_PER_MS;
            }
            m_media.pull_card();
            return write_props();
        case EV_CARD_IN:
            state.card_told_ns = 0;
            m_media.insert_card(static_cast<Media::Card>(event.a % 4 % 3));
            return write_props();
        case EV_CARD_READ_ONLY:
            state.card_read_only = state.card_in;
            state.tampered = true;
            state.card_fresh = false;
            return;
        case EV_MEDIUM_FULL:
        case EV_MEDIUM_ROOM:
            state.room[event.a % MEDIUM_COUNT] =
                event.kind == EV_MEDIUM_FULL ? event.b : UINT64_MAX;
            m_refused = 0;
            return;
        case EV_DELETE:
            m_refused_since_deletion = 0;
            return m_media.remove_something(event.a, chance);
        case EV_STRANGER:
            return m_media.make_something(event.a, chance);
        case EV_CLOCK:
            state.wall_ns += static_cast<int64_t>(event.a) * 1000000000;
            return;
        case EV_ZONE:
            state.zone = static_cast<uint32_t>(event.a % 4);
            return set_zone();
        case EV_REQUEST:
        case EV_PIECES:
            return m_clients.request(client, event.b, event.kind == EV_PIECES);
        case EV_FLOOD:
            return m_clients.flood(client, event.b);
        case EV_CLIENT_LEAVES:
            return m_clients.leave(client);
        case EV_SUPERVISOR:
            return act_on_supervisor(event.a, event.b);
        case EV_TIME_SERVICE:
            state.time_answers = static_cast<uint32_t>(event.a % TIME_COUNT);
            return;
        case EV_DIAG:
            state.streams[stream].answers = static_cast<uint8_t>(event.b % 8);
            return;
        case EV_PROPERTY:
            if (event.a % 4 == 0) {
                ++state.version;
            } else {
                state.cp_reset[event.a % 2] = event.b % 3 == 0;
            }
            return write_props();
        case EV_IMAGE:
            return m_media.install_image(event.a, event.b);
        case EV_KEST_CONF:
            if (m_clients.quiet()) {  // a reload on its way might see either
                state.kest_conf = static_cast<uint32_t>(event.a);
                write_kest_conf();
            }
            return;
        case EV_OPTION:
            state.next_layout = event.a % 2;
            return;
        case EV_IQ:
            m_thread.set_pace(event.a);
            return m_iq.fill(event.a, event.b);
        case EV_FAULT:
            return add_fault(event);
        case EV_NO_FAULTS:
            return end_faults();
        case EV_KILL:
            state.kill_at = state.counters.calls + 1 + event.a;
            return;
        case EV_CALM:
            return calm();
        case EV_CHECK:
            check(event.a == 1 || event.a == 2);
            if (event.a == 3) {
                ledger::check_read();
            }
            if (event.a == 2) {
                IqDevice::check_saved();
                m_clients.check_dumps_told(1);
            }
            return;
        case EV_KIND_COUNT:
            return;
    }
}

void World::end_faults() {
    for (FaultRule& rule : g_state->faults) {
        rule.active = false;
    }
}

void World::act_on_supervisor(uint64_t which, uint64_t what) {
    static const char* const WORDS[2][3] = {
        {"Modem Assert: here\n", "Modem Alive\n", "Modem Blocked\n"},
        {"WCN-EXTERNAL-DUMP\n", "WCN-EXTERNAL-ALIVE\n", "WCN-EXTERNAL-DUMP\n"}};
    const unsigned supervisor = static_cast<unsigned>(which % Peers::SUPERVISORS);
    what %= SUP_COUNT;
    switch (what) {
        case SUP_ASSERT:
        case SUP_ALIVE:
        case SUP_BLOCKED:
            m_peers.supervisor_says(supervisor, WORDS[supervisor][what]);
            if (supervisor == 1 && what != SUP_ALIVE) {
                m_devices.push_memory(ST_WCN, g_state->counters.events);
            }
            return;
        case SUP_BABBLE:
            return m_peers.supervisor_says(supervisor, std::string(900, '\x1b') + "Modem Al");
        case SUP_DROP:
            return m_peers.supervisor_drops(supervisor);
        case SUP_GONE:
            return m_peers.supervisor_goes(supervisor);
        default:
            return m_peers.supervisor_comes(supervisor);
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
    end_faults();
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
