// SPDX-License-Identifier: Apache-2.0

#include "sim/ScriptPlayer.h"

#include <errno.h>
#include <string.h>
#include <unistd.h>

#include <algorithm>
#include <fstream>

#include "sim/byte_text.h"
#include "sim/tree_text.h"

namespace {

const int STEP_MS = 1;
const int SOCKETS = 5;             // of the service: the server's, two clients, two supervisors
const int LEAST_PATIENCE_MS = 50;  // once much has failed

const size_t LOG_LINES = 20;
const char INTERNAL_LOGS[] = "data/modem_log";
const char SD_LOGS[] = "storage/sdcard0/modem_log";

}  // namespace

struct ScriptPlayer::CommandRow {
    const char* word;
    Command run;
};

const ScriptPlayer::CommandRow ScriptPlayer::COMMANDS[] = {
    {"configure", &ScriptPlayer::configure},
    {"cp", &ScriptPlayer::add_cp},
    {"property", &ScriptPlayer::set_property},
    {"file", &ScriptPlayer::write_file},
    {"time", &ScriptPlayer::set_time},
    {"start", &ScriptPlayer::start},
    {"log", &ScriptPlayer::feed_log},
    {"queue", &ScriptPlayer::queue_log},
    {"pcm", &ScriptPlayer::feed_pcm},
    {"dsp-crash", &ScriptPlayer::crash_dsp},
    {"iq", &ScriptPlayer::capture_iq},
    {"diag", &ScriptPlayer::send_diag},
    {"diag-request", &ScriptPlayer::await_diag_request},
    {"supervisor", &ScriptPlayer::tell_by_supervisor},
    {"sd", &ScriptPlayer::move_sd},
    {"show", &ScriptPlayer::show_file},
    {"client", &ScriptPlayer::client_request},
    {"client-log", &ScriptPlayer::client_log},
    {"client-send", &ScriptPlayer::client_send},
    {"client-reply", &ScriptPlayer::client_reply},
    {"client-notice", &ScriptPlayer::client_notice},
};

ScriptPlayer::ScriptPlayer(const std::string& program, bool keep_root,
                           const volatile sig_atomic_t* interrupted)
    : m_program(program), m_keep_root(keep_root), m_interrupted(interrupted) {}

ScriptPlayer::~ScriptPlayer() {
    m_service.stop();
    if (!m_keep_root) {
        m_handset.remove_root();
    }
}

bool ScriptPlayer::play(const std::string& script_file) {
    return read(script_file) && play_lines(FIRST) &&
           (finish() || fail(script_file + ": " + m_error));
}

bool ScriptPlayer::read(const std::string& script_file) {
    std::ifstream script(script_file);
    if (!script) {
        return fail("cannot read " + script_file + ": " + strerror(errno));
    }
    unsigned number = 0;
    std::string line;
    for (std::string part; std::getline(script, part);) {
        ++number;
        line += part;
        if (!line.empty() && line.back() == '\\') {
            line.back() = ' ';  // it goes on in the next line
            continue;
        }
        m_lines.push_back({script_file + ":" + std::to_string(number), line});
        line.clear();
    }
    if (script.bad()) {
        return fail("cannot read " + script_file);
    }
    if (!line.empty()) {  // the last one ended with a backslash
        m_lines.push_back({script_file + ":" + std::to_string(number), line});
    }
    return true;
}

bool ScriptPlayer::play_lines(Round round, bool patient) {
    bool skipped = round == AGAIN;
    for (const Line& line : m_lines) {
        if (skipped || play_line(line.text)) {
            skipped = skipped && line.text != "start";
            continue;
        }
        if (patient) {
            return fail(line.place + ": " + m_error + "\n" + m_service.last_log_lines(LOG_LINES));
        }
        m_patience_ms = std::max(m_patience_ms / 2, LEAST_PATIENCE_MS);
    }
    return true;
}

