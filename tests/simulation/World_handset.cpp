// SPDX-License-Identifier: Apache-2.0
// The part of World that makes the handset's files and properties.
#include <stdio.h>

#include <filesystem>
#include <fstream>

#include "simulation/World.h"

namespace {

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

void make_file(const std::string& path, const std::string& content) {
    std::ofstream(path, std::ios::binary) << content;
}

}  // namespace

void World::make_handset(const std::string& root) {
    for (const char* dir : {"/data/local/tmp/kestmodem", "/data/local/tmp/kest", "/system/etc",
                            "/card", "/cards", "/image", "/proc/cpw", "/d/dipx"}) {
        std::filesystem::create_directories(root + dir);
    }
    make_file(root + "/system/etc/kest_modem.conf", CONFIG);
    make_file(root + "/proc/cpw/mem", std::string(200000, 'm'));
    make_file(root + "/proc/cpw/mini_dump", std::string(3000, 'd'));
    for (const char* record : {"smsg", "sbuf", "sblock"}) {
        make_file(root + "/d/dipx/" + record, std::string(500, 'r'));
    }
    State& state = *g_state;
    state.boot_ns = START_NS;
    state.wall_ns = int64_t{1700000000} * 1000000000;
    state.card_in = true;
    state.kest_conf = KEST_ON | KEST_MODEM | KEST_WCN;
    state.room[MED_DATA] = state.room[MED_CARD] = UINT64_MAX;
    const unsigned values[SETTING_COUNT] = {1, 12, 20, 1, 0};
    for (unsigned i = 0; i < SETTING_COUNT; ++i) {
        state.settings[i].value = values[i];
    }
    for (StreamState& stream : state.streams) {
        stream.logged.value = 1;
    }
}

void World::write_kest_conf() const {
    const uint32_t conf = g_state->kest_conf;
    make_file(m_root + "/data/local/tmp/kest/kest.conf",
              std::string(conf & KEST_ON ? "enable\n" : "disable\n") + "stream\tcp_wcdma\t" +
                  (conf & KEST_MODEM ? "on" : "off") + "\t1\t1\nstream\tcp_wcn\t" +
                  (conf & KEST_WCN ? "on" : "off") + "\t1\t1\nstream\tnobody\ton\n");
}

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
    text += "ro.product.partitionpath=" + m_root + "/image/\npersist.modem.w.nvp=w_\n";
    text += "gsm.version.baseband=version" + std::to_string(state.version) + "\n";
    text += "persist.sys.vexa.modemreset=" + std::to_string(state.cp_reset[0]) + "\n";
    text += "persist.sys.vexa.wcnreset=" + std::to_string(state.cp_reset[1]) + "\n";
    make_file(m_root + "/default.prop.new", text);
    rename((m_root + "/default.prop.new").c_str(), (m_root + "/default.prop").c_str());
    state.props_ns = state.boot_ns;
}
