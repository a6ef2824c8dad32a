// SPDX-License-Identifier: Apache-2.0
// One run of the service against a simulated handset: started with the handset's root and
// SD card in its environment, what it prints and logs in the file "kestmodem.log" of the
// root. When the handset has devices that need drivers, the library kestsim_devices, which is
// beside this program or in ../lib/kestmodem, is preloaded into it.
#ifndef SIM_SERVICEPROCESS_H_
#define SIM_SERVICEPROCESS_H_

#include <string>
#include <vector>

#include "sim/ChildProcess.h"

class SimHandset;

class ServiceProcess : public ChildProcess {
public:
    // False with errno set if there is no such program, no drivers or no process. The program
    // may be a wrapper, which is looked for in PATH when its name has no '/'.
    bool start(const std::string& program, const SimHandset& handset,
               const std::vector<std::string>& args = {});

    // The service's log: all of it, or its last lines as text for a terminal.
    std::string log_text() const;
    std::string last_log_lines(size_t count) const;

private:
    std::string m_log_file;
};

#endif  // SIM_SERVICEPROCESS_H_
