// SPDX-License-Identifier: Apache-2.0

#include "sim/ServiceProcess.h"

#include <errno.h>
#include <fcntl.h>
#include <signal.h>
#include <stdlib.h>
#include <string.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <iterator>

#include "sim/SimHandset.h"

namespace {

// "NAME=added", with what the variable holds already behind it.
std::string extended_variable(const std::string& name, const std::string& added,
                              const char* separator) {
    const char* old = getenv(name.c_str());
    return name + "=" + added + (old && *old ? separator + std::string(old) : "");
}

}  // namespace

bool ServiceProcess::start(const std::string& program, const SimHandset& handset,
                           const std::vector<std::string>& args) {
    stop();
    if (access(program.c_str(), X_OK) != 0) {
        return false;
    }
    m_log_file = handset.path("kestmodem.log");
    // Everything is laid out before the fork: the simulator has threads, so the child may
    // do little more than exec.
    std::vector<std::string> env = {"KESTMODEM_ROOT=" + handset.root(),
                                    "EXTERNAL_STORAGE=" + handset.sd_root(),
                                    "SECONDARY_STORAGE=" + handset.sd_root()};
    int library = -1;
    if (handset.needs_drivers()) {
        std::error_code ec;
        const std::string path = std::filesystem::read_symlink("/proc/self/exe", ec)
                                     .replace_filename("libkestsim_devices.so")
                                     .string();
        library = open(path.c_str(), O_RDONLY | O_CLOEXEC);
        if (library < 0) {
            return false;
        }
        // LD_PRELOAD separates at blanks and colons, which the path may have; a descriptor
        // that the service inherits has neither.
        const std::string inherited = "/proc/self/fd/" + std::to_string(library);
        env.push_back(extended_variable("LD_PRELOAD", inherited, ":"));
        // A build with the address sanitizer wants its own library in front.
        env.push_back(extended_variable("ASAN_OPTIONS", "verify_asan_link_order=0", ":"));
    }
    const size_t own = env.size();
    for (char** e = environ; *e; ++e) {
        bool replaced = false;
        for (size_t i = 0; i < own; ++i) {
            replaced = replaced || strncmp(*e, env[i].c_str(), env[i].find('=') + 1) == 0;
        }
        if (!replaced) {
            env.push_back(*e);
        }
    }
    std::vector<char*> argv = {const_cast<char*>(program.c_str())};
    for (const std::string& arg : args) {
        argv.push_back(const_cast<char*>(arg.c_str()));
    }
    argv.push_back(nullptr);
    std::vector<char*> envp;
    for (std::string& e : env) {
        envp.push_back(e.data());
    }
    envp.push_back(nullptr);
    const pid_t parent = getpid();

    m_pid = fork();
    if (m_pid == 0) {
        setpgid(0, 0);
        prctl(PR_SET_PDEATHSIG, SIGTERM);
        const int log = open(m_log_file.c_str(), O_WRONLY | O_CREAT | O_APPEND, 0644);
        if (getppid() == parent && log >= 0 && dup2(log, STDOUT_FILENO) >= 0 &&
            dup2(log, STDERR_FILENO) >= 0) {
            close(log);
            if (library >= 0) {
                fcntl(library, F_SETFD, 0);
            }
            execve(program.c_str(), argv.data(), envp.data());
        }
        _exit(127);
    }
    if (library >= 0) {
        close(library);
    }
    return m_pid > 0;
}

bool ServiceProcess::alive() {
    if (m_pid > 0 && waitpid(m_pid, &m_status, WNOHANG) == m_pid) {
        m_pid = -1;
    }
    return m_pid > 0;
}

void ServiceProcess::stop(int signal) {
    if (m_pid <= 0) {
        return;
    }
    // The whole group: the program may be a wrapper (a tracer, a checker) of the service.
    const pid_t group = m_pid;
    setpgid(m_pid, m_pid);  // in case the child has not come to it yet
    kill(-group, signal);
    for (int ms = 0; ms < 5000 && alive(); ++ms) {
        usleep(1000);
    }
    if (m_pid > 0) {
        kill(-group, SIGKILL);
        waitpid(m_pid, &m_status, 0);
        m_pid = -1;
    }
}

std::string ServiceProcess::status_text() const {
    if (WIFSIGNALED(m_status)) {
        return "ended by signal " + std::to_string(WTERMSIG(m_status));
    }
    const int status = WEXITSTATUS(m_status);
    return "exit status " + std::to_string(status) + (status == 127 ? ", could not be run" : "");
}

std::string ServiceProcess::log_text() const {
    std::ifstream in(m_log_file, std::ios::binary);
    return std::string(std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>());
}

std::string ServiceProcess::last_log_lines(size_t count) const {
    const std::string text = log_text();
    size_t at = text.size();
    for (; at > 0; --at) {
        // The line feed that ends the last line does not start another one.
        if (text[at - 1] == '\n' && at < text.size() && count-- <= 1) {
            break;
        }
    }
    return text.substr(at);
}
