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

// Waits until nobody has the other end of the pipe open any more.
[[noreturn]] void remove_later(int pipe, const std::string& path) {
    setsid();  // Ctrl-C is not for it
    for (const int signo : {SIGINT, SIGTERM, SIGHUP, SIGQUIT}) {
        signal(signo, SIG_IGN);
    }
    // Who reads the output of kestlog must not wait for this process.
    const int null = open("/dev/null", O_RDWR);
    for (int fd = STDIN_FILENO; fd <= STDERR_FILENO; ++fd) {
        dup2(null, fd);
    }
    char byte;
    while (read(pipe, &byte, 1) < 0 && errno == EINTR) {
    }
    remove_tree(path);
    _exit(0);
}

}  // namespace

TempDir::~TempDir() {
    if (m_lifeline >= 0) {
        close(m_lifeline);
        while (waitpid(m_remover, nullptr, 0) < 0 && errno == EINTR) {
        }
    }
}

std::string TempDir::parent() {
    const char* const dir = getenv("TMPDIR");
    return dir && *dir ? dir : "/tmp";
}

bool TempDir::create() {
    std::string path = parent() + "/kestlog-XXXXXX";
    int ends[2];
    if (pipe2(ends, O_CLOEXEC) < 0) {
        return false;
    }
    const bool made = mkdtemp(path.data()) != nullptr;
    m_remover = made ? fork() : -1;
    if (m_remover == 0) {
        close(ends[1]);
        remove_later(ends[0], path);
    }
    const int error = errno;
    close(ends[0]);
    if (m_remover < 0) {
        close(ends[1]);
        if (made) {
            remove_tree(path);
        }
        errno = error;
        return false;
    }
    m_lifeline = ends[1];
    m_path = path;
    return true;
}
