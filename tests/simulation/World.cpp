// SPDX-License-Identifier: Apache-2.0

#include "simulation/World.h"

#include <errno.h>
#include <fcntl.h>
#include <stdlib.h>
#include <string.h>
#include <time.h>
#include <unistd.h>

#include <algorithm>
#include <fstream>

#include "channels/LogPipeHandler.h"
#include "control/LogController.h"
#include "simulation/Ledger.h"
#include "storage/CpDirectory.h"
#include "storage/CpSetDirectory.h"
#include "storage/LogFile.h"

namespace {

World* s_world;

constexpr int64_t NS_PER_MS = 1000000;
// Ten wake-ups that come to nothing are allowed to each of 20 handlers before it rests.
constexpr unsigned MAX_IDLE_PASSES = 400;
// So long after everything was put in order the service has found out.
constexpr int64_t CALM_AFTER_NS = int64_t{65} * 1000000000;
constexpr int64_t START_NS = int64_t{100} * 1000000000;
const char* const ZONES[] = {"UTC0", "CET-1", "XST+9:30", "NZST-12"};
const CpType STREAM_TYPES[STREAM_COUNT] = {CT_WCDMA, CT_WCN, CT_GNSS, CT_AGDSP};

const char CONFIG[] =
    "minidump enable\texternal\n"
    "log_file_size 1\n"
    "data_log_size 12\n"
    "sd_log_size 20\n"
    "log_overwrite enable\n"
    "iq\tcp_wcdma\tWCDMA\n"
    "\n"
    "#Type\tName\tState\tSize\tLevel\n"
    "stream\tcp_wcdma\ton\t1\t1\n"
    "stream\tcp_wcn\ton\t1\t1\n"
    "stream\tcp_gnss\ton\t1\t1\n"
    "stream\tagdsp\ton\t1\t1\n";

int64_t due(const Event& event) {
    return START_NS + static_cast<int64_t>(event.at_ms) * NS_PER_MS;
}

void make_file(const std::string& path, const std::string& content) {
    std::ofstream(path, std::ios::binary) << content;
}

void make_dirs(const std::string& path) {
    for (size_t at = 1; (at = path.find('/', at)) != std::string::npos; ++at) {
        mkdir(path.substr(0, at).c_str(), 0775);
    }
    mkdir(path.c_str(), 0775);
}

}  // namespace

World& world() {
    return *s_world;
}

void set_world(World* world) {
    s_world = world;
}

void World::make_handset(const std::string& root) {
    for (const char* dir : {"/data/local/tmp/kestmodem", "/data/local/tmp/kest", "/system/etc",
                            "/card", "/cards", "/proc/cpw", "/d/dipx"}) {
        make_dirs(root + dir);
    }
    make_file(root + "/system/etc/kest_modem.conf", CONFIG);
    make_file(root + "/data/local/tmp/kest/kest.conf",
              "enable\nstream\tMODEM\ton\t1\t1\nstream\tWCN\ton\t1\t1\n");
    make_file(root + "/proc/cpw/mem", std::string(200000, 'm'));
    make_file(root + "/proc/cpw/mini_dump", std::string(3000, 'd'));
    for (const char* record : {"smsg", "sbuf", "sblock"}) {
        make_file(root + "/d/dipx/" + record, std::string(500, 'r'));
    }
    State& state = *g_state;
    state.boot_ns = START_NS;
    state.wall_ns = int64_t{1700000000} * 1000000000;
    state.card_in = true;
    state.room[MED_DATA] = state.room[MED_CARD] = UINT64_MAX;
    const unsigned values[SETTING_COUNT] = {1, 12, 20, 1, 0};
    for (unsigned i = 0; i < SETTING_COUNT; ++i) {
        state.settings[i].value = values[i];
    }
    for (StreamState& stream : state.streams) {
        stream.logged.value = 1;
    }
}

