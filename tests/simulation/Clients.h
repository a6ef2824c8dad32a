// SPDX-License-Identifier: Apache-2.0
// The control clients, and what they may expect: one reply to each request, in order, with the
// value that was set last. Belongs to one life of the service.
#ifndef SIMULATION_CLIENTS_H_
#define SIMULATION_CLIENTS_H_

#include <stdint.h>

#include <deque>
#include <string>

#include "simulation/State.h"

class Clients {
public:
    static constexpr unsigned COUNT = 4;
    static constexpr unsigned SERVED = 3;  // at a time

    explicit Clients(const std::string& root) : m_root(root) {}

    // The requests of the table: their indices are 0 to this, without it.
    static uint64_t request_count();
    static std::string request_text(uint64_t index);
    // It must be one of the table.
    static uint64_t request_named(const char* text);

    // Sends a request, connecting first if need be. in_pieces: the last bytes wait for
    // finish_pieces().
    void request(unsigned client, uint64_t index, bool in_pieces);
    void flood(unsigned client, uint64_t index);
    void leave(unsigned client);
    void finish_pieces();
    // Reads what has been answered and compares it.
    void pump();
    // Nobody waits for an answer longer than is promised.
    void check_waiting() const;
    // This client, which subscribed to both, was told of a dump of each, from start to end.
    void check_dumps_told(unsigned client) const;
    // A call failed: what was being changed may not have been.
    void mark_uncertain();
    bool waiting() const;
    // Nothing was asked that may not have been carried out.
    bool quiet() const { return !waiting() && !m_ghosts; }
    // The service has nothing to do: clients that left, of those it serves, are forgotten.
    void service_rests();

private:
    struct Asked {
        uint64_t index;
        int64_t at;
        bool contested;  // its value may have been changed by others meanwhile
        Setting expected;
    };
    // What a client was told of the dumps of a stream's CP.
    struct Dump {
        bool told = false;  // it is subscribed: the replies so far say so
        bool heard = false;
        bool open = false;
        int64_t since = 0;
    };
    struct Client {
        int fd = -1;
        std::string rest;  // of a request sent in pieces
        std::string received;
        std::deque<Asked> asked;
        Dump dumps[CHANNEL_COUNT];
    };

    int64_t connected_count() const;
    static void mark_uncertain(Client& client);
    bool may_ask(Client& client) const;
    void drop(Client& client);
    void ask(Client& client, uint64_t index);
    void send_text(Client& client, const std::string& text);
    static void take_line(Client& client, const std::string& line);
    static void take_notice(Client& client, const std::string& line);

    const std::string m_root;
    Client m_clients[COUNT];
    bool m_ghosts = false;  // requests of clients that left may still be carried out
};

#endif  // SIMULATION_CLIENTS_H_
