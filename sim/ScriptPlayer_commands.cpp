// SPDX-License-Identifier: Apache-2.0
// The part of ScriptPlayer that carries out the commands.
#include <errno.h>
#include <stdlib.h>
#include <string.h>

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <regex>
#include <sstream>
#include <vector>

#include "sim/ScriptPlayer.h"
#include "sim/byte_text.h"
#include "sim/files.h"

namespace {

// What the service reads at a time.
const size_t BLOCK = 32768;

bool parse_number(const std::string& text, unsigned* value) {
    char* end;
    const unsigned long number = strtoul(text.c_str(), &end, 10);
    *value = static_cast<unsigned>(number);
    return !text.empty() && *end == '\0' && number == *value;
}

size_t count_of(const std::string& text, const std::string& part) {
    size_t count = 0;
    for (size_t at = 0; (at = text.find(part, at)) != std::string::npos; ++at) {
        ++count;
    }
    return count;
}

}  // namespace

std::string take_script_word(std::string* text) {
    const size_t end = std::min(text->find(' '), text->size());
    const std::string word = text->substr(0, end);
    text->erase(0, std::min(text->find_first_not_of(' ', end), text->size()));
    return word;
}

// ---- Before the service starts

bool ScriptPlayer::configure(const std::string& args) {
    std::string value = args;
    const std::string key = take_script_word(&value);
    if (!m_handset.root().empty()) {
        return fail("configure comes before everything else");
    }
    if (key == "log_overwrite" && (value == "enable" || value == "disable")) {
        m_sizes.overwrite = value == "enable";
        return true;
    }
    const struct {
        const char* key;
        unsigned* size;
    } sizes[] = {{"log_file_size", &m_sizes.log_file},
                 {"data_log_size", &m_sizes.data},
                 {"sd_log_size", &m_sizes.sd}};
    for (const auto& size : sizes) {
        if (key == size.key && parse_number(value, size.size)) {
            return true;
        }
    }
    return fail("not a setting with a value: " + args);
}

bool ScriptPlayer::add_cp(const std::string& name) {
    const bool added = name == "agdsp"    ? m_handset.add_audio_dsp()
                       : name == "iq_mem" ? m_handset.add_iq_memory()
                                          : m_handset.add_cp(name) != nullptr;
    return added || fail(m_handset.error());
}

bool ScriptPlayer::set_property(const std::string& args) {
    std::string value = args;
    const std::string name = take_script_word(&value);
    const std::string root = "$ROOT";
    const size_t at = value.find(root);
    if (at != std::string::npos) {
        value.replace(at, root.size(), m_handset.root());
    }
    return m_handset.set_prop(name, value) || fail(m_handset.error());
}

bool ScriptPlayer::write_file(const std::string& args) {
    std::string text = args;
    const std::string path = m_handset.path(take_script_word(&text));
    std::string bytes;
    if (!bytes_of(text, &bytes)) {
        return false;
    }
    std::error_code ec;
    std::filesystem::create_directories(std::filesystem::path(path).parent_path(), ec);
    std::ofstream file(path, std::ios::binary);
    file << bytes;
    file.close();
    return !file.fail() || fail("cannot write " + path);
}

bool ScriptPlayer::set_time(const std::string& args) {
    unsigned seconds;
    if (args == "gone") {
        m_handset.time_service().stop();
        return true;
    }
    if (!parse_number(args, &seconds) || seconds == 0) {
        return fail("neither seconds since 1970 nor gone: " + args);
    }
    TimeService& service = m_handset.time_service();
    service.set_time(seconds);
    return service.running() || service.start(m_handset.root()) || fail("no time service");
}

bool ScriptPlayer::start(const std::string&) {
    const std::string& root = m_handset.root();
    // The supervisors first: the service connects to them when it starts, or 3 seconds later.
    if (!m_modem_supervisor.start("modemd", root) ||
        !m_wcn_supervisor.start("external_wcn_kest", root)) {
        return fail(std::string("cannot start the supervisors: ") + strerror(errno));
    }
    if (!m_service.start(m_program, m_handset)) {
        return fail("cannot run " + m_program + ": " + strerror(errno));
    }
    return wait_until(
        [&] {
            return m_modem_supervisor.connected() && m_wcn_supervisor.connected() &&
                   (m_client.connected() || m_client.connect(root, 0)) &&
                   m_settler.connect(root, 0);
        },
        "the service's connections");
}

