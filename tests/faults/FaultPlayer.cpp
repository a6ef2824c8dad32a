// SPDX-License-Identifier: Apache-2.0

#include "faults/FaultPlayer.h"

#include <algorithm>
#include <filesystem>
#include <regex>

#include "sim/byte_text.h"
#include "sim/files.h"
#include "sim/logged_bytes.h"
#include "sim/tree_text.h"

namespace fs = std::filesystem;

namespace {

const char SETTINGS[] = "data/local/tmp/kestmodem/kest_modem.conf";
const int SHORT_PATIENCE_MS = 400;  // for a step that may never come about
const int LONG_PATIENCE_MS = 10000;
const int ROUNDS = 2;  // a machine under load can make a step of the second round fail
const int MAX_IDLE_PASSES = 400;
// The staging buffer and the block that fills it.
const size_t MAX_LOSS = 65536 + 32768;

// Whether text comes about from whole when pieces of it are left out.
bool in_order(const std::string& text, const std::string& whole) {
    auto next = whole.begin();
    for (const char byte : text) {
        next = std::find(next, whole.end(), byte);
        if (next == whole.end()) {
            return false;
        }
        ++next;
    }
    return true;
}

}  // namespace

bool FaultPlayer::play_untouched(const std::string& script, ScriptResult* result) {
    if (!read(script) || !play_lines(FIRST) || !put_in_order() || !count_log_bytes(result)) {
        return false;
    }
    const std::map<std::string, size_t> unlogged = result->unlogged;
    const bool played = play_second_round(result);
    result->unlogged = unlogged;
    return played;
}

bool FaultPlayer::play_with_fault(const std::string& script, const ScriptResult& clean, bool* hit,
                                  size_t* lost) {
    m_patience_ms = SHORT_PATIENCE_MS;
    const bool played = read(script) && play_lines(FIRST, false);
    *hit = m_plan->failed > 0;
    m_plan->last = 0;
    m_patience_ms = PATIENCE_MS;
    const std::string text = settings();
    // A start that has not come so far leaves them to the next one.
    if (played && m_service.alive() && fs::exists(m_handset.path(SETTINGS)) &&
        !settings_whole(text)) {
        return fail("the settings file is not whole:\n" + text);
    }
    ScriptResult result;
    if (!played || !restart_if_ended() || !put_in_order() || !count_log_bytes(&result)) {
        return false;
    }
    const bool lasting = m_plan->failed > 1;
    *lost = 0;
    for (const auto& [cp, unlogged] : clean.unlogged) {
        const size_t missing = result.unlogged[cp] - std::min(unlogged, result.unlogged[cp]);
        *lost += missing;
        if (missing > MAX_LOSS && !lasting) {
            return fail(std::to_string(missing) + " bytes of " + cp + " were lost");
        }
    }
    for (int round = 1; !play_second_round(&result) || result.dialogue != clean.dialogue ||
                        result.new_bytes != clean.new_bytes;
         ++round) {
        if (round == ROUNDS) {
            return fail("does not work again after the fault: " + m_error + "\n" + result.dialogue);
        }
        if (!put_in_order() || !count_log_bytes(&result)) {
            return false;
        }
    }
    if (result.settings != clean.settings) {
        return fail("other settings in the end:\n" + result.settings);
    }
    if (!std::includes(result.records.begin(), result.records.end(), clean.records.begin(),
                       clean.records.end())) {
        return fail("a dump or record is not there");
    }
    m_patience_ms = LONG_PATIENCE_MS;
    if (!wait_until([&] { return descriptors() == clean.descriptors; }, "descriptors are closed")) {
        std::string names = "other descriptors than without the fault:";
        for (const std::string& name : clean.descriptors) {
            names += " " + name;
        }
        names += " now";
        for (const std::string& name : descriptors()) {
            names += " " + name;
        }
        return fail(names);
    }
    return m_plan->idle_passes <= MAX_IDLE_PASSES ||
           fail(std::to_string(m_plan->idle_passes) + " passes in a row came to nothing");
}

// A start that fails has an exit status and says why; another start is all it takes.
bool FaultPlayer::restart_if_ended() {
    if (m_service.alive() && !control_socket_missing()) {
        return true;
    }
    const std::string log = m_service.last_log_lines(1);
    const std::string status = m_service.alive() ? "" : m_service.status_text();
    if (!status.empty() && status != "exit status 2" && status != "exit status 255") {
        return fail("the service has ended: " + status + "\n" + m_service.last_log_lines(20));
    }
    if (!status.empty() && log.compare(0, 9, "E/KESTCP(") != 0) {
        return fail("the service has ended without a reason: " + log);
    }
    m_service.stop();
    m_client.disconnect();
    return start("");
}

