// SPDX-License-Identifier: Apache-2.0
// Reading the trees, and which directories are watched.
#include <errno.h>
#include <string.h>
#include <sys/stat.h>

#include "core/system_paths.h"
#include "kestlog/Follower.h"

namespace {

bool is_dir(const std::string& path) {
    struct stat st;
    return stat(path.c_str(), &st) == 0 && S_ISDIR(st.st_mode);
}

std::string parent(const std::string& path) {
    return path.substr(0, path.rfind('/'));
}

}  // namespace

// A new watch may have come too late for what happened before it, so that the tree is read again
// until there is none.
void Follower::reread() {
    m_reread = m_added = false;
    m_log_roots.clear();
    m_watches.begin();
    LogTree tree;
    if (!m_card.empty()) {
        tree.add_card(is_dir(m_card) ? m_card : "");  // as for a ROOT
        watch_root(m_card, {""});
    }
    for (const std::string& root : m_roots) {
        if (is_dir(root)) {  // else its logs are still to come
            const size_t told = tree.failures.size();
            tree.add(root);
            if (!is_dir(root)) {
                tree.failures.resize(told);  // it has just gone, which is told
            }
        }
        watch_root(root, {"", PATH_DATA_PARTITION, CARD_IN_ROOT});
    }
    tree.finish();
    watch_tree(tree);
    m_watches.end();
    m_tree.take(tree, m_log_roots);
    m_unsettled = true;
    for (const std::string& words : tree.failures) {
        notice_once(words);
    }
    m_reread = m_added;
    if (!m_reread && !m_ready) {
        m_ready = true;
        m_output.tell(m_tree.ready());
    }
}

// The directories on the way to where the ROOT may have its logs, and on the way to the ROOT.
void Follower::watch_root(const std::string& root, const std::vector<const char*>& media) {
    for (std::string below = root; !below.empty();) {
        const std::string above = parent(below);
        const std::string dir = above.empty() ? "/" : above;
        if (is_dir(dir)) {
            watch(dir, DirWatches::PLACE, below.substr(above.size() + 1));
            break;
        }
        below = above;
    }
    if (!is_dir(root)) {
        return;
    }
    m_log_roots.insert(root);
    watch(root, DirWatches::LOGS);  // it may be a log root that has no set yet
    for (const std::string medium : media) {
        for (const std::string logs : {DIR_MODEM_LOG, DIR_KEST DIR_MODEM_LOG}) {
            const std::string way = medium + logs + "/";
            size_t at = 0;
            for (size_t next; (next = way.find('/', at + 1)) != std::string::npos; at = next) {
                if (!is_dir(root + way.substr(0, at))) {
                    break;
                }
                watch(root + way.substr(0, at), DirWatches::PLACE,
                      way.substr(at + 1, next - at - 1));
            }
            const std::string log_root = std::string(root).append(medium).append(logs);
            if (is_dir(log_root)) {
                m_log_roots.insert(log_root);
                watch(log_root, DirWatches::LOGS);
            }
        }
    }
}

void Follower::watch_tree(const LogTree& tree) {
    for (const TreeSet& set : tree.sets) {
        const std::string above = parent(set.shown());
        if (m_log_roots.count(above)) {
            watch(above, DirWatches::LOGS);  // a ROOT that is one itself
        }
        watch(set.shown(), DirWatches::LOGS);
        for (const TreeCp& cp : set.cps) {
            // A crash of an audio DSP shows in its log alone.
            const bool writes = m_output.has_table() || cp_type_of(cp.name) == CT_AGDSP;
            watch(cp.dir->name(), writes ? DirWatches::WRITES : DirWatches::FILES);
        }
    }
}

void Follower::watch(const std::string& path, DirWatches::Kind kind, const std::string& name) {
    switch (m_watches.add(path, kind, name)) {
        case DirWatches::ADDED:
            m_added = true;
            break;
        case DirWatches::FAILED:
            if (errno == ENOSPC) {
                notice_once(
                    "the limit of watches is reached (fs.inotify.max_user_watches): not all "
                    "directories are followed");
            } else if (errno != ENOENT && errno != ENOTDIR) {  // else the one above tells
                notice_once(path + ": " + strerror(errno));
            }
            break;
        default:
            break;
    }
}

void Follower::notice_once(const std::string& words) {
    if (m_noticed.insert(words).second) {
        m_output.tell(LiveEvent::notice(words));
    }
}
