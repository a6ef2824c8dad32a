// SPDX-License-Identifier: Apache-2.0

#include "kestlog/Follower.h"

#include <errno.h>
#include <fcntl.h>
#include <poll.h>
#include <signal.h>
#include <stdio.h>
#include <string.h>
#include <sys/eventfd.h>
#include <time.h>
#include <unistd.h>

#include <algorithm>

#include "core/SavedErrno.h"
#include "kestlog/ExitStatus.h"
#include "kestlog/live_table.h"

namespace {

constexpr int COUNT_MS = 1000;     // between two looks at the sizes
constexpr int OTHER_HALF_MS = 20;  // the kernel reports a renaming in two pieces
constexpr int LAST_WRITE_MS = 1000;

volatile sig_atomic_t s_end = 0;
volatile sig_atomic_t s_suspend = 0;
volatile sig_atomic_t s_redraw = 0;
int s_wake = -1;

void on_signal(int signo) {
    const int error = errno;
    (signo == SIGTSTP ? s_suspend : signo == SIGWINCH || signo == SIGCONT ? s_redraw : s_end) = 1;
    const uint64_t one = 1;
    if (write(s_wake, &one, sizeof(one)) < 0) {
        // It is full: whoever waits for it will wake up.
    }
    errno = error;
}

int64_t now_ms() {
    struct timespec t;
    clock_gettime(CLOCK_MONOTONIC, &t);
    return int64_t{t.tv_sec} * 1000 + t.tv_nsec / 1000000;
}

}  // namespace

Follower::Follower(const std::vector<std::string>& roots, const std::string& card, bool json)
    : m_roots(roots),
      m_card(card),
      m_output(json),
      m_tree([this](const LiveEvent& event) { m_output.tell(event); }, &s_end) {}

Follower::~Follower() {
    for (const int fd : {m_wake, m_mounts}) {
        if (fd >= 0) {
            close(fd);
        }
    }
}

int Follower::run() {
    m_wake = s_wake = eventfd(0, EFD_NONBLOCK | EFD_CLOEXEC);
    m_mounts = open("/proc/self/mountinfo", O_RDONLY | O_CLOEXEC);
    if (m_wake < 0 || !m_watches.open()) {
        return failure(ES_UNREADABLE, std::string("cannot watch directories: ") + strerror(errno));
    }
    struct sigaction action = {};
    action.sa_handler = on_signal;
    for (const int signo : {SIGINT, SIGTERM, SIGHUP, SIGWINCH, SIGCONT, SIGTSTP}) {
        if (signo != SIGTSTP || m_output.has_table()) {
            sigaction(signo, &action, nullptr);
        }
    }
    signal(SIGPIPE, SIG_IGN);
    m_output.enter();
    bool good = true;
    while (good && !s_end) {
        if (m_reread && !m_unsettled && !m_output.pending()) {
            reread();
        }
        if (m_ready && !m_output.drawn()) {
            draw(false);
        }
        good = wait();
    }
    if (good) {
        good = finish();
    } else {
        const SavedErrno keep;
        m_output.leave();
    }
    // A reader that is gone has seen enough.
    return good || errno == EPIPE || errno == EIO
               ? ES_OK
               : failure(ES_OUTPUT, std::string("standard output: ") + strerror(errno));
}

// Waits for whatever comes next and deals with it. False, with errno, when nothing more can be
// written.
bool Follower::wait() {
    struct pollfd fds[] = {
        {m_wake, POLLIN, 0},
        {STDOUT_FILENO, static_cast<short>(m_output.pending() ? POLLOUT : 0), 0},
        {m_mounts, POLLPRI, 0},
        // With a slow reader the changes wait in the kernel.
        {m_output.pending() ? -1 : m_watches.fd(), POLLIN, 0},
    };
    if (poll(fds, std::size(fds), timeout()) < 0) {
        return errno == EINTR;
    }
    uint64_t signals;
    if (fds[0].revents && read(m_wake, &signals, sizeof(signals)) > 0) {
        if (s_suspend) {
            suspend();
        }
        if (s_redraw) {
            s_redraw = 0;
            draw(false);
        }
    }
    if (fds[1].revents & (POLLERR | POLLHUP)) {
        errno = EPIPE;
        return false;
    }
    if (fds[1].revents && !m_output.write_some()) {
        return false;
    }
    m_reread |= fds[2].revents != 0;
    if (fds[3].revents) {
        take_changes();
    } else if (m_unsettled && !m_output.pending()) {
        settle();
    }
    if (m_counting_since && now_ms() - m_counting_since >= COUNT_MS && !m_output.pending()) {
        draw(true);
    }
    return true;
}

