// SPDX-License-Identifier: Apache-2.0
// A supervisor of CPs: listens on its local socket ("modemd" or "external_wcn_kest", with
// "@" and the root behind it) and announces what becomes of its CP. The service connects,
// and connects again whenever it lost the connection. Needs no thread: connections wait
// in the socket until the owner calls.
#ifndef SIM_SIMSUPERVISOR_H_
#define SIM_SIMSUPERVISOR_H_

#include <string>

class SimSupervisor {
public:
    SimSupervisor() = default;
    ~SimSupervisor() { stop(); }
    SimSupervisor(const SimSupervisor&) = delete;
    SimSupervisor& operator=(const SimSupervisor&) = delete;

    // Listens. False with errno set on failure.
    bool start(const std::string& name, const std::string& root);
    // The supervisor is gone, its connection with it. start() brings it back.
    void stop();

    // Whether the service is connected at present; takes a new connection when there is one.
    bool connected();
    bool wait_connected(int timeout_ms);
    // Sends the text as it is in one piece; false when nobody is connected.
    bool send(const std::string& text);
    // Ends the connection but goes on listening.
    void drop();
    // Connections taken since the start.
    unsigned accepted() const { return m_accepted; }

private:
    int m_listen = -1;
    int m_fd = -1;
    unsigned m_accepted = 0;
};

#endif  // SIM_SIMSUPERVISOR_H_