World::World(const std::string& root, const Plan& plan)
    : m_root(root), m_plan(plan), m_peers(root), m_clients(root), m_media(root) {
    setenv("KESTMODEM_ROOT", root.c_str(), 1);
    setenv("EXTERNAL_STORAGE", (root + "/card").c_str(), 1);
    setenv("TZ", ZONES[g_state->zone], 1);
    tzset();
    write_props();
    g_state->pass_calls = g_state->counters.calls;
}

// ---- For the calls

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
    g_state->fault_in_step = false;
    g_state->pass_calls = g_state->counters.calls;
    ++g_state->counters.passes;
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

Place World::place_of(const char* path) const {
    if (strncmp(path, m_root.c_str(), m_root.size()) != 0) {
        return Devices::is_device(path) ? PLACE_DEVICE : PLACE_OTHER;
    }
    const std::string rest = path + m_root.size();
    if (rest.compare(0, 15, "/data/modem_log") == 0) {
        return PLACE_DATA;
    }
    if (rest.compare(0, 5, "/card") == 0) {
        return PLACE_CARD;
    }
    if (rest.compare(0, 12, "/data/local/") == 0) {
        return PLACE_SETTINGS;
    }
    if (rest == "/default.prop") {
        return PLACE_PROPS;
    }
    return Devices::is_device(rest) ? PLACE_DEVICE : PLACE_OTHER;
}

void World::file_opened(const char* path, Place place, FdInfo& info, int fd) const {
    if (place != PLACE_DATA && place != PLACE_CARD) {
        return;
    }
    const char* const name = strrchr(path, '/') + 1;
    info.cls = FD_TREE_FILE;
    info.stream = Media::stream_of(path);
    info.generation = g_state->card_generation;
    info.opened_in_calm =
        g_state->calm_ns != 0 && g_state->boot_ns - g_state->calm_ns > CALM_AFTER_NS;
    struct stat st;
    if (fstat(fd, &st) == 0) {
        info.inode = st.st_ino;
    }
    if (Media::is_log_name(name) && info.stream < STREAM_COUNT) {
        info.cls = FD_LOG_FILE;
    } else if (Media::is_capture_name(name)) {
        info.cls = FD_IQ_FILE;
        if (st.st_size != 0) {
            fail_run("iq", "%s, for a new buffer, has bytes already", path);
        }
    }
}

int World::open_device(const char* path) {
    const bool in_root = strncmp(path, m_root.c_str(), m_root.size()) == 0;
    const std::string name = in_root ? path + m_root.size() : path;
    return name == "/dev/iq_mem" ? m_iq.open() : m_devices.open(name);
}

void World::service_read(const FdInfo& info, const uint8_t* /*data*/, size_t len) {
    progress();
    if (info.cls != FD_LOG_DEVICE) {
        return;
    }
    m_last_stream = info.stream;
    const LogPipeHandler* const channel = m_controller->get_cp(STREAM_TYPES[info.stream]);
    const bool exchange = channel && channel->state() != CWS_WORKING;
    const size_t logged = m_devices.log_bytes(info.stream, len);
    if (logged < len) {
        g_state->streams[info.stream].answers_logged += len - logged;
        g_state->streams[info.stream].answers_seen = true;
    }
    if (logged > 0) {
        ledger::consumed(info.stream, logged, exchange);
        if (exchange) {
            m_devices.spoil_answer(info.stream);
        }
    }
}

void World::service_deletes(const char* path, Place place) const {
    if (place == PLACE_DATA || place == PLACE_CARD) {
        m_media.book_removal(path);
    }
}