// Then it runs without one, as the documents say.
bool FaultPlayer::control_socket_missing() const {
    const std::string log = m_service.log_text();
    return log.find("can not create server socket") != std::string::npos ||
           log.find("set server socket non-block error") != std::string::npos;
}

bool FaultPlayer::play_second_round(ScriptResult* result) {
    m_patience_ms = LONG_PATIENCE_MS;
    m_outcome.clear();
    // What could not be saved is saved with the next setting.
    const std::string setting = "SET_SD_MAX_SIZE " + std::to_string(m_sizes.sd);
    if (!play_lines(AGAIN) || m_settler.request("FLUSH", m_patience_ms) != "OK" ||
        m_settler.request(setting, m_patience_ms) != "OK" || !count_log_bytes(result)) {
        return false;
    }
    m_patience_ms = PATIENCE_MS;
    result->dialogue = m_outcome;
    result->settings = settings();
    result->records = records();
    result->descriptors = descriptors();
    return true;
}

bool FaultPlayer::count_log_bytes(ScriptResult* result) {
    std::map<std::string, size_t> bytes;
    for (const std::string& log_root : log_roots()) {
        std::error_code ec;
        for (fs::recursive_directory_iterator it(log_root, ec), end; !ec && it != end; ++it) {
            const std::string cp = it->path().filename().string();
            if (m_fed.count(cp) != 0 && !read_cp_dir(it->path().string(), cp, &bytes[cp])) {
                return false;
            }
        }
    }
    for (const auto& [cp, fed] : m_fed) {
        if (bytes[cp] > fed.size()) {
            return fail("more bytes of " + cp + " than were fed");
        }
        result->new_bytes[cp] = bytes[cp] - result->log_bytes[cp];
        result->log_bytes[cp] = bytes[cp];
        result->unlogged[cp] = fed.size() - bytes[cp];
    }
    return true;
}

bool FaultPlayer::read_cp_dir(const std::string& dir, const std::string& cp, size_t* bytes) {
    const std::vector<std::string> files = logged_bytes(dir);
    std::string text;
    bool good = true;
    for (const std::string& file : files) {
        text += file;
        good = good && in_order(file, m_fed[cp]);
    }
    *bytes += text.size();
    // When renaming goes on to fail, nothing tells the order of two files of one second.
    good = good && (in_order(text, m_fed[cp]) || m_plan->failed > 1);
    return good || fail("not the bytes that were fed, in their order:\n" + show_log_root(dir, "") +
                        show_bytes_line(m_fed[cp]));
}

// Not one line is missing or has lost its end.
bool FaultPlayer::settings_whole(const std::string& text) const {
    static const std::regex WORD("stream\t\\S+|[a-z_]+ ");
    const std::string given = read_text_file(m_handset.path("system/etc/kest_modem.conf"));
    for (std::sregex_iterator it(given.begin(), given.end(), WORD), end; it != end; ++it) {
        if (text.find(it->str()) == std::string::npos) {
            return false;
        }
    }
    // A comment may stay behind the settings.
    const size_t last_line = text.rfind('\n') + 1;
    return last_line == text.size() || text[last_line] == '#';
}

std::vector<std::string> FaultPlayer::log_roots() const {
    return {m_handset.path("data/modem_log"), m_handset.sd_root() + "/modem_log"};
}

std::string FaultPlayer::settings() const {
    return read_text_file(m_handset.path(SETTINGS));
}

std::set<std::string> FaultPlayer::records() const {
    static const std::regex KIND("memory|mini_dump|smsg|sbuf|sblock|ringbuf|sleeplog|wiq");
    std::set<std::string> contents;
    for (const std::string& log_root : log_roots()) {
        std::error_code ec;
        for (fs::recursive_directory_iterator it(log_root, ec), end; !ec && it != end; ++it) {
            if (std::regex_search(it->path().filename().string(), KIND)) {
                contents.insert(read_text_file(it->path().string()));
            }
        }
    }
    return contents;
}

// What the service has open, by name.
std::multiset<std::string> FaultPlayer::descriptors() const {
    std::multiset<std::string> names;
    const std::regex varying("^" + m_handset.root() + "|[0-9-]+_?|\\[.*|\\(deleted\\)");
    for (const std::string& name : m_service.descriptors()) {
        names.insert(std::regex_replace(name, varying, ""));
    }
    return names;
}
