// SPDX-License-Identifier: Apache-2.0

#include "kestlog/DirWatches.h"

#include <unistd.h>

#include <algorithm>

namespace {

constexpr uint32_t CHANGES = IN_CREATE | IN_DELETE | IN_MOVED_FROM | IN_MOVED_TO | IN_DELETE_SELF |
                             IN_MOVE_SELF | IN_ONLYDIR;

}  // namespace

DirWatches::~DirWatches() {
    if (m_fd >= 0) {
        close(m_fd);
    }
}

bool DirWatches::open() {
    m_fd = inotify_init1(IN_NONBLOCK | IN_CLOEXEC);
    return m_fd >= 0;
}

void DirWatches::begin() {
    ++m_round;
}

DirWatches::Result DirWatches::add(const std::string& path, Kind kind, const std::string& name) {
    uint32_t mask = CHANGES | IN_MASK_ADD;
    if (kind != PLACE) {
        mask |= IN_CLOSE_WRITE;
    }
    if (kind == WRITES) {
        mask |= IN_MODIFY;
    }
    const int wd = inotify_add_watch(m_fd, path.c_str(), mask);
    if (wd < 0) {
        return FAILED;
    }
    Watch& watch = m_watches[wd];
    if (watch.round != m_round) {
        watch.round = m_round;
        watch.kind = PLACE;
        watch.names.clear();
    }
    watch.kind = std::max(watch.kind, kind);
    if (!name.empty()) {
        watch.names.insert(name);
    }
    const bool is_new = watch.path != path;
    watch.path = path;
    return is_new ? ADDED : KNOWN;
}

void DirWatches::end() {
    for (auto it = m_watches.begin(); it != m_watches.end();) {
        if (it->second.round == m_round) {
            ++it;
        } else {
            inotify_rm_watch(m_fd, it->first);
            it = m_watches.erase(it);
        }
    }
}

void DirWatches::read(const std::function<void(const inotify_event&, const Watch*)>& visit) {
    alignas(inotify_event) char buf[64 * 1024];
    for (ssize_t len; (len = ::read(m_fd, buf, sizeof(buf))) > 0;) {
        for (ssize_t at = 0; at < len;) {
            const auto* const event = reinterpret_cast<const inotify_event*>(buf + at);
            at += static_cast<ssize_t>(sizeof(*event) + event->len);
            const auto it = m_watches.find(event->wd);
            if (event->mask & IN_IGNORED) {
                if (it != m_watches.end()) {
                    m_watches.erase(it);
                    visit(*event, nullptr);
                }
            } else if (event->mask & IN_Q_OVERFLOW) {
                visit(*event, nullptr);
            } else if (it != m_watches.end()) {
                visit(*event, &it->second);
            }
        }
    }
}
