// SPDX-License-Identifier: Apache-2.0
// Subscribers to one kind of event, each a callback and its client pointer, called in
// the order of their subscription. A callback may subscribe and unsubscribe anybody,
// itself included. Whoever leaves during a round is not called again in it; whoever joins is
// called from the next round on.
#ifndef STORAGE_SUBSCRIBERLIST_H_
#define STORAGE_SUBSCRIBERLIST_H_

#include <utils/List.h>

template <typename Callback>
class SubscriberList {
public:
    void add(void* client, Callback callback) {
        m_entries.push_back(Entry{client, callback, m_rounds > 0});
    }

    // Removes the first entry of the client, if any.
    void remove(void* client) {
        for (Iter it = m_entries.begin(); it != m_entries.end(); ++it) {
            if (it->client == client && it->callback) {
                if (m_rounds > 0) {
                    it->callback = nullptr;  // the running round may stand on it
                } else {
                    m_entries.erase(it);
                }
                return;
            }
        }
    }

    // Calls every subscriber with its client and the arguments.
    template <typename... Args>
    void notify(Args... args) {
        ++m_rounds;
        for (Entry& entry : m_entries) {
            if (entry.callback && !entry.joined_in_round) {
                entry.callback(entry.client, args...);
            }
        }
        if (--m_rounds == 0) {
            settle();
        }
    }

private:
    struct Entry {
        void* client;
        Callback callback;  // null: left during a round
        bool joined_in_round;
    };
    typedef typename android::List<Entry>::iterator Iter;

    void settle() {
        Iter it = m_entries.begin();
        while (it != m_entries.end()) {
            if (!it->callback) {
                it = m_entries.erase(it);
            } else {
                it->joined_in_round = false;
                ++it;
            }
        }
    }

    android::List<Entry> m_entries;
    int m_rounds = 0;
};

#endif  // STORAGE_SUBSCRIBERLIST_H_
