// SPDX-License-Identifier: Apache-2.0

#include "sim/SimHandset.h"

#include <errno.h>
#include <stdio.h>
#include <string.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>

#include "sim/LogCollector.h"
#include "sim/files.h"

namespace fs = std::filesystem;

namespace {

// The CPs that can be simulated and the properties that announce them.
struct CpKind {
    const char* name;
    const char* log_prop;  // null: the diag device carries the log as well
    const char* diag_prop;
    const char* enable_prop;
};

const CpKind CP_KINDS[] = {
    {"cp_wcdma", "ro.modem.w.log", "ro.modem.w.diag", "persist.modem.w.enable"},
    {"cp_td-scdma", "ro.modem.t.log", "ro.modem.t.diag", "persist.modem.t.enable"},
    {"cp_3mode", "ro.modem.tl.log", "ro.modem.tl.diag", "persist.modem.tl.enable"},
    {"cp_4mode", "ro.modem.lf.log", "ro.modem.lf.diag", "persist.modem.lf.enable"},
    {"cp_5mode", "ro.modem.l.log", "ro.modem.l.diag", "persist.modem.l.enable"},
    {"cp_wcn", nullptr, "ro.modem.wcn.diag", nullptr},
    {"cp_gnss", nullptr, "ro.modem.gnss.diag", nullptr},
};

const CpKind* find_kind(const std::string& name) {
    const CpKind* kind = std::find_if(std::begin(CP_KINDS), std::end(CP_KINDS),
                                      [&](const CpKind& k) { return name == k.name; });
    return kind == std::end(CP_KINDS) ? nullptr : kind;
}

// Of a property's value, with the end of the text. A longer one counts as none.
constexpr size_t PROPERTY_SIZE = 92;

const char SD_STATE_PROP[] = "init.svc.fuse_sdcard0";

// Readers never see half a file: it is written beside the old one and moved over it.
bool replace_file(const std::string& path, const std::string& text) {
    const std::string temp = path + ".new";
    FILE* f = fopen(temp.c_str(), "we");
    if (!f) {
        return false;
    }
    const bool written = fwrite(text.data(), 1, text.size(), f) == text.size();
    return fclose(f) == 0 && written && rename(temp.c_str(), path.c_str()) == 0;
}

}  // namespace

size_t SimCp::feed(size_t len) {
    uint8_t buf[16384];
    size_t done = 0;
    while (done < len) {
        const size_t n = std::min(len - done, sizeof buf);
        stream.fill(fed, buf, n);
        const ssize_t taken = log.feed(buf, n);
        if (taken <= 0) {
            break;
        }
        fed += static_cast<size_t>(taken);
        done += static_cast<size_t>(taken);
    }
    return done;
}

bool SimHandset::fail(const std::string& what) {
    m_error = what + ": " + strerror(errno);
    return false;
}

bool SimHandset::create(const std::string& dir, const SimSizes& sizes) {
    m_sizes = sizes;
    std::error_code ec;
    if (dir.empty()) {
        m_root = make_temp_dir(temp_dir(), "kestsim");
        if (m_root.empty()) {
            return fail("cannot make a directory in " + temp_dir());
        }
    } else {
        fs::create_directories(dir, ec);
        if (!ec && !fs::is_empty(dir, ec) && !ec) {
            m_error = dir + " is not empty";
            return false;
        }
        // Devices are announced by absolute paths.
        const fs::path absolute = ec ? fs::path() : fs::canonical(dir, ec);
        if (ec) {
            m_error = "cannot use " + dir + ": " + ec.message();
            return false;
        }
        m_root = absolute.string();
    }
    for (const char* rel : {"data/local/tmp/kestmodem", "system/etc", "dev", "storage/sdcard0"}) {
        fs::create_directories(path(rel), ec);
        if (ec) {
            m_error = "cannot make " + path(rel) + ": " + ec.message();
            return false;
        }
    }
    if (!m_time.start(m_root)) {
        return fail("cannot start the time service of " + m_root);
    }
    return set_prop("gsm.version.baseband", "simulated baseband 1.0") &&
           set_prop("persist.storage.type", "1") && set_prop(SD_STATE_PROP, "stopped") &&
           write_config();
}

bool SimHandset::knows_cp(const std::string& name, bool* modem) {
    const CpKind* kind = find_kind(name);
    *modem = kind && kind->log_prop;
    return kind != nullptr;
}

