// SPDX-License-Identifier: Apache-2.0

#include "sim/ChildProcess.h"

#include <errno.h>
#include <fcntl.h>
#include <signal.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/prctl.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>

#include "sim/files.h"

namespace {

double seconds(const timeval& t) {
    return static_cast<double>(t.tv_sec) + static_cast<double>(t.tv_usec) / 1e6;
}

std::vector<char*> pointers(const std::vector<std::string>& texts) {
    std::vector<char*> list;
    for (const std::string& text : texts) {
        list.push_back(const_cast<char*>(text.c_str()));
    }
    list.push_back(nullptr);
    return list;
}

// The variables given, and of this process's those of other names.
std::vector<std::string> merged_environment(std::vector<std::string> variables) {
    const size_t own = variables.size();
    for (char** e = environ; *e; ++e) {
        bool replaced = false;
        for (size_t i = 0; i < own; ++i) {
            replaced =
                replaced || strncmp(*e, variables[i].c_str(), variables[i].find('=') + 1) == 0;
        }
        if (!replaced) {
            variables.push_back(*e);
        }
    }
    return variables;
}

bool redirect(const std::string& file, int flags, int to) {
    const int fd = open(file.c_str(), O_WRONLY | O_CREAT | O_CLOEXEC | flags, 0644);
    return fd >= 0 && dup2(fd, to) >= 0;
}

std::string proc_file(pid_t pid, const char* name) {
    return read_text_file("/proc/" + std::to_string(pid) + "/" + name);
}

}  // namespace

bool ChildProcess::start(const Start& start) {
    stop();
    // Everything is laid out before the fork: there may be threads, so the child may do
    // little more than exec.
    const std::vector<std::string> environment = merged_environment(start.environment);
    const std::vector<char*> argv = pointers(start.args);
    const std::vector<char*> envp = pointers(environment);
    const int flags = start.append ? O_APPEND : O_TRUNC;
    const pid_t parent = getpid();
    m_pid = fork();
    if (m_pid == 0) {
        setpgid(0, 0);
        prctl(PR_SET_PDEATHSIG, SIGTERM);
        ::signal(SIGPIPE, SIG_DFL);
        if (getppid() == parent && redirect(start.out, flags, STDOUT_FILENO) &&
            (start.err.empty() ? dup2(STDOUT_FILENO, STDERR_FILENO) >= 0
                               : redirect(start.err, flags, STDERR_FILENO))) {
            if (start.inherited >= 0) {
                fcntl(start.inherited, F_SETFD, 0);
            }
            execvpe(argv[0], argv.data(), envp.data());
        }
        _exit(127);
    }
    return m_pid > 0;
}

bool ChildProcess::collect(int options) {
    siginfo_t info = {};
    if (waitid(P_PID, static_cast<id_t>(m_pid), &info, WEXITED | WNOWAIT | options) < 0 ||
        info.si_pid == 0) {
        return false;
    }
    // It has ended, but the kernel still knows what it did.
    unsigned long long reads = 0;
    unsigned long long writes = 0;
    sscanf(proc_file(m_pid, "io").c_str(), "rchar: %*u wchar: %*u syscr: %llu syscw: %llu", &reads,
           &writes);
    rusage usage = {};
    wait4(m_pid, &m_status, 0, &usage);
    m_pid = -1;
    m_cost = {seconds(usage.ru_utime), seconds(usage.ru_stime), reads, writes};
    return true;
}

bool ChildProcess::alive() {
    return m_pid > 0 && !collect(WNOHANG);
}

void ChildProcess::signal(int signo) const {
    if (m_pid > 0) {
        kill(m_pid, signo);
    }
}

bool ChildProcess::wait() {
    return m_pid <= 0 || collect(0);
}

void ChildProcess::stop(int signo) {
    if (m_pid <= 0) {
        return;
    }
    // The whole group: the program may be a wrapper (a tracer, a checker) of another one.
    const pid_t group = m_pid;
    setpgid(m_pid, m_pid);  // in case the child has not come to it yet
    kill(-group, signo);
    for (int ms = 0; ms < 5000 && alive(); ++ms) {
        usleep(1000);
    }
    if (m_pid > 0) {
        kill(-group, SIGKILL);
        while (!wait() && errno == EINTR) {
        }
    }
}

std::string ChildProcess::status_text() const {
    if (WIFSIGNALED(m_status)) {
        return "ended by signal " + std::to_string(WTERMSIG(m_status));
    }
    const int status = WEXITSTATUS(m_status);
    return "exit status " + std::to_string(status) + (status == 127 ? ", could not be run" : "");
}

std::vector<std::string> ChildProcess::descriptors() const {
    std::vector<std::string> names;
    std::error_code ec;
    const std::string dir = "/proc/" + std::to_string(m_pid) + "/fd";
    for (std::filesystem::directory_iterator it(dir, ec), end; !ec && it != end; it.increment(ec)) {
        std::error_code closed;
        names.push_back(std::filesystem::read_symlink(it->path(), closed).string());
    }
    return names;
}

size_t ChildProcess::rss_kb() const {
    static const char NAME[] = "VmRSS:";
    const std::string status = proc_file(m_pid, "status");
    const size_t at = status.find(NAME);
    return at == std::string::npos ? 0 : strtoul(&status[at + sizeof NAME], nullptr, 10);
}

std::string ChildProcess::run_state() const {
    return proc_file(m_pid, "schedstat");
}