int Follower::timeout() const {
    if (m_output.pending()) {
        return -1;
    }
    if (m_unsettled) {
        return m_moved.cookie ? OTHER_HALF_MS : 0;
    }
    if (m_reread) {
        return 0;
    }
    return m_counting_since
               ? static_cast<int>(std::max<int64_t>(m_counting_since + COUNT_MS - now_ms(), 0))
               : -1;
}

void Follower::take_changes() {
    m_watches.read([this](const inotify_event& event, const DirWatches::Watch* watch) {
        take_change(event, watch);
    });
    m_unsettled = true;
    if (m_output.has_table() && !m_counting_since) {
        m_counting_since = now_ms();
    }
}

void Follower::take_change(const inotify_event& event, const DirWatches::Watch* watch) {
    if (event.mask & IN_Q_OVERFLOW) {
        m_output.tell(LiveEvent::notice("too many changes at once: reading the tree again"));
    }
    if (!watch || event.len == 0) {
        m_reread = true;  // a directory is gone or has another name
        return;
    }
    const std::string name = event.name;
    LiveTree::Dir* const dir = watch->kind >= DirWatches::FILES ? m_tree.dir(watch->path) : nullptr;
    m_reread |= watch->names.count(name) > 0;
    if (event.mask & IN_ISDIR) {
        m_reread |= watch->kind == DirWatches::LOGS;
    } else if (!dir) {
        if (name == DIGEST_NAME && (event.mask & (IN_CLOSE_WRITE | IN_MOVED_TO))) {
            m_tree.database_written(watch->path);
        }
    } else if (event.mask & IN_MOVED_FROM) {
        drop_moved();
        m_moved = {event.cookie, watch->path, name};
    } else if (event.mask & IN_MOVED_TO) {
        if (event.cookie == m_moved.cookie && watch->path == m_moved.dir) {
            m_tree.moved(*dir, m_moved.name, name);
            m_moved.cookie = 0;
        } else {
            m_tree.created(*dir, name);
            m_tree.closed(*dir, name);
        }
    } else if (event.mask & IN_CREATE) {
        m_tree.created(*dir, name);
    } else if (event.mask & IN_DELETE) {
        m_tree.removed(*dir, name);
    } else if (event.mask & IN_CLOSE_WRITE) {
        m_tree.closed(*dir, name);
    } else if (event.mask & IN_MODIFY) {
        m_tree.written(*dir, name);
    }
}

// The other half did not come: the file went elsewhere.
void Follower::drop_moved() {
    LiveTree::Dir* const dir = m_moved.cookie ? m_tree.dir(m_moved.dir) : nullptr;
    if (dir) {
        m_tree.removed(*dir, m_moved.name);
    }
    m_moved.cookie = 0;
}

// No more changes are known.
void Follower::settle() {
    drop_moved();
    m_tree.settle();
    m_unsettled = false;
}

void Follower::draw(bool count) {
    if (!m_output.has_table()) {
        return;
    }
    if (count || m_rows.empty()) {
        const int64_t now = now_ms();
        const int64_t since = m_counting_since ? m_counting_since : now;
        const auto sums = m_tree.sums();
        const bool grows = std::any_of(sums.begin(), sums.end(),
                                       [](const auto& sum) { return sum.second.grown > 0; });
        m_rows = live_table(sums, std::max<int64_t>(now - since, 1));
        m_counting_since = grows ? now : 0;
    }
    m_output.draw(m_rows);
}

void Follower::suspend() {
    s_suspend = 0;
    m_output.leave();
    write_out();
    raise(SIGSTOP);
    m_output.enter();
    draw(false);
}

// False, with errno, when the reader did not get everything.
bool Follower::finish() {
    s_end = 0;  // another signal ends the checks
    take_changes();
    settle();
    m_tree.check_open();
    draw(false);  // a part of a second has no rate
    m_output.leave();
    return write_out();
}

bool Follower::write_out() {
    struct pollfd out = {STDOUT_FILENO, POLLOUT, 0};
    // A reader that does not read any more is not waited for.
    while (m_output.pending() && poll(&out, 1, LAST_WRITE_MS) > 0) {
        if (!m_output.write_some()) {
            return false;
        }
    }
    return true;
}