SimCp* SimHandset::add_cp(const std::string& name, bool terminal) {
    const CpKind* kind = find_kind(name);
    if (!kind) {
        m_error = "no CP is called " + name;
        return nullptr;
    }
    const bool modem = kind->log_prop != nullptr;
    auto cp = std::make_unique<SimCp>(name, modem, static_cast<uint8_t>(kind - CP_KINDS));
    const std::string log_path = path("dev/" + name + "_log");
    const std::string diag_path = path("dev/" + name + "_diag");
    if (!cp->log.create(log_path, terminal) || (modem && !cp->diag.create(diag_path))) {
        fail("cannot make the devices of " + name);
        return nullptr;
    }
    m_cps.push_back(std::move(cp));
    const bool announced = modem ? set_prop(kind->log_prop, log_path) &&
                                       set_prop(kind->diag_prop, diag_path) &&
                                       set_prop(kind->enable_prop, "1")
                                 : set_prop(kind->diag_prop, log_path);
    return announced && write_config() ? m_cps.back().get() : nullptr;
}

bool SimHandset::add_audio_dsp() {
    return m_audio_dsp.create(m_root) ? write_config()
                                      : fail("cannot make the devices of the audio DSP");
}

bool SimHandset::add_iq_memory() {
    return m_iq_memory.create(m_root) || fail("cannot make the I/Q memory");
}

SimCp* SimHandset::cp(const std::string& name) const {
    const auto found =
        std::find_if(m_cps.begin(), m_cps.end(), [&](const auto& cp) { return cp->name == name; });
    return found == m_cps.end() ? nullptr : found->get();
}

bool SimHandset::write_config() {
    std::string text = "minidump disable\texternal\n";
    text += "log_file_size " + std::to_string(m_sizes.log_file) + "\n";
    text += "data_log_size " + std::to_string(m_sizes.data) + "\n";
    text += "sd_log_size " + std::to_string(m_sizes.sd) + "\n";
    text += std::string("log_overwrite ") + (m_sizes.overwrite ? "enable" : "disable") + "\n\n";
    text += "#Type\tName\tState\tSize\tLevel\n";
    for (const auto& cp : m_cps) {
        text += "stream\t" + cp->name + "\ton\t100\t3\n";
    }
    if (m_audio_dsp.exists()) {
        text += "stream\tagdsp\ton\t100\t3\n";
    }
    const std::string file = path("system/etc/kest_modem.conf");
    return replace_file(file, text) || fail("cannot write " + file);
}

bool SimHandset::set_prop(const std::string& key, const std::string& value) {
    if (value.size() >= PROPERTY_SIZE) {
        m_error = "the root is too long for a property with the path of a device: " + m_root;
        return false;
    }
    auto prop =
        std::find_if(m_props.begin(), m_props.end(), [&](auto& p) { return p.first == key; });
    if (prop == m_props.end()) {
        m_props.emplace_back(key, value);
    } else {
        prop->second = value;
    }
    std::string text = "# Properties of the simulated handset\n";
    for (const auto& p : m_props) {
        if (!p.second.empty()) {
            text += p.first + "=" + p.second + "\n";
        }
    }
    const std::string file = path("default.prop");
    return replace_file(file, text) || fail("cannot write " + file);
}

bool SimHandset::insert_sd() {
    m_sd = true;
    return set_prop(SD_STATE_PROP, "running");
}

bool SimHandset::remove_sd() {
    m_sd = false;
    return set_prop(SD_STATE_PROP, "stopped");
}

bool SimHandset::settle(LogCollector& logs, int timeout_ms) {
    const size_t step = 4096;
    const int wait_ms = 20;
    for (int left = timeout_ms; left > 0;) {
        bool all = true;
        logs.scan();
        for (const auto& cp : m_cps) {
            // The service writes its buffer out together with the piece that fills it:
            // then everything that was fed is on the medium.
            if (cp->running && logs.end_position(*cp) != cp->fed) {
                all = false;
                if (cp->log.pending() == 0) {
                    cp->feed(step);
                }
            }
        }
        if (all) {
            // The write is followed by the quota's housekeeping, which should end as well.
            usleep(100 * 1000);
            return true;
        }
        usleep(wait_ms * 1000);
        left -= wait_ms;
    }
    return false;
}

bool SimHandset::remove_root() {
    return remove_dir(m_root);
}
