// One connection to the service's control socket: sends request lines and separates the
// reply of each from the notifications that may arrive at any time. All waiting ends at a
// common deadline. Operations return an ExitStatus; after one that is not ES_OK,
// failure() says in words what happened and the connection is of no further use.
#ifndef KESTCTL_CONTROLCONNECTION_H_
#define KESTCTL_CONTROLCONNECTION_H_

#include <time.h>

#include <functional>
#include <string>

#include "kestctl/Reply.h"

class ControlConnection {
public:
    // The longest line that is accepted from the service, well above what it sends.
    static constexpr size_t MAX_LINE = 256;

    typedef std::function<void(const Notification&)> NotificationFn;

    ControlConnection() = default;
    ~ControlConnection();
    ControlConnection(const ControlConnection&) = delete;
    ControlConnection& operator=(const ControlConnection&) = delete;

    // Gets the notifications; without one they are dropped.
    void set_listener(NotificationFn listener) { m_listener = std::move(listener); }

    // Connects. The time-out in seconds, 0 for none, starts here and counts for everything.
    int open(double timeout);

    // From now on there is no deadline.
    void wait_without_limit() { m_timeout = 0; }

    // Sends the request and stores the line that answers it, without its line feed.
    int request(const std::string& line, std::string* reply);

    // Waits for notifications until the connection ends; only then it returns.
    int listen();

    const std::string& failure() const { return m_failure; }

private:
    int send_line(const std::string& line);
    // The next line that is no notification; these go to the listener.
    int read_reply(std::string* line);
    int read_line(std::string* line);
    // Waits for the poll events, on no descriptor just for the given time.
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
