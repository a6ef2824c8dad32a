// SPDX-License-Identifier: Apache-2.0

#include "kestlog/OutputFile.h"

#include <errno.h>
#include <fcntl.h>
#include <limits.h>
#include <signal.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <set>
#include <vector>

#include "common/CommandLine.h"
#include "kestlog/ExitStatus.h"
#include "kestlog/Progress.h"
#include "kestlog/Report.h"

namespace {

constexpr size_t COPY_BUFFER = 256 * 1024;
constexpr uint64_t COPY_STEP = 16 * 1024 * 1024;
constexpr int TEMPORARY_NAMES = 100;

bool written_as_it_is(const std::string& path) {
    struct stat st;
    return stat(path.c_str(), &st) == 0 && !S_ISREG(st.st_mode) && !S_ISDIR(st.st_mode);
}

bool exists(const std::string& path) {
    struct stat st;
    return lstat(path.c_str(), &st) == 0;
}

// Copies inside the kernel for as long as the two descriptors can do that.
uint64_t copy_in_kernel(int from, int to, uint64_t limit) {
    uint64_t copied = 0;
    while (copied < limit) {
        const size_t step = static_cast<size_t>(std::min(COPY_STEP, limit - copied));
        const ssize_t n = copy_file_range(from, nullptr, to, nullptr, step, 0);
        if (n <= 0) {
            break;
        }
        copied += static_cast<uint64_t>(n);
        Progress::advance(static_cast<uint64_t>(n));
    }
    return copied;
}

}  // namespace

std::string output_name(const std::string& stem, const std::string& suffix) {
    return stem.substr(0, NAME_MAX - std::min<size_t>(NAME_MAX, suffix.size())) + suffix;
}

bool takes_binary(const CommandLine& line, int* status) {
    if (line.value("output", "-") != "-" || !isatty(STDOUT_FILENO)) {
        return true;
    }
    *status = line.usage_error("a terminal cannot show this; give --output or a pipe");
    return false;
}

namespace {

// Device and number of each.
std::set<std::pair<dev_t, ino_t>> s_kept;

bool may_replace(const std::string& path) {
    struct stat st;
    const bool kept = lstat(path.c_str(), &st) == 0 && s_kept.count({st.st_dev, st.st_ino}) > 0;
    errno = EBUSY;
    return !kept;
}

}  // namespace

OutputFile* OutputFile::s_first = nullptr;

void OutputFile::keep(const std::string& path) {
    struct stat st;
    if ((path == "-" ? fstat(STDIN_FILENO, &st) : stat(path.c_str(), &st)) == 0) {
        s_kept.insert({st.st_dev, st.st_ino});
    }
}

void OutputFile::remove_all(int signal) {
    for (const OutputFile* file = s_first; file; file = file->m_next) {
        unlink(file->m_temporary.c_str());
    }
    raise(signal);  // which now has its default action
}

void OutputFile::watch_signals() {
    static bool watched = false;
    for (const int signal : {SIGINT, SIGTERM, SIGHUP, SIGPIPE, SIGQUIT, SIGXCPU, SIGXFSZ}) {
        struct sigaction action;
        if (!watched && sigaction(signal, nullptr, &action) == 0 && action.sa_handler == SIG_DFL) {
            action.sa_handler = remove_all;
            action.sa_flags = static_cast<int>(SA_RESETHAND);
            sigaction(signal, &action, nullptr);
        }
    }
    watched = true;
}

bool OutputFile::note_error(bool good) {
    if (!good && m_error == 0) {
        m_error = errno;
    }
    return good;
}

bool OutputFile::open(const std::string& path, bool force) {
    m_path = path;
    m_force = force;
    if (is_standard()) {
        m_file = stdout;
        return true;
    }
    if (written_as_it_is(path)) {
        m_file = fopen(path.c_str(), "wbe");
        return note_error(m_file != nullptr);
    }
    struct stat st;
    if (lstat(path.c_str(), &st) == 0 && (!force || S_ISDIR(st.st_mode))) {
        errno = force ? EISDIR : EEXIST;
        return note_error(false);
    }
    return note_error(may_replace(path)) && open_temporary();
}

