// The demo: one run of the service on a simulated handset with three CPs, shown while it
// goes on and checked at the end.
#ifndef SIM_DEMO_H_
#define SIM_DEMO_H_

#include <signal.h>

#include <memory>
#include <string>

#include "sim/LogCollector.h"
#include "sim/ServiceProcess.h"
#include "sim/SimHandset.h"

struct DemoOptions {
    std::string program;  // of the service
    std::string root;     // empty: a new directory
    double seconds = 20;
    unsigned rate = 500;  // KB/s for each CP
    bool sd = true;       // the SD card comes and goes
    bool remove = false;  // remove the root at the end
};

class Demo {
public:
    explicit Demo(const DemoOptions& options);

    // Runs until the time is over or *interrupted is set. The exit status: 0 when nothing
    // was lost or doubled, 1 otherwise, also when the service ended by itself.
    int run(const volatile sig_atomic_t* interrupted);

private:
    bool set_up();
    void feed(double elapsed);
    void switch_sd(double elapsed);
    void watch();
    void show_progress(double elapsed);
    void say(const std::string& text);
    void clear_line();
    bool finish();
    bool show_verdict();

    const DemoOptions m_options;
    SimHandset m_handset;
    ServiceProcess m_service;
    std::unique_ptr<LogCollector> m_logs;
    const bool m_tty;
    double m_now = 0;  // seconds since the start
    std::string m_medium;
    bool m_trimming = false;
    uint64_t m_unwatched = 0;  // bytes fed since the last look at the logs
};

#endif  // SIM_DEMO_H_
