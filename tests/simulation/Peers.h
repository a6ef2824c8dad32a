// SPDX-License-Identifier: Apache-2.0
// The other services that the service connects to: the two supervisors and the time service.
// Belongs to one life of the service.
#ifndef SIMULATION_PEERS_H_
#define SIMULATION_PEERS_H_

#include <stdint.h>

#include <string>
#include <vector>

enum TimeAnswers : uint32_t { TIME_PROMPT, TIME_NEVER, TIME_SHORT, TIME_HANGS_UP, TIME_COUNT };

class Peers {
public:
    static constexpr unsigned SUPERVISORS = 2;  // of the modem, of the external chip

    explicit Peers(const std::string& root);
    ~Peers();
    Peers(const Peers&) = delete;
    Peers& operator=(const Peers&) = delete;

    void pump();
    void supervisor_says(unsigned supervisor, const std::string& text);
    void supervisor_drops(unsigned supervisor);
    void supervisor_goes(unsigned supervisor);
    void supervisor_comes(unsigned supervisor);

private:
    int listen_at(const char* name) const;

    const std::string m_root;
    int m_listen[SUPERVISORS] = {-1, -1};
    int m_fd[SUPERVISORS] = {-1, -1};
    int m_time = -1;
    std::vector<int> m_time_fds;
};

#endif  // SIMULATION_PEERS_H_
