// SPDX-License-Identifier: Apache-2.0
// Where the scenes of the demo are played: the handset with its CPs, supervisors and diag
// sides, the service, and a client of the service. Whoever waits here keeps the handset
// going meanwhile: the CPs are fed, the logs looked at and the progress shown.
#ifndef SIM_DEMOSTAGE_H_
#define SIM_DEMOSTAGE_H_

#include <signal.h>

#include <chrono>
#include <functional>
#include <map>
#include <memory>
#include <string>
#include <vector>

#include "sim/LogCollector.h"
#include "sim/ServiceProcess.h"
#include "sim/SimControlClient.h"
#include "sim/SimDiagResponder.h"
#include "sim/SimHandset.h"
#include "sim/SimModemImage.h"
#include "sim/SimSupervisor.h"

struct DemoOptions {
    std::string program;  // of the service
    std::string root;     // empty: a new directory
    double seconds = 60;
    unsigned rate = 500;                    // KB/s for each CP
    std::map<std::string, unsigned> rates;  // for those of a rate of their own
    bool sd = true;                         // the SD card comes and goes
    bool card_in = false;                   // without scenes: the card is there from the start
    bool fast = false;                      // the scenes do not take their time
    bool keep = false;                      // do not remove the root at the end
    std::string reader;  // the program kestlog; empty: the logs are not read with it
    std::string report;  // where it writes a page of all logs; empty: nowhere
    bool serve = false;  // no scenes, no end
    std::string replay;  // the recorded card
    double speed = 1;    // of the replay, 1 as recorded, 0 as fast as it goes
};

// The end of a handset's root: it is removed, or kept and shown where somebody has named it or
// wants it, or where something that was started was not good.
void end_root(SimHandset& handset, const DemoOptions& options, bool started, bool good);

class DemoStage {
public:
    // The options must outlive the stage. *interrupted becomes other than 0 to end early.
    DemoStage(const DemoOptions& options, const volatile sig_atomic_t* interrupted);

    // Makes the handset and starts the service; says why on failure, before anything is
    // made when there is no room for it.
    bool set_up();
    // Ends everything but the handset's root. The logs can be checked afterwards.
    void take_down();

    // Keeps the handset going until the time since the start, or until the condition holds.
    // False when the demo has to end or the condition did not come to hold in time.
    bool run_until(double seconds);
    bool wait_until(const std::function<bool()>& condition, double seconds);
    bool wait(double seconds) { return run_until(m_now + seconds); }
    // Does the work on another thread meanwhile.
    bool wait_for(const std::function<void()>& work);
    // KB/s from each CP, as far as its device takes them; 0 for what the options say.
    void set_rate(unsigned rate) { m_rate = rate > 0 ? rate : m_options.rate; }
    unsigned rate_of(const std::string& cp_name) const;
    // Interrupted, or the service ended by itself.
    bool over();

    // One line for people, with the time.
    void say(const std::string& text);
    // The same with the verdict. What fails once the demo has to end does not count.
    bool check(bool good, const std::string& text);
    void show_progress();
    void clear_line();
    unsigned passed() const { return m_passed; }
    const std::vector<std::string>& failures() const { return m_failures; }

    // Sends a request and shows it with its reply, which is returned ("" without one).
    std::string request(const std::string& line, double timeout_s = 5);
    // The same, and checks the reply.
    bool expect(const std::string& line, const std::string& reply, double timeout_s = 5);
    // Whether the quotas of the handset's sizes hold. At a high rate they would take the files
    // of a scene away before they can be looked at.
    bool set_quotas(bool hold);
    // Waits for the next notification and shows it; checks that it is the one expected.
    bool expect_notification(const std::string& line, double timeout_s);

    // The files of a CP in all its directories, as "prefix*suffix".
    std::vector<std::string> files(const SimCp& cp, const std::string& prefix,
                                   const std::string& suffix) const {
        return cp_files(cp.name, prefix, suffix);
    }
    std::vector<std::string> cp_files(const std::string& cp_name, const std::string& prefix,
                                      const std::string& suffix) const;
    // Checks that there is one such file that was not among the earlier ones, and that it
    // holds these bytes.
    bool check_new_file(const SimCp& cp, const std::string& prefix, const std::string& suffix,
                        const std::vector<std::string>& earlier,
                        const std::vector<uint8_t>& content);

    const DemoOptions& options() const { return m_options; }
    // Whether a scene may take its time to be watched; not while too much is logged.
    bool unhurried() const { return !m_options.fast && m_options.rate <= 600; }
    SimHandset& handset() { return m_handset; }
    ServiceProcess& service() { return m_service; }
    LogCollector& logs() { return *m_logs; }
    SimControlClient& client() { return m_client; }
    SimSupervisor& modem_supervisor() { return m_modem_supervisor; }
    SimSupervisor& wcn_supervisor() { return m_wcn_supervisor; }
    SimCp& modem() { return *m_handset.cp("cp_wcdma"); }
    SimCp& wcn() { return *m_handset.cp("cp_wcn"); }
    // The modem's firmware that the service finds when it starts.
    const SimModemImage& modem_image() const { return m_modem_image; }
    SimDiagResponder& modem_diag() { return *m_modem_diag; }
    SimDiagResponder& wcn_diag() { return *m_wcn_diag; }
    double now() const { return m_now; }
    const std::string& medium() const { return m_medium; }  // that the logs go to

private:
    bool fail(const std::string& text);
    bool has_room();
    void step();
    void feed(double seconds);
    void watch();

    const DemoOptions& m_options;
    const volatile sig_atomic_t* m_interrupted;
    SimHandset m_handset;
    ServiceProcess m_service;
    std::unique_ptr<LogCollector> m_logs;
    const SimModemImage m_modem_image;
    unsigned m_rate;
    SimSupervisor m_modem_supervisor;
    SimSupervisor m_wcn_supervisor;
    std::unique_ptr<SimDiagResponder> m_modem_diag;
    std::unique_ptr<SimDiagResponder> m_wcn_diag;
    SimControlClient m_client;

    const bool m_tty;
    std::chrono::steady_clock::time_point m_start;
    double m_now = 0;  // seconds since the start
    double m_next_watch = 0;
    double m_next_line = 1;
    std::vector<double> m_due;  // bytes of each CP
    std::string m_medium;
    bool m_trimming = false;
    uint64_t m_unwatched = 0;  // bytes fed since the last look at the logs
    unsigned m_passed = 0;
    std::vector<std::string> m_failures;
};

#endif  // SIM_DEMOSTAGE_H_
