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
    {"diag", &ScriptPlayer::send_diag},
    {"diag-request", &ScriptPlayer::await_diag_request},
    {"supervisor", &ScriptPlayer::tell_by_supervisor},
    {"sd", &ScriptPlayer::move_sd},
    {"client", &ScriptPlayer::client_request},
    {"client-send", &ScriptPlayer::client_send},
    {"client-reply", &ScriptPlayer::client_reply},
    {"client-notice", &ScriptPlayer::client_notice},
};

ScriptPlayer::ScriptPlayer(const std::string& program, bool keep_root)
    : m_program(program), m_keep_root(keep_root) {}

ScriptPlayer::~ScriptPlayer() {
    m_service.stop();
    if (!m_keep_root) {
        m_handset.remove_root();
    }
}

bool ScriptPlayer::play(const std::string& script_file) {
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
        if (!play_line(line)) {
            m_error = script_file + ":" + std::to_string(number) + ": " + m_error + "\n" +
                      m_service.last_log_lines(LOG_LINES);
            return false;
        }
        line.clear();
    }
    return finish() || fail(script_file + ": " + m_error);
}

bool ScriptPlayer::play_line(const std::string& line) {
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
    return !m_settler.connected() || !m_settler.request("GET_LOG_OVERWRITE", PATIENCE_MS).empty() ||
           fail("the service does not answer");
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
        if (!m_service.alive()) {
            return fail("the service does not run");
        }
        if (waited_ms >= PATIENCE_MS) {
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
