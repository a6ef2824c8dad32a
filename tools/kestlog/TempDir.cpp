// SPDX-License-Identifier: Apache-2.0

#include "kestlog/TempDir.h"

#include <errno.h>
#include <fcntl.h>
#include <signal.h>
#include <stdlib.h>
#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>

namespace {

void remove_tree(const std::string& path) {
    std::error_code ignored;
    std::filesystem::remove_all(path, ignored);
}

// Makes the directory, tells its path or, as a number, why it cannot, and removes it when nobody
// has the other end of lifeline open any more. Signals are blocked.
[[noreturn]] void keep_directory(int report, int lifeline, std::string path) {
    setsid();  // Ctrl-C is not for it
    // Who reads the output of kestlog must not wait for this process.
    const int null = open("/dev/null", O_RDWR);
    for (int fd = STDIN_FILENO; fd <= STDERR_FILENO; ++fd) {
        dup2(null, fd);
    }
    const bool made = mkdtemp(path.data()) != nullptr;
    const std::string answer = made ? path : std::to_string(errno);
    const ssize_t told = write(report, answer.data(), answer.size());
    close(report);
    char byte;
    while (made && told > 0 && read(lifeline, &byte, 1) < 0 && errno == EINTR) {
    }
    if (made) {
        remove_tree(path);
    }
    _exit(0);
}

std::string read_all(int fd) {
    std::string text;
    char part[256];
    for (ssize_t n; (n = read(fd, part, sizeof(part))) != 0;) {
        if (n > 0) {
            text.append(part, static_cast<size_t>(n));
        } else if (errno != EINTR) {
            break;
        }
    }
    return text;
}

}  // namespace

TempDir::~TempDir() {
    if (m_lifeline >= 0) {
        close(m_lifeline);
        while (m_remover > 0 && waitpid(m_remover, nullptr, 0) < 0 && errno == EINTR) {
        }
    }
}

std::string TempDir::parent() {
    const char* const dir = getenv("TMPDIR");
    return dir && *dir ? dir : "/tmp";
}

int TempDir::open_file() {
    std::string name = parent() + "/kestlog-XXXXXX";
    const int fd = mkostemp(name.data(), O_CLOEXEC);
    if (fd >= 0) {
        unlink(name.c_str());
    }
    return fd;
}

// The child makes the directory, so that there is no moment at which a signal to this process
// leaves it behind.
bool TempDir::create() {
    int report[2];
    int lifeline[2];
    sigset_t all, before;
    if (pipe2(report, O_CLOEXEC) < 0 || pipe2(lifeline, O_CLOEXEC) < 0) {
        return false;
    }
    sigfillset(&all);
    sigprocmask(SIG_BLOCK, &all, &before);
    m_remover = fork();
    if (m_remover == 0) {
        close(report[0]);
        close(lifeline[1]);
        keep_directory(report[1], lifeline[0], parent() + "/kestlog-XXXXXX");
    }
    const int fork_error = errno;
    sigprocmask(SIG_SETMASK, &before, nullptr);
    close(report[1]);
    close(lifeline[0]);
    m_lifeline = lifeline[1];
    const std::string answer = m_remover < 0 ? std::to_string(fork_error) : read_all(report[0]);
    close(report[0]);
    if (answer.find('/') != std::string::npos) {
        m_path = answer;
        return true;
    }
    errno = atoi(answer.c_str());
    return false;
}
