// SPDX-License-Identifier: Apache-2.0
// The part of World that the service's calls ask: what a path is, what they may do.
#include <string.h>
#include <sys/stat.h>

#include <algorithm>

#include "channels/LogPipeHandler.h"
#include "control/LogController.h"
#include "sim/to_timespec.h"
#include "simulation/Ledger.h"
#include "simulation/World.h"

namespace {

// So long after everything was put in order the service has found out.
constexpr int64_t CALM_AFTER_NS = int64_t{65} * 1000000000;

}  // namespace

Place World::place_of(const char* path) const {
    static const std::pair<const char*, Place> PLACES[] = {{"/data/modem_log", PLACE_DATA},
                                                           {"/data/kest", PLACE_DATA},
                                                           {"/card", PLACE_CARD},
                                                           {"/data/local/", PLACE_SETTINGS},
                                                           {"/default.prop", PLACE_PROPS}};
    const bool in_root = strncmp(path, m_root.c_str(), m_root.size()) == 0;
    const char* const rest = in_root ? path + m_root.size() : path;
    for (const auto& place : PLACES) {
        if (in_root && strncmp(rest, place.first, strlen(place.first)) == 0) {
            return place.second;
        }
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
    if (Media::is_log_name(name) && info.stream < CHANNEL_COUNT) {
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

void World::service_read(const FdInfo& info, size_t len) {
    progress();
    if (info.cls != FD_LOG_DEVICE) {
        return;
    }
    m_last_stream = info.stream;
    g_state->dump_unconfirmed = g_state->dump_unconfirmed || info.stream == ST_DUMP;
    const LogPipeHandler* const channel = m_controller->get_cp(STREAM_TYPES[info.stream]);
    const bool exchange = channel && channel->state() != CWS_WORKING;
    const size_t logged = m_devices.log_bytes(info.stream, len);
    if (logged < len) {
        ledger::answer_logged(info.stream, len - logged);
    }
    if (logged > 0) {
        g_state->pulled_seen = !g_state->card_in && !g_state->card_told_ns;
        ledger::consumed(info.stream, logged, exchange);
        if (exchange) {
            m_devices.spoil_answer(info.stream);
        }
    }
}

void World::service_deletes(const char* path, Place place) {
    m_refused = 0;
    if (place == PLACE_DATA || place == PLACE_CARD) {
        m_media.book_removal(path);
    }
}

// All of a dump is read, unless something is in the way.
void World::dump_confirmed(int fd) {
    const StreamState& s = g_state->streams[ST_DUMP];
    if (s.fed != s.consumed && !g_fds[fd].failed && !g_state->fault_in_step && !refusal_is_due()) {
        fail_run("dump", "taken, with %llu bytes unread", number(s.fed - s.consumed));
    }
    m_devices.dump_confirmed(fd);
}

int World::remove_by_shell(const char* command) {
    static const char prefix[] = "rm -fr ";
    if (strncmp(command, prefix, strlen(prefix)) != 0) {
        fail_run("shell", "command '%s'", command);
    }
    int result = 0;
    std::string path;
    bool quoted = false;
    for (const char* p = command + strlen(prefix); *p; ++p) {
        if (*p == ' ' && !quoted && !path.empty()) {
            result |= remove_path(path);
            path.clear();
        } else if (*p == '\'') {
            quoted = !quoted;
        } else if (*p == '\\' && !quoted && p[1]) {
            path += *++p;
        } else if (!quoted && strchr(" ;&|<>$`\"(){}\n", *p)) {
            fail_run("shell", "command '%s'", command);
        } else {
            path += *p;
        }
    }
    return path.empty() ? result : result | remove_path(path);
}

int World::remove_path(const std::string& path) {
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
    st.st_mtim = st.st_ctim = to_timespec(g_state->props_ns + g_state->wall_ns);
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
        check_settings_kept();
    }
    const auto says = [&text](const char* words) { return text.find(words) != std::string::npos; };
    m_clears = m_clears || says("remove CP log");
    if (!says("save log error") && !says("bytes lost") && !says("DSP dump error")) {
        return;
    }
    if (m_last_stream == STREAM_COUNT) {
        fail_run("lost", "a block lost of no stream: %s", text.c_str());
    }
    const bool due = refusal_is_due();
    if (!g_state->fault_in_step && !due) {
        fail_run("refused", "nothing was in the way: %s", text.c_str());
    }
    ledger::excuse(m_last_stream);
    check_room_made();
    check_card_left(due);
}

// The errors that tell the state of a CP, while one is in it. Logs are cleared while nothing runs.
void World::service_answers(const std::string& line) {
    bool busy = false, off = false, down = false;
    for (unsigned stream = 0; stream < CHANNEL_COUNT; ++stream) {
        const LogPipeHandler& channel = *m_controller->get_cp(STREAM_TYPES[stream]);
        busy = busy || channel.state() > CWS_WORKING;
        off = off || !channel.enabled();
        down = down || channel.state() == CWS_NOT_WORKING;
    }
    if ((line == "ERROR 4\n" && !busy) || (line == "ERROR 5\n" && !off) ||
        (line == "ERROR 8\n" && !down) || (m_clears && (line == "OK\n") == busy)) {
        fail_run("reply", "in no such state: %s", line.c_str());
    }
    m_clears = false;
}

// Whether the medium in use is above its quota and may not delete anything.
bool World::refusal_is_due() {
    const MediaStorage* const media = m_controller->stor_mgr().get_media_stor();
    if (!media) {
        return false;
    }
    const MediumId medium = medium_in_use();
    const Setting& quota = g_state->settings[medium == MED_CARD ? SET_CARD_MB : SET_DATA_MB];
    const Setting& overwrite = g_state->settings[SET_OVERWRITE];
    // A request that was sent may not have been read.
    const bool known = !quota.uncertain && !overwrite.uncertain && !m_clients.waiting();
    if (m_media.must_refuse(medium, known ? uint64_t{quota.value} << 20 : media->quota(),
                            known ? overwrite.value != 0 : media->overwrite())) {
        return true;
    }
    // What others deleted is noticed at one refused write in so many.
    constexpr unsigned WRITES_A_RECOUNT = 16;
    return media->size() > media->quota() && ++m_refused_since_deletion < WRITES_A_RECOUNT;
}
