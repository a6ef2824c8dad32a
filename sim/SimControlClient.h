// SPDX-License-Identifier: Apache-2.0
// A client of the service's control socket: sends requests, one a line, and tells the
// replies apart from the dump notifications that come in between. Lines wait in the two
// queues until they are asked for.
#ifndef SIM_SIMCONTROLCLIENT_H_
#define SIM_SIMCONTROLCLIENT_H_

#include <deque>
#include <string>

class SimControlClient {
public:
    static constexpr int STARTING_MS = 20000;  // connecting to a service that was just started

    SimControlClient() = default;
    ~SimControlClient() { disconnect(); }
    SimControlClient(const SimControlClient&) = delete;
    SimControlClient& operator=(const SimControlClient&) = delete;

    // Connects to the service of this root, trying again until the time is over: the
    // service may still be starting. False with errno set when it is not there.
    bool connect(const std::string& root, int timeout_ms);
    void disconnect();
    // False once the service has closed the connection.
    bool connected() const { return m_fd >= 0; }

    // Sends the line with a line feed behind it, or just these bytes.
    bool send(const std::string& line) { return send_raw(line + "\n"); }
    bool send_raw(const std::string& bytes);
    // Takes what has come, without waiting.
    void poll();
    // Takes the oldest reply or notification, without its line feed. Waits for one until
    // the time is over (0: does not wait) and is false when there is none.
    bool reply(std::string* line, int timeout_ms = 0);
    bool notification(std::string* line, int timeout_ms = 0);
    // Sends the line and waits for its reply; "" when none comes in time.
    std::string request(const std::string& line, int timeout_ms = 5000);

private:
    bool take(std::deque<std::string>& lines, std::string* line, int timeout_ms);

    int m_fd = -1;
    std::string m_rest;  // of a line that is not whole yet
    std::deque<std::string> m_replies;
    std::deque<std::string> m_notifications;
};

#endif  // SIM_SIMCONTROLCLIENT_H_