int World::remove_by_shell(const char* command) {
    static const char prefix[] = "rm -fr ";
    if (strncmp(command, prefix, strlen(prefix)) != 0) {
        fail_run("shell", "command '%s'", command);
    }
    std::string path;
    bool quoted = false;
    for (const char* p = command + strlen(prefix); *p; ++p) {
        if (*p == '\'') {
            quoted = !quoted;
        } else if (*p == '\\' && !quoted && p[1]) {
            path += *++p;
        } else if (!quoted && strchr(" ;&|<>$`\"(){}\n", *p)) {
            fail_run("shell", "command '%s'", command);
        } else {
            path += *p;
        }
    }
    const Place place = place_of(path.c_str());
    if (place != PLACE_DATA && place != PLACE_CARD) {
        fail_run("shell", "removes '%s'", path.c_str());
    }
    if (place == PLACE_CARD && (!g_state->card_in || g_state->card_read_only)) {
        return 256;
    }
    static const char pattern[] = "/[0-9]*";
    const size_t len = strlen(pattern);
    if (path.size() > len && path.compare(path.size() - len, len, pattern) == 0) {
        m_media.remove_matching(path.substr(0, path.size() - len));
    } else {
        m_media.remove_all(path);
    }
    return 0;
}

void World::set_times(const char* path, struct stat& st) const {
    if (path[0] && place_of(path) != PLACE_PROPS) {
        return;
    }
    const int64_t ns = g_state->props_ns + g_state->wall_ns;
    st.st_mtim.tv_sec = st.st_ctim.tv_sec = ns / 1000000000;
    st.st_mtim.tv_nsec = st.st_ctim.tv_nsec = ns % 1000000000;
}

void World::message(const std::string& text) {
    // An address is not the same each time.
    const size_t end = std::min<size_t>(text.find("mapped to "), 400);
    trace("says %s", text.substr(0, end).c_str());
    if (text.find("dump complete") != std::string::npos) {
        check_saved(ST_WCDMA, "_memory_");
    }
    if (text.find("save config") != std::string::npos) {
        g_state->save_failed = true;
    }
    if (text.find("save log error") == std::string::npos &&
        text.find("bytes lost") == std::string::npos) {
        return;
    }
    if (m_last_stream == STREAM_COUNT) {
        fail_run("lost", "a block lost of no stream: %s", text.c_str());
    }
    if (!g_state->fault_in_step && !refusal_is_due()) {
        fail_run("refused", "nothing was in the way: %s", text.c_str());
    }
    ledger::excuse(m_last_stream);
}

// Whether the medium in use is above its quota and may not delete anything.
bool World::refusal_is_due() {
    const MediaStorage* const media = m_controller->stor_mgr().get_media_stor();
    if (!media) {
        return false;
    }
    const bool card = m_controller->stor_mgr().media_type() == MT_EXTERNAL;
    const Setting& quota = g_state->settings[card ? SET_CARD_MB : SET_DATA_MB];
    const Setting& overwrite = g_state->settings[SET_OVERWRITE];
    // A request that was sent may not have been read.
    const bool known = !quota.uncertain && !overwrite.uncertain && !m_clients.waiting();
    if (m_media.must_refuse(card ? MED_CARD : MED_DATA,
                            known ? uint64_t{quota.value} << 20 : media->quota(),
                            known ? overwrite.value != 0 : media->overwrite())) {
        return true;
    }
    // What others deleted is noticed at one refused write in so many.
    constexpr unsigned WRITES_A_RECOUNT = 16;
    return media->size() > media->quota() && ++m_refused_since_deletion < WRITES_A_RECOUNT;
}

// ---- Events

void World::write_props() const {
    State& state = *g_state;
    const bool mounted = state.card_in || state.card_told_ns != 0;
    std::string text =
        "persist.modem.w.enable=1\n"
        "persist.storage.type=1\n"
        "ro.modem.w.log=/sim/wcdma_log\n"
        "ro.modem.w.diag=/sim/wcdma_diag\n"
        "ro.modem.wcn.diag=/sim/wcn\n"
        "ro.modem.gnss.diag=/sim/gnss\n";
    text += std::string("init.svc.fuse_sdcard0=") + (mounted ? "running\n" : "stopped\n");
    text += "gsm.version.baseband=version" + std::to_string(state.version) + "\n";
    text += "persist.sys.vexa.modemreset=" + std::to_string(state.cp_reset[0]) + "\n";
    text += "persist.sys.vexa.wcnreset=" + std::to_string(state.cp_reset[1]) + "\n";
    make_file(m_root + "/default.prop.new", text);
    rename((m_root + "/default.prop.new").c_str(), (m_root + "/default.prop").c_str());
    state.props_ns = state.boot_ns;
}

