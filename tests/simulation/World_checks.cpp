// SPDX-License-Identifier: Apache-2.0
// The part of World that compares what the service holds and has written with what it should.
#include <fstream>

#include "channels/LogPipeHandler.h"
#include "control/LogController.h"
#include "simulation/Ledger.h"
#include "simulation/World.h"
#include "storage/CpDirectory.h"
#include "storage/CpSetDirectory.h"
#include "storage/LogFile.h"

namespace {

void check_total(const char* of, uint64_t total, uint64_t sum) {
    if (total != sum) {
        fail_run("total", "%s: %llu, its entries %llu", of, number(total), number(sum));
    }
}

}  // namespace

void World::check(bool last) {
    if (!m_controller) {
        if (last) {
            fail_run("stopped", "the service does not start");
        }
        return;
    }
    m_clients.check_waiting();
    if (g_state->dump_unconfirmed) {
        fail_run("dump", "what was read of the DSP's memory is not confirmed");
    }
    const bool modem_logs = g_state->streams[ST_WCDMA].logged.value;
    m_media.check_libraries(last && modem_logs ? std::make_optional(medium_in_use())
                                               : std::nullopt);
    check_descriptors();
    check_totals();
    check_settings();
    m_media.check_names();
    m_media.check_bytes();
    if (last) {
        check_quota();
        constexpr int64_t REST_NS = int64_t{610} * 1000000000;
        if (medium_in_use() != MED_CARD && g_state->boot_ns - g_state->card_failed_ns > REST_NS) {
            fail_run("medium", "the card is in, and not used");
        }
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

// Neither a failed write nor a kill leaves nothing. A copy of the default may not have begun.
void World::check_settings_kept() const {
    std::ifstream in(m_root + SETTINGS_PATH);
    if (in && in.peek() == EOF && !g_state->starting) {
        fail_run("settings", "the settings file is empty");
    }
}

// The settings file has what was set last.
void World::check_settings() const {
    static const char* const KEYS[] = {"log_file_size", "data_log_size", "sd_log_size"};
    check_settings_kept();
    if (g_state->faulted || g_state->save_failed || !m_clients.quiet()) {
        return;
    }
    std::ifstream in(m_root + SETTINGS_PATH);
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

MediumId World::medium_in_use() const {
    return m_controller->stor_mgr().media_type() == MT_EXTERNAL ? MED_CARD : MED_DATA;
}

Media::Seen World::look_at_medium_in_use() const {
    const MediaStorage* const media = m_controller->stor_mgr().get_media_stor();
    const CpSetDirectory* const set = media ? media->working_set() : nullptr;
    return m_media.look(medium_in_use(), set ? set->path().string() : "");
}

// On the medium in use this happens when only spared files are left.
void World::set_begins(const std::string& path) const {
    const Outside outside;
    const MediaStorage* const media = m_controller->stor_mgr().get_media_stor();
    const CpSetDirectory* const set = media ? media->working_set() : nullptr;
    if (!set || g_state->tampered || g_state->faulted ||
        path.substr(0, path.rfind('/')) != media->log_root().string()) {
        return;
    }
    const Media::Seen seen = look_at_medium_in_use();
    if (seen.bytes > seen.spared) {
        fail_run("set", "%s begins, with %llu bytes that could be deleted", path.c_str(),
                 number(seen.bytes - seen.spared));
    }
}

// In the calm nothing keeps a card above its quota.
void World::check_quota() const {
    const Setting& quota = g_state->settings[SET_CARD_MB];
    if (medium_in_use() != MED_CARD) {
        return;
    }
    const Media::Seen seen = look_at_medium_in_use();
    const uint64_t limit = std::max(uint64_t{quota.value} << 20, seen.spared);
    if (!quota.uncertain && quota.value && !g_state->scan_failed && seen.bytes > limit + 32768) {
        fail_run("quota", "%llu bytes on a card with a quota of %u MB; counted are %llu",
                 number(seen.bytes), quota.value,
                 number(m_controller->stor_mgr().get_media_stor()->size()));
    }
}

// A full medium whose old logs may be deleted takes data again.
void World::check_room_made() {
    constexpr unsigned MAX_REFUSED = 12;
    constexpr uint64_t MUCH = 3 << 20;
    constexpr uint64_t ENOUGH = 3 << 20;  // of new data: one and a half times the largest file
    const Setting& overwrite = g_state->settings[SET_OVERWRITE];
    const bool has_to = g_state->room[medium_in_use()] == 0 && overwrite.value &&
                        !overwrite.uncertain && m_clients.quiet() && !g_state->fault_seen &&
                        !g_state->card_read_only;
    m_refused = has_to ? m_refused + 1 : 0;
    if (m_refused == 1) {
        m_refused_from = g_state->counters.bytes;
    }
    if (m_refused > MAX_REFUSED) {
        const Media::Seen seen = look_at_medium_in_use();
        // Once enough for a new set has come, nothing is spared any more.
        const uint64_t came = g_state->counters.bytes - m_refused_from;
        const uint64_t spared = came > ENOUGH ? 0 : seen.spared;
        if (seen.bytes > spared + MUCH) {
            fail_run("full", "%u blocks refused, %llu bytes came, with %llu that may be deleted",
                     m_refused, number(came), number(seen.bytes - spared));
        }
    }
}

// A card that takes nothing is left for the internal medium.
void World::check_card_left(bool due) {
    constexpr unsigned MAX_LOST = 12;
    const bool has_to = !due && !g_state->fault_seen && g_state->room[MED_DATA] == UINT64_MAX &&
                        (!g_state->card_in || g_state->card_read_only);
    uint64_t stored = 0;
    for (const StreamState& stream : g_state->streams) {
        stored += stream.stored;
    }
    m_lost_beside_card = has_to && stored == m_stored ? m_lost_beside_card + 1 : 0;
    m_stored = stored;
    if (m_lost_beside_card > MAX_LOST) {
        fail_run("medium", "%u blocks lost, and the internal medium takes all", m_lost_beside_card);
    }
}

void World::check_between_lives() const {
    check_settings_kept();
    m_media.check_bytes();
    m_media.check_libraries(std::nullopt);
}

void World::check_descriptors() const {
    unsigned count[FD_CLASS_COUNT] = {};
    unsigned devices[STREAM_COUNT] = {};
    // Of a client that hung up the transaction may still run; another has its place.
    unsigned gone = 0;
    for (int fd = 0; fd < MAX_FDS; ++fd) {
        const FdInfo& info = g_fds[fd];
        const bool hung_up = info.cls == FD_CLIENT && has_hung_up(fd);
        gone += hung_up;
        count[info.cls] += !hung_up;
        if (info.cls == FD_LOG_DEVICE || info.cls == FD_DIAG_DEVICE) {
            ++devices[info.stream];
        }
        if (info.cls == FD_LOG_FILE &&
            !m_controller->get_cp(STREAM_TYPES[info.stream])->enabled()) {
            fail_run("leak", "a log file of stream %u is open, and its log is off", info.stream);
        }
        if (info.cls == FD_LOG_FILE &&
            (info.place == PLACE_CARD) != (medium_in_use() == MED_CARD)) {
            fail_run("medium", "a log file of stream %u is open on the other one", info.stream);
        }
    }
    const unsigned most[FD_CLASS_COUNT] = {
        MAX_FDS, STREAM_COUNT, 1, CHANNEL_COUNT, 3, 0, 1, 3, 2, 0, 1, 1, 2};
    for (unsigned cls = FD_LOG_DEVICE; cls < FD_CLASS_COUNT; ++cls) {
        if (count[cls] > most[cls]) {
            fail_run("leak", "%u descriptors of class %u", count[cls], cls);
        }
    }
    if (gone > most[FD_CLIENT] + CHANNEL_COUNT) {
        fail_run("leak", "%u descriptors of clients that hung up", gone);
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
        const bool external = type == MT_EXTERNAL;
        const bool doubtful = Media::is_doubtful(external ? MED_CARD : MED_DATA);
        uint64_t sum = 0;
        for (const CpSetDirectory* set : media->sets()) {
            uint64_t of_set = 0;
            for (const CpDirectory* dir : set->dirs()) {
                uint64_t of_dir = 0;
                for (const LogFile* file : dir->files()) {
                    of_dir += file->counted();
                }
                check_total(dir->path().string(), dir->size(), of_dir);
                of_set += of_dir;
            }
            sum += set->size();
            check_total(set->path().string(), set->size(), doubtful ? set->size() : of_set);
        }
        if (doubtful) {
            continue;
        }
        check_total(media->top_dir().string(), media->size(), sum);
        uint64_t there = m_media.look(external ? MED_CARD : MED_DATA).bytes;
        for (const FdInfo& info : g_fds) {
            // What the thread has written is counted when it is done.
            const bool on_it = info.place == (external ? PLACE_CARD : PLACE_DATA);
            there -= info.cls == FD_IQ_FILE && on_it && !info.removed ? info.position : 0;
        }
        const bool known = !external || (g_state->card_in && media->scanned());
        uint64_t staged = (STREAM_COUNT + 2) * 65536;
        if (external && g_state->card_fresh) {
            // On a card that came empty no more than what came since, with its headers: one of 16
            // bytes for a file, or of 20 for a chunk, which may have but one byte.
            const uint64_t came = g_state->counters.bytes - g_state->card_bytes;
            staged = std::min(staged, 21 * came + CHANNEL_COUNT * 16);
        }
        if (known && (sum < there || sum > there + staged)) {
            fail_run("total", "medium %d: %llu, on the medium %llu", type, number(sum),
                     number(there));
        }
    }
}

void World::check_end() const {
    for (int fd = 0; fd < MAX_FDS; ++fd) {
        if (g_fds[fd].cls != FD_NONE) {
            fail_run("leak", "descriptor %d of class %d is open at the end", fd, g_fds[fd].cls);
        }
    }
}
