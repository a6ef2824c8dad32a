// SPDX-License-Identifier: Apache-2.0
// One run of the service against a simulated handset: started with the handset's root and
// SD card in its environment, what it prints and logs in the file "kestmodem.log" of the
// root, in a process group of its own so that Ctrl-C reaches only the simulator. It never
// outlives the simulator's main thread. When the handset has devices that need drivers, the
// library kestsim_devices beside this program is preloaded into it.
#ifndef SIM_SERVICEPROCESS_H_
#define SIM_SERVICEPROCESS_H_

#include <sys/types.h>

#include <string>
#include <vector>

class SimHandset;

class ServiceProcess {
public:
    ServiceProcess() = default;
    ~ServiceProcess() { stop(); }
    ServiceProcess(const ServiceProcess&) = delete;
    ServiceProcess& operator=(const ServiceProcess&) = delete;

    // False with errno set if there is no such program, no drivers or no process.
    bool start(const std::string& program, const SimHandset& handset,
               const std::vector<std::string>& args = {});
    // Whether it still runs; collects its status when it does not.
    bool alive();
    // Ends it with the signal (SIGTERM is how it always ends), with SIGKILL after 5 s.
    void stop(int signal = 15);

    pid_t pid() const { return m_pid; }      // -1 when it does not run
    int status() const { return m_status; }  // as waitpid gives it, once it has ended
    std::string status_text() const;         // "exit status 2", "ended by signal 15"
    // The service's log: all of it, or its last lines.
    std::string log_text() const;
    std::string last_log_lines(size_t count) const;

private:
    pid_t m_pid = -1;
    int m_status = 0;
    std::string m_log_file;
};

#endif  // SIM_SERVICEPROCESS_H_
