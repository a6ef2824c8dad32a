// SPDX-License-Identifier: Apache-2.0
// kestlog follow: watches the directories of the log trees and tells what happens to their files
// until a signal or the end of its reader ends it. Waits in poll only.
#ifndef KESTLOG_FOLLOWER_H_
#define KESTLOG_FOLLOWER_H_

#include <set>
#include <string>
#include <vector>

#include "kestlog/DirWatches.h"
#include "kestlog/LiveOutput.h"
#include "kestlog/LiveTree.h"

class Follower {
public:
    // The real paths of the ROOTs and of the card, or "". They may vanish and come back.
    Follower(const std::vector<std::string>& roots, const std::string& card, bool json);
    ~Follower();
    Follower(const Follower&) = delete;
    Follower& operator=(const Follower&) = delete;

    // The exit status.
    int run();

private:
    void reread();
    void watch_root(const std::string& root, const std::vector<const char*>& media);
    void watch_tree(const LogTree& tree);
    void watch(const std::string& path, DirWatches::Kind kind, const std::string& name = "");
    void notice_once(const std::string& words);

    bool wait();
    int timeout() const;
    void take_changes();
    void take_change(const inotify_event& event, const DirWatches::Watch* watch);
    void drop_moved();
    void settle();

    void draw(bool count);
    void suspend();
    bool finish();
    bool write_out();

    const std::vector<std::string> m_roots;
    const std::string m_card;
    LiveOutput m_output;
    LiveTree m_tree;
    DirWatches m_watches;
    int m_wake = -1;    // a signal came
    int m_mounts = -1;  // ready when something was mounted or unmounted

    bool m_reread = true;  // the tree has to be read
    bool m_ready = false;  // and was for the first time
    bool m_added = false;  // a watch, since it was begun to read: there may be more to see
    std::set<std::string> m_log_roots;
    std::set<std::string> m_noticed;

    // The first half of a renaming, whose second half is still to come.
    struct {
        uint32_t cookie = 0;
        std::string dir, name;
    } m_moved;
    bool m_unsettled = false;

    int64_t m_counting_since = 0;  // ms; 0: nothing grows
    std::vector<std::string> m_rows;
};

#endif  // KESTLOG_FOLLOWER_H_