// ---- While it runs

SimLogDevice* ScriptPlayer::log_device(const std::string& cp_name) {
    if (cp_name == "agdsp" && m_handset.audio_dsp().exists()) {
        return &m_handset.audio_dsp().log();
    }
    SimCp* cp = m_handset.cp(cp_name);
    if (!cp) {
        fail("the handset has no " + cp_name);
    }
    return cp ? &cp->log : nullptr;
}

SimDiagDevice* ScriptPlayer::diag_device(const std::string& cp_name) {
    SimCp* cp = m_handset.cp(cp_name);
    if (!cp || !cp->modem) {
        fail("the handset has no modem " + cp_name);
        return nullptr;
    }
    return &cp->diag;
}

bool ScriptPlayer::feed(SimLogDevice& device, const std::string& bytes, bool until_read,
                        std::string* fed) {
    for (size_t done = 0; done < bytes.size();) {
        const ssize_t n = device.feed(&bytes[done], std::min(BLOCK, bytes.size() - done));
        if (n <= 0) {
            return fail("the device is full");
        }
        if (fed) {
            fed->append(bytes, done, static_cast<size_t>(n));
        }
        done += static_cast<size_t>(n);
        if (until_read &&
            !wait_until([&] { return device.pending() == 0; }, "the service reads the device")) {
            return false;
        }
    }
    return true;
}

bool ScriptPlayer::feed_log(const std::string& args) {
    return feed_cp(args, true);
}

bool ScriptPlayer::queue_log(const std::string& args) {
    return feed_cp(args, false);
}

bool ScriptPlayer::feed_cp(const std::string& args, bool until_read) {
    std::string text = args;
    std::string bytes;
    const std::string cp_name = take_script_word(&text);
    SimLogDevice* device = log_device(cp_name);
    if (!device || !bytes_of(text, &bytes)) {
        return false;
    }
    return feed(*device, bytes, until_read, &m_fed[cp_name]);
}

bool ScriptPlayer::feed_pcm(const std::string& args) {
    std::string bytes;
    if (!m_handset.audio_dsp().exists()) {
        return fail("the handset has no agdsp");
    }
    return bytes_of(args, &bytes) && feed(m_handset.audio_dsp().pcm(), bytes, true);
}

bool ScriptPlayer::crash_dsp(const std::string& args) {
    SimDspDevice& dsp = m_handset.audio_dsp();
    std::string bytes;
    if (!dsp.exists()) {
        return fail("the handset has no agdsp");
    }
    if (!bytes_of(args, &bytes)) {
        return false;
    }
    const unsigned taken = dsp.dumps_taken();
    if (!dsp.crash(std::vector<uint8_t>(bytes.begin(), bytes.end()))) {
        return fail("the dump device takes no memory of this size now");
    }
    return wait_until([&] { return dsp.dumps_taken() > taken; }, "the service takes the dump");
}

bool ScriptPlayer::capture_iq(const std::string& args) {
    SimIqDevice& iq = m_handset.iq_memory();
    std::string bytes;
    if (!iq.exists() || !bytes_of(args, &bytes)) {
        return fail("no iq_mem or no bytes");
    }
    const unsigned released = iq.released();
    if (!wait_until([&] { return iq.in_use() && !iq.filled(); }, "the I/Q memory is in use") ||
        !iq.announce_bytes(bytes)) {
        return fail("the I/Q memory takes no buffer of this size now");
    }
    return wait_until([&] { return iq.released() > released; }, "the service saves the buffer");
}

bool ScriptPlayer::send_diag(const std::string& args) {
    std::string text = args;
    std::string bytes;
    SimDiagDevice* device = diag_device(take_script_word(&text));
    if (!device || !bytes_of(text, &bytes)) {
        return false;
    }
    return device->write_reply(bytes.data(), bytes.size(), m_patience_ms) ||
           fail("the service does not read the diag device");
}