void World::act(const Event& event) {
    State& state = *g_state;
    trace("event %s", to_text(event).c_str());
    if (event.kind != EV_FEED && event.kind != EV_REQUEST && event.kind != EV_CHECK &&
        event.kind != EV_SUPERVISOR) {
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
            m_media.insert_card(event.a % 4 == 1);
            write_props();
            break;
        case EV_CARD_READ_ONLY:
            state.card_read_only = state.card_in;
            state.tampered = true;
            break;
        case EV_MEDIUM_FULL:
            state.room[event.a % MEDIUM_COUNT] = event.b;
            break;
        case EV_MEDIUM_ROOM:
            state.room[event.a % MEDIUM_COUNT] = UINT64_MAX;
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
    m_media.insert_card(false);
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

// ---- Checks

void World::check(bool last) {
    if (!m_controller) {
        if (last) {
            fail_run("stopped", "the service does not start");
        }
        return;
    }
    ++g_state->counters.checks;
    m_clients.check_waiting();
    check_descriptors();
    check_totals();
    check_settings();
    m_media.check_names();
    m_media.check_bytes();
    if (last) {
        check_quota();
        for (const std::string& capture : m_media.captures()) {
            IqDevice::check_file(capture);
        }
        ledger::check_settled();
    }
}

void World::check_saved(unsigned stream, const char* kind) const {
    const std::string* const answer = m_devices.whole_answer(stream);
    if (answer && !g_state->tampered && !g_state->faulted &&
        !m_media.holds(stream, kind, *answer)) {
        fail_run("answer", "no %s file has the %zu bytes that were answered", kind, answer->size());
    }
}

// The settings file has what was set last.
void World::check_settings() const {
    static const char* const KEYS[] = {"log_file_size", "data_log_size", "sd_log_size"};
    if (g_state->faulted || g_state->save_failed || !m_clients.quiet()) {
        return;
    }
    std::ifstream in(m_root + "/data/local/tmp/kestmodem/kest_modem.conf");
    for (std::string line; std::getline(in, line);) {
        for (unsigned i = SET_FILE_MB; i <= SET_CARD_MB; ++i) {
            const Setting& setting = g_state->settings[i];
            const std::string key = std::string(KEYS[i]) + " ";
            if (line.compare(0, key.size(), key) == 0 && !setting.uncertain &&
                line.substr(key.size()) != std::to_string(setting.value)) {
                fail_run("settings", "'%s' is in the file, %u was set", line.c_str(),
                         setting.value);
            }
        }
    }
}

// In the calm nothing keeps a card above its quota.
void World::check_quota() const {
    const Setting& quota = g_state->settings[SET_CARD_MB];
    const Media::Seen seen = m_media.look(MED_CARD);
    const uint64_t limit = std::max(uint64_t{quota.value} << 20, seen.spared);
    if (!quota.uncertain && quota.value && seen.bytes > limit + 32768 &&
        m_controller->stor_mgr().media_type() == MT_EXTERNAL) {
        fail_run(
            "quota", "%llu bytes on a card with a quota of %u MB; counted are %llu",
            static_cast<unsigned long long>(seen.bytes), quota.value,
            static_cast<unsigned long long>(m_controller->stor_mgr().get_media_stor()->size()));
    }
}

void World::check_descriptors() const {
    unsigned count[FD_CLASS_COUNT] = {};
    unsigned devices[STREAM_COUNT] = {};
    for (const FdInfo& info : g_fds) {
        ++count[info.cls];
        if (info.cls == FD_LOG_DEVICE || info.cls == FD_DIAG_DEVICE) {
            ++devices[info.stream];
        }
    }
    const unsigned most[FD_CLASS_COUNT] = {
        MAX_FDS, STREAM_COUNT, 1, 2, STREAM_COUNT, 3, 0, 1, 3, 2, 0, 1, 1, 2};
    for (unsigned cls = FD_LOG_DEVICE; cls < FD_CLASS_COUNT; ++cls) {
        if (count[cls] > most[cls]) {
            fail_run("leak", "%u descriptors of class %u", count[cls], cls);
        }
    }
    for (unsigned stream = 0; stream < STREAM_COUNT; ++stream) {
        if (devices[stream] > 2) {
            fail_run("leak", "stream %u has %u open devices", stream, devices[stream]);
        }
    }
}

// What the service believes to have on a medium is what its lists hold.
void World::check_totals() const {
    for (MediaType type : {MT_INTERNAL, MT_EXTERNAL}) {
        const MediaStorage* const media = m_controller->stor_mgr().get_media(type);
        uint64_t sum = 0;
        for (const CpSetDirectory* set : media->sets()) {
            uint64_t of_set = 0;
            for (const CpDirectory* dir : set->dirs()) {
                uint64_t of_dir = 0;
                for (const LogFile* file : dir->files()) {
                    of_dir += file->counted();
                }
                if (of_dir != dir->size()) {
                    fail_run("total", "directory %s: %llu, its files %llu", dir->path().string(),
                             static_cast<unsigned long long>(dir->size()),
                             static_cast<unsigned long long>(of_dir));
                }
                of_set += of_dir;
            }
            sum += set->size();
            if (of_set != set->size() && !g_state->tampered && !g_state->faulted) {
                fail_run("total", "set %s: %llu, its files %llu", set->path().string(),
                         static_cast<unsigned long long>(set->size()),
                         static_cast<unsigned long long>(of_set));
            }
        }
        if (g_state->tampered || g_state->faulted) {
            continue;
        }
        if (sum != media->size()) {
            fail_run("total", "medium %d: %llu, its sets %llu", type,
                     static_cast<unsigned long long>(media->size()),
                     static_cast<unsigned long long>(sum));
        }
        const bool external = type == MT_EXTERNAL;
        uint64_t there = m_media.look(external ? MED_CARD : MED_DATA).bytes;
        for (const FdInfo& info : g_fds) {
            // What the thread has written is counted when it is done.
            const bool on_it = info.place == (external ? PLACE_CARD : PLACE_DATA);
            there -= info.cls == FD_IQ_FILE && on_it && !info.removed ? info.position : 0;
        }
        const bool known = !external || (g_state->card_in && media->scanned());
        if (known && (sum < there || sum > there + (STREAM_COUNT + 2) * 65536)) {
            fail_run("total", "medium %d: %llu, on the medium %llu", type,
                     static_cast<unsigned long long>(sum), static_cast<unsigned long long>(there));
        }
    }
}

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
    m_clients.mark_uncertain();
    if (g_state->save_failed || !m_clients.quiet()) {
        no_setting_is_certain();
    }
}

void World::rule_fired(Call call, Place place) {
    m_clients.mark_uncertain();
    if (g_state->starting) {
        no_setting_is_certain();  // a settings file that cannot be read is replaced by the default
    }
    if (call == CALL_WRITE && place == PLACE_SOCKET) {
        g_state->reply_lost = true;
    }
}

void World::check_end() const {
    for (int fd = 0; fd < MAX_FDS; ++fd) {
        if (g_fds[fd].cls != FD_NONE) {
            fail_run("leak", "descriptor %d of class %d is open at the end", fd, g_fds[fd].cls);
        }
    }
}