bool ScriptPlayer::play_line(const std::string& line) {
    if (interrupted()) {
        return fail("interrupted");
    }
    std::string args = line;
    const std::string word = take_script_word(&args);
    if (word.empty() || word[0] == '#') {
        return true;
    }
    for (const CommandRow& row : COMMANDS) {
        if (word == row.word) {
            const bool has_root = !m_handset.root().empty();
            return (row.run == &ScriptPlayer::configure || has_root || make_handset()) &&
                   (this->*row.run)(args) && settle();
        }
    }
    return fail("unknown command " + word);
}

bool ScriptPlayer::make_handset() {
    return m_handset.create("", m_sizes) || fail(m_handset.error());
}

// What the service has read it also deals with before it answers a request.
bool ScriptPlayer::settle() {
    return !m_settler.connected() ||
           !m_settler.request("GET_LOG_OVERWRITE", m_patience_ms).empty() ||
           fail("the service does not answer");
}

// Puts everything around the service in order.
bool ScriptPlayer::put_in_order() {
    const std::string& root = m_handset.root();
    m_client.disconnect();
    m_settler.disconnect();
    if (!m_handset.remove_sd() || !set_time("1456824000") ||
        !wait_until([&] { return m_modem_supervisor.connected() && m_wcn_supervisor.connected(); },
                    "the service connects to the supervisors") ||
        !m_client.connect(root, m_patience_ms) || !m_settler.connect(root, m_patience_ms) ||
        m_client.request("DISABLE_IQ WCDMA WCDMA", m_patience_ms).empty() || !settle() ||
        // What the old connections have sent is carried out before they end.
        !wait_until(
            [&] {
                const auto open = m_service.descriptors();
                return std::count_if(open.begin(), open.end(), [](const std::string& name) {
                           return name.compare(0, 7, "socket:") == 0;
                       }) == SOCKETS;
            },
            "the service drops the clients that left")) {
        return fail("connections: " + m_error);
    }
    for (const auto& cp : m_handset.cps()) {
        if (cp->modem) {
            cp->diag.discard();
            cp->diag.read_request(0, 0);
        }
    }
    if (!m_modem_supervisor.send("Modem Alive") || !m_wcn_supervisor.send("WCN-EXTERNAL-ALIVE")) {
        return fail("no supervisor");
    }
    for (const auto& [name, word] : std::map<std::string, std::string>{
             {"cp_wcdma", "WCDMA"}, {"cp_gnss", "GNSS"}, {"agdsp", "AG-DSP"}}) {
        // The DSP's other devices are only opened when its log is started.
        if (name == "agdsp" && m_handset.audio_dsp().exists()) {
            m_settler.request("DISABLE_LOG " + word, m_patience_ms);
        }
        if (m_settler.request("GET_LOG_STATE " + word, m_patience_ms) == "OK OFF") {
            m_settler.request("ENABLE_LOG " + word, m_patience_ms);
        }
    }
    return wait_until(
               [&] {
                   return std::all_of(m_handset.cps().begin(), m_handset.cps().end(),
                                      [](const auto& cp) { return cp->log.pending() == 0; });
               },
               "the service reads the log devices") &&
           (m_settler.request("FLUSH", m_patience_ms) == "OK" || fail("FLUSH"));
}

// What the service has not written yet when the script ends is lost with it.
bool ScriptPlayer::finish() {
    if (!m_service.alive()) {
        return fail("the service does not run at the end of the script");
    }
    m_service.stop();
    for (const char* log_root : {INTERNAL_LOGS, SD_LOGS}) {
        m_outcome += show_log_root(m_handset.root(), log_root);
    }
    return true;
}

bool ScriptPlayer::fail(const std::string& reason) {
    m_error = reason;
    return false;
}

bool ScriptPlayer::wait_until(const std::function<bool()>& condition, const std::string& what) {
    for (int waited_ms = 0; !condition(); waited_ms += STEP_MS) {
        if (interrupted()) {
            return fail("interrupted");
        }
        if (!m_service.alive()) {
            return fail("the service does not run");
        }
        if (waited_ms >= m_patience_ms) {
            return fail("did not come about: " + what);
        }
        usleep(STEP_MS * 1000);
    }
    return true;
}

bool ScriptPlayer::bytes_of(const std::string& text, std::string* bytes) {
    std::string reason;
    return parse_bytes(text, bytes, &reason) || fail(reason);
}