bool OutputFile::open_temporary() {
    const std::string stem =
        m_path.substr(0, m_path.rfind('/') + 1) + ".kestlog-" + std::to_string(getpid()) + "-";
    int fd = -1;
    for (int i = 0; i < TEMPORARY_NAMES && fd < 0; ++i) {
        m_temporary = stem + std::to_string(i);
        fd = ::open(m_temporary.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0644);
        if (fd < 0 && errno != EEXIST) {
            break;
        }
    }
    if (!note_error(fd >= 0)) {
        m_temporary.clear();
        return false;
    }
    m_file = fdopen(fd, "wb");
    watch_signals();
    m_next = s_first;
    std::atomic_signal_fence(std::memory_order_seq_cst);
    s_first = this;
    return note_error(m_file != nullptr);
}

bool OutputFile::write(const void* data, size_t len) {
    return note_error(fwrite(data, 1, len, m_file) == len);
}

bool OutputFile::copy_from(int fd, uint64_t limit, uint64_t* copied, int* read_error) {
    *read_error = 0;
    *copied = 0;
    if (!note_error(fflush(m_file) == 0)) {
        return false;
    }
    *copied = copy_in_kernel(fd, fileno(m_file), limit);
    std::vector<uint8_t> buffer(COPY_BUFFER);
    while (*copied < limit) {
        const size_t wanted =
            static_cast<size_t>(std::min<uint64_t>(buffer.size(), limit - *copied));
        const ssize_t n = read(fd, buffer.data(), wanted);
        if (n < 0 && errno == EINTR) {
            continue;
        }
        if (n <= 0) {
            *read_error = n < 0 ? errno : 0;
            break;
        }
        const size_t len = static_cast<size_t>(n);
        if (!write(buffer.data(), len)) {
            return false;
        }
        *copied += len;
        Progress::advance(len);
    }
    return note_error(fflush(m_file) == 0);
}

bool OutputFile::close() {
    FILE* const file = m_file;
    if (!file) {
        return m_error == 0;
    }
    if (!note_error(fflush(file) == 0 && !ferror(file)) || m_error != 0) {
        discard();
        return false;
    }
    m_file = nullptr;
    if (file == stdout || (note_error(fclose(file) == 0) && (m_temporary.empty() || publish()))) {
        return true;
    }
    discard();
    return false;
}

// Gives the temporary file its name.
bool OutputFile::publish() {
    const char* const from = m_temporary.c_str();
    const char* const to = m_path.c_str();
    int result = -1;
    if (!m_force) {
        result = renameat2(AT_FDCWD, from, AT_FDCWD, to, RENAME_NOREPLACE);
        if (result < 0 && errno != EINVAL && errno != ENOSYS) {
            return note_error(false);
        }
        if (result < 0 && exists(m_path)) {  // a file system that cannot do that
            errno = EEXIST;
            return note_error(false);
        }
    }
    if (!note_error(result == 0 || (may_replace(m_path) && rename(from, to) == 0))) {
        return false;
    }
    keep(m_path);
    forget();
    return true;
}

// Leaves the temporary name to nobody.
void OutputFile::forget() {
    for (OutputFile** link = &s_first; *link; link = &(*link)->m_next) {
        if (*link == this) {
            *link = m_next;
            break;
        }
    }
    std::atomic_signal_fence(std::memory_order_seq_cst);
    m_temporary.clear();
}

void OutputFile::discard() {
    if (m_file && m_file != stdout) {
        fclose(m_file);
    }
    m_file = nullptr;
    if (!m_temporary.empty()) {
        unlink(m_temporary.c_str());
        forget();
    }
}

int OutputFile::failed() const {
    return failure(ES_OUTPUT, (is_standard() ? "standard output" : m_path) + ": " +
                                  strerror(m_error) +
                                  (m_error == EEXIST  ? "; use --force to replace it"
                                   : m_error == EBUSY ? "; this command reads it or has written it"
                                                      : ""));
}
