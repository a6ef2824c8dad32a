// SPDX-License-Identifier: Apache-2.0
// The handset around the service: a root directory with the properties file, a default
// configuration, the CPs' devices, the time service and an SD card that comes and goes.
// Owns the devices and the time service and takes them away at its end; the root stays
// (with the logs in it) unless remove_root() is called.
#ifndef SIM_SIMHANDSET_H_
#define SIM_SIMHANDSET_H_

#include <stdint.h>

#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "sim/SimDiagDevice.h"
#include "sim/SimDspDevice.h"
#include "sim/SimIqDevice.h"
#include "sim/SimLogDevice.h"
#include "sim/SimStream.h"
#include "sim/TimeService.h"

class LogCollector;

// A simulated CP: its devices and its stream, fed from the start on without a gap.
struct SimCp {
    SimCp(const std::string& cp_name, bool is_modem, uint8_t id)
        : name(cp_name), modem(is_modem), stream(id) {}

    // Feeds up to len further bytes of the stream; number of bytes the device took.
    size_t feed(size_t len);

    const std::string name;  // its directory's name, "cp_wcdma"
    const bool modem;        // its log files begin with a time record
    SimLogDevice log;
    SimDiagDevice diag;   // modems only; the others have one device for both
    bool running = true;  // a crashed CP does not log: the owner neither feeds nor settles it
    const SimStream stream;
    uint64_t fed = 0;  // position of the next byte
};

// What the default configuration says, in MB.
struct SimSizes {
    unsigned log_file = 1;
    unsigned data = 8;
    unsigned sd = 16;
    bool overwrite = true;
};

class SimHandset {
public:
    SimHandset() = default;
    SimHandset(const SimHandset&) = delete;
    SimHandset& operator=(const SimHandset&) = delete;

    // Makes the root: the given directory, which must be absent or empty, or a new one
    // in temp_dir(). Starts the time service. False with error() set on failure.
    bool create(const std::string& dir, const SimSizes& sizes = SimSizes());
    // Adds a CP ("cp_wcdma", "cp_wcn", ...): its devices, properties and the line in the
    // default configuration. The handset owns it. Null with error() set on failure. With
    // terminal its log device is one that can also be read, for requests or a dump
    // through the device that a CP other than a modem has for both.
    SimCp* add_cp(const std::string& name, bool terminal = false);
    // Whether a CP of this name can be added, and whether it is a modem.
    static bool knows_cp(const std::string& name, bool* modem);
    // Adds the audio DSP ("agdsp"), its devices and its line in the default configuration;
    // its log is no stream like the CPs'. False with error() set on failure.
    bool add_audio_dsp();
    // Adds the modem's I/Q memory. False with error() set on failure.
    bool add_iq_memory();
    // Some devices are more than a FIFO or a terminal: their drivers have to be preloaded
    // into the service, which ServiceProcess does.
    bool needs_drivers() const { return m_audio_dsp.exists() || m_iq_memory.exists(); }
    // Null when there is none of this name.
    SimCp* cp(const std::string& name) const;

    // Sets one property; "" removes it. The properties file is replaced by rename.
    bool set_prop(const std::string& key, const std::string& value);
    bool insert_sd();
    bool remove_sd();
    bool sd_inserted() const { return m_sd; }

    // Feeds every running CP a little more until the service has nothing of it in its buffers,
    // so that it can be stopped without losing a byte. False when the time is over first.
    bool settle(LogCollector& logs, int timeout_ms);

    // False if something of it is left.
    bool remove_root();

    const std::string& root() const { return m_root; }
    std::string path(const std::string& rel) const { return m_root + "/" + rel; }
    std::string sd_root() const { return path("storage/sdcard0"); }
    const SimSizes& sizes() const { return m_sizes; }
    const std::vector<std::unique_ptr<SimCp>>& cps() const { return m_cps; }
    SimDspDevice& audio_dsp() { return m_audio_dsp; }
    SimIqDevice& iq_memory() { return m_iq_memory; }
    TimeService& time_service() { return m_time; }
    const std::string& error() const { return m_error; }

private:
    bool fail(const std::string& what);
    bool write_config();

    std::string m_root;
    SimSizes m_sizes;
    std::vector<std::pair<std::string, std::string>> m_props;
    std::vector<std::unique_ptr<SimCp>> m_cps;
    SimDspDevice m_audio_dsp;
    SimIqDevice m_iq_memory;
    TimeService m_time;
    bool m_sd = false;
    std::string m_error;
};

#endif  // SIM_SIMHANDSET_H_