bool ScriptPlayer::await_diag_request(const std::string& args) {
    std::string text = args;
    const std::string cp_name = take_script_word(&text);
    SimDiagDevice* device = diag_device(cp_name);
    unsigned count;
    if (!device) {
        return false;
    }
    if (!parse_number(text, &count)) {
        return fail("not a number of bytes: " + text);
    }
    const std::vector<uint8_t> bytes = device->read_request(count, m_patience_ms);
    tell("diag device of " + cp_name + ": " +
         show_bytes_line(std::string(bytes.begin(), bytes.end())));
    return bytes.size() >= count || fail("fewer bytes on the diag device");
}

bool ScriptPlayer::tell_by_supervisor(const std::string& args) {
    std::string text = args;
    std::string bytes;
    const std::string name = take_script_word(&text);
    if ((name != "modem" && name != "wcn") || !bytes_of(text, &bytes)) {
        return fail("neither modem nor wcn with bytes: " + args);
    }
    SimSupervisor& supervisor = name == "modem" ? m_modem_supervisor : m_wcn_supervisor;
    // The service logs what a supervisor sends when it reads it.
    const std::string note = "process_data(): " + std::to_string(bytes.size()) + " bytes: ";
    const size_t before = count_of(m_service.log_text(), note);
    if (!supervisor.send(bytes)) {
        return fail("the service is not connected to the supervisor");
    }
    return wait_until([&] { return count_of(m_service.log_text(), note) > before; },
                      "the service reads from the supervisor");
}

bool ScriptPlayer::move_sd(const std::string& args) {
    if (args != "in" && args != "out") {
        return fail("neither in nor out: " + args);
    }
    return (args == "in" ? m_handset.insert_sd() : m_handset.remove_sd()) ||
           fail(m_handset.error());
}

bool ScriptPlayer::show_file(const std::string& path) {
    if (!std::filesystem::exists(m_handset.path(path))) {
        tell(path + ": is not there");
        return true;
    }
    tell(path + ":");
    for (const std::string& piece : show_bytes(read_text_file(m_handset.path(path)))) {
        tell("    " + piece);
    }
    return true;
}

bool ScriptPlayer::client_request(const std::string& args) {
    return client_send(args) && client_reply("");
}

bool ScriptPlayer::client_log(const std::string& args) {
    static const std::regex process("^[A-Z]/[A-Z]+\\([0-9]+\\): ");
    static const std::regex error(" \\[[0-9]+\\(.*\\)\\]$");
    // What is not known is logged before it is answered, after all that came before.
    const auto settled_log = [&] {
        m_settler.request("settled", m_patience_ms);
        return m_service.log_text();
    };
    std::string request;
    if (!bytes_of(args, &request)) {
        return false;
    }
    tell("client: " + args);
    const size_t before = settled_log().size();
    if (!m_client.send(request) || !client_reply("")) {
        return fail("no reply to " + args);
    }
    std::istringstream log(settled_log().substr(before));
    std::vector<std::string> messages;
    for (std::string line; std::getline(log, line);) {
        line = std::regex_replace(line, process, "");
        const std::string& root = m_handset.root();
        const size_t at = line.find(root);
        if (at != std::string::npos) {
            line.replace(at, root.size(), "$ROOT");
        }
        messages.push_back("log: " + std::regex_replace(line, error, " [errno]"));
    }
    if (messages.empty()) {
        return fail("the service does not log");
    }
    messages.pop_back();  // of the settling
    for (const std::string& message : messages) {
        tell(message);
    }
    return true;
}

bool ScriptPlayer::client_send(const std::string& args) {
    tell("client: " + args);
    return m_client.send(args) || fail("the service has closed the client's connection");
}

bool ScriptPlayer::client_reply(const std::string&) {
    std::string line;
    if (!m_client.reply(&line, m_patience_ms)) {
        return fail("no reply");
    }
    tell("service: " + line);
    return true;
}

bool ScriptPlayer::client_notice(const std::string&) {
    std::string line;
    if (!m_client.notification(&line, m_patience_ms)) {
        return fail("no notification");
    }
    tell("service: " + line);
    return true;
}
