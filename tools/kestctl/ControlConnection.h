// SPDX-License-Identifier: Apache-2.0
// A connection to the service's control socket: sends request lines and separates their
// replies from the notifications, which may arrive at any time. One deadline limits all
// waiting. Operations return an ExitStatus; after one that is not ES_OK, failure()
// describes the error and the connection must not be used any more.
#ifndef KESTCTL_CONTROLCONNECTION_H_
#define KESTCTL_CONTROLCONNECTION_H_

#include <time.h>

#include <functional>
#include <string>

#include "kestctl/Reply.h"

class ControlConnection {
public:
    // The longest line accepted from the service; it sends much shorter ones.
    static constexpr size_t MAX_LINE = 256;

    // False with errno set when its output could not be written; the operation then fails.
    typedef std::function<bool(const Notification&)> NotificationFn;

    ControlConnection() = default;
    ~ControlConnection();
    ControlConnection(const ControlConnection&) = delete;
    ControlConnection& operator=(const ControlConnection&) = delete;

    // Receives the notifications. Without a listener they are dropped.
    void set_listener(NotificationFn listener) { m_listener = std::move(listener); }

    // Connects. The time-out, in seconds and 0 for none, starts here and covers all operations.
    int open(double timeout);

    // Removes the deadline.
    void wait_without_limit() { m_timeout = 0; }

    // Sends the request and stores the reply line without its line feed.
    int request(const std::string& line, std::string* reply);

    // Waits for notifications; returns only when the connection ends or the listener fails.
    int listen();

    const std::string& failure() const { return m_failure; }

private:
    int send_line(const std::string& line);
    // The next line that is not a notification. Notifications go to the listener.
    int read_reply(std::string* line);
    int read_line(std::string* line);
    // Waits for the poll events; without a descriptor (-1), for the given time.
    int wait_for(int fd, short events, int max_ms);
    int fail(int status, const std::string& words);
    int closed();
    int timed_out();

    int m_fd = -1;
    double m_timeout = 0;
    struct timespec m_opened = {};
    bool m_waits_in_queue = false;  // nothing has come from the service yet
    std::string m_data;             // received, not yet returned
    std::string m_failure;
    NotificationFn m_listener;
};

#endif  // KESTCTL_CONTROLCONNECTION_H_
