// SPDX-License-Identifier: Apache-2.0
// Plays a script of what happens around the service, in order, against the real program on a
// simulated handset, and tells what came of it: what the service said to a client and to the
// CPs, and the log trees in the end. The words of scripts are in sim/play_usage.txt.
//
// A line is over when the service has dealt with it, so that the same script always comes to
// the same. Nothing waits for a time; what does not come within a minute has failed.
#ifndef SIM_SCRIPTPLAYER_H_
#define SIM_SCRIPTPLAYER_H_

#include <signal.h>

#include <functional>
#include <map>
#include <string>
#include <vector>

#include "sim/ServiceProcess.h"
#include "sim/SimControlClient.h"
#include "sim/SimHandset.h"
#include "sim/SimSupervisor.h"

// Takes the first word of a script's line off; the rest begins with the next word.
std::string take_script_word(std::string* text);

class ScriptPlayer {
public:
    // Runs this program as the service. The root of the handset is removed unless it is kept.
    // Fails soon after *interrupted, if there is one, becomes other than 0.
    ScriptPlayer(const std::string& program, bool keep_root,
                 const volatile sig_atomic_t* interrupted = nullptr);
    ~ScriptPlayer();

    // Plays the whole script, once for each object. False with error() set: what failed in
    // which line, and the end of the service's log.
    bool play(const std::string& script_file);
    // In steps: reads the script, and plays its lines as often as wanted. Again: only those
    // behind the start. Patient: the first line that fails is the last one. Otherwise
    // what comes behind it is given less and less time.
    bool read(const std::string& script_file);
    enum Round { FIRST, AGAIN };
    bool play_lines(Round round, bool patient = true);
    // Everything around the service is as it is before a round, and the service has come to
    // rest: all that was logged is on the media.
    bool put_in_order();

    // What came of it, as text without times.
    const std::string& outcome() const { return m_outcome; }
    const std::string& error() const { return m_error; }
    const std::string& root() const { return m_handset.root(); }

protected:
    // For anything to come about; no loaded machine misses it.
    static constexpr int PATIENCE_MS = 60000;

    typedef bool (ScriptPlayer::*Command)(const std::string& args);
    struct CommandRow;
    static const CommandRow COMMANDS[];

    bool play_line(const std::string& line);
    // The commands; args is the rest of the line.
    bool configure(const std::string& args);
    bool add_cp(const std::string& args);
    bool set_property(const std::string& args);
    bool write_file(const std::string& args);
    bool set_time(const std::string& args);
    bool start(const std::string& args);
    bool feed_log(const std::string& args);
    bool queue_log(const std::string& args);
    bool feed_pcm(const std::string& args);
    bool crash_dsp(const std::string& args);
    bool capture_iq(const std::string& args);
    bool send_diag(const std::string& args);
    bool await_diag_request(const std::string& args);
    bool tell_by_supervisor(const std::string& args);
    bool move_sd(const std::string& args);
    bool show_file(const std::string& args);
    bool client_request(const std::string& args);
    bool client_log(const std::string& args);
    bool client_send(const std::string& args);
    bool client_reply(const std::string& args);
    bool client_notice(const std::string& args);

    bool make_handset();
    // Waits until the service is done with what it has read.
    bool settle();
    bool finish();
    // The log device of the CP, or of the audio DSP; null with error() set.
    SimLogDevice* log_device(const std::string& cp_name);
    // The modem's diag device; null with error() set.
    SimDiagDevice* diag_device(const std::string& cp_name);
    bool bytes_of(const std::string& text, std::string* bytes);
    bool feed(SimLogDevice& device, const std::string& bytes, bool until_read,
              std::string* fed = nullptr);
    bool feed_cp(const std::string& args, bool until_read);
    bool wait_until(const std::function<bool()>& condition, const std::string& what);
    bool fail(const std::string& reason);
    bool interrupted() const { return m_interrupted && *m_interrupted; }
    void tell(const std::string& line) { m_outcome += line + "\n"; }

    struct Line {
        std::string place;  // for messages
        std::string text;
    };

    const std::string m_program;
    const bool m_keep_root;
    const volatile sig_atomic_t* const m_interrupted;
    int m_patience_ms = PATIENCE_MS;
    std::vector<Line> m_lines;
    std::map<std::string, std::string> m_fed;  // all that a CP has logged
    SimSizes m_sizes;
    SimHandset m_handset;
    ServiceProcess m_service;
    SimSupervisor m_modem_supervisor;
    SimSupervisor m_wcn_supervisor;
    SimControlClient m_client;
    SimControlClient m_settler;  // the player's own
    std::string m_outcome;
    std::string m_error;
};

#endif  // SIM_SCRIPTPLAYER_H_
