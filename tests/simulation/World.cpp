// SPDX-License-Identifier: Apache-2.0

#include "simulation/World.h"

#include <stdlib.h>
#include <time.h>
#include <unistd.h>

#include <algorithm>

#include "control/LogController.h"

namespace {

World* s_world;

// Ten wake-ups that come to nothing are allowed to each of 20 handlers before it rests.
constexpr unsigned MAX_IDLE_PASSES = 400;
constexpr int64_t EMPTY_POLL_NS = 10000;  // what a poll takes that neither finds nor waits

int64_t due(const Event& event) {
    return START_NS + static_cast<int64_t>(event.at_ms) * NS_PER_MS;
}

}  // namespace

World& world() {
    return *s_world;
}

void set_world(World* world) {
    s_world = world;
}

World::World(const std::string& root, const Plan& plan)
    : m_root(root), m_plan(plan), m_peers(root), m_clients(root), m_media(root) {
    setenv("KESTMODEM_ROOT", root.c_str(), 1);
    setenv("EXTERNAL_STORAGE", (root + "/card").c_str(), 1);
    set_zone();
    write_props();
    write_kest_conf();
    g_state->pass_calls = g_state->counters.calls;
}

void World::set_zone() {
    static const char* const ZONES[] = {"UTC0", "CET-1", "XST+9:30", "NZST-12"};
    setenv("TZ", ZONES[g_state->zone], 1);
    tzset();
}

// ---- The loop

bool World::is_loops_own(const void* fds) const {
    const char* const at = static_cast<const char*>(fds);
    const char* const begin = reinterpret_cast<const char*>(m_controller);
    return m_controller && at >= begin && at < begin + sizeof(LogController);
}

void World::pump() {
    m_thread.lead(true);
    m_devices.pump();
    m_peers.pump();
    m_clients.pump();
    if (g_state->card_told_ns && g_state->boot_ns >= g_state->card_told_ns) {
        g_state->card_told_ns = 0;
        write_props();
    }
}

void World::pass_ends(bool idle) {
    g_state->fault_in_step = g_state->save_cut = false;
    g_state->pass_calls = g_state->counters.calls;
    m_idle_passes = idle ? m_idle_passes + 1 : 0;
}

void World::pass_without_service(int64_t ns) {
    State& state = *g_state;
    m_controller = nullptr;
    const int64_t end = state.boot_ns + ns;
    while (state.next_event < m_plan.size() && due(m_plan[state.next_event]) <= end) {
        state.boot_ns = std::max(state.boot_ns, due(m_plan[state.next_event]));
        act_next();
    }
    state.boot_ns = end;
    g_plan_over = state.next_event == m_plan.size();
}

void World::act_next() {
    ++g_state->counters.events;
    m_idle_passes = 0;
    m_clients.finish_pieces();
    act(m_plan[g_state->next_event++]);
    pump();
}

int World::wait(struct pollfd* fds, nfds_t count, int timeout, bool loops_own) {
    State& state = *g_state;
    const int64_t deadline = timeout < 0 ? INT64_MAX : state.boot_ns + timeout * NS_PER_MS;
    for (;;) {
        pump();
        int64_t next = INT64_MAX;
        while (loops_own && !g_plan_over) {
            if (state.next_event == m_plan.size()) {
                g_plan_over = true;
                return 0;
            }
            next = due(m_plan[state.next_event]);
            if (next > state.boot_ns) {
                break;
            }
            act_next();
        }
        const int ready = poll(fds, count, 0);
        if (ready != 0 || state.boot_ns >= deadline) {
            if (loops_own) {
                // The time left to a timer is cut to milliseconds: in the last one the loop
                // asks without waiting, which is no spinning while time passes.
                state.boot_ns += ready == 0 && timeout == 0 ? EMPTY_POLL_NS : 0;
                pass_ends(ready != 0 || timeout == 0);
                if (m_idle_passes > MAX_IDLE_PASSES) {
                    spins(fds, count);
                }
            }
            return ready;
        }
        m_clients.service_rests();
        next = std::min({next, deadline, m_devices.next_due(), m_thread.next_due(),
                         state.card_told_ns ? state.card_told_ns : INT64_MAX});
        if (next == INT64_MAX) {
            fail_run("hang", "waits for ever");
        }
        state.boot_ns = std::max(state.boot_ns, next);
        m_idle_passes = 0;
    }
}

void World::spins(const struct pollfd* fds, nfds_t count) const {
    std::string ready;
    for (nfds_t i = 0; i < count; ++i) {
        if (fds[i].fd >= 0 && fds[i].revents) {
            const FdInfo& info = g_fds[fds[i].fd];
            ready += " class " + std::to_string(info.cls) + " stream " +
                     std::to_string(info.stream) + " events " + std::to_string(fds[i].revents);
        }
    }
    fail_run("spin", "%u passes that came to nothing:%s", m_idle_passes, ready.c_str());
}

// ---- What is not certain any more

void World::no_setting_is_certain() {
    for (Setting& setting : g_state->settings) {
        setting.uncertain = true;
    }
    for (StreamState& stream : g_state->streams) {
        stream.logged.uncertain = true;
    }
}

// What was being changed may or may not be in the settings file.
void World::service_dies() {
    g_state->dump_unconfirmed = false;
    m_clients.mark_uncertain();
    if (g_state->save_failed) {
        no_setting_is_certain();
    }
    if (g_state->save_cut) {
        // Lines of two files may stand in it: a write of which the system takes a part, and a
        // kill before the rest. Its owner has to throw it away.
        unlink((m_root + SETTINGS_PATH).c_str());
    }
}

void World::rule_fired(Call call, Place place) {
    m_clients.mark_uncertain();
    if (g_state->starting) {
        no_setting_is_certain();  // a settings file that cannot be read is replaced by the default
    }
    g_state->scan_failed =
        g_state->scan_failed || call == CALL_OPENDIR || call == CALL_READDIR || call == CALL_STAT;
    g_state->save_cut = g_state->save_cut || (call == CALL_WRITE && place == PLACE_SETTINGS);
    if (call == CALL_WRITE && place == PLACE_SOCKET) {
        g_state->reply_lost = true;
    }
}
