// SPDX-License-Identifier: Apache-2.0
// The control server: owns the listening socket and the handler of every connected
// client, and serves a limited number of clients at once; further ones wait unaccepted. Who is
// served at all is for the platform's policy to say and, if set, for PROP_CONTROL_UIDS.
//
// Owned by the LogController, which does without one when init fails. Loop thread only.
#ifndef CLIENT_CLIENTMANAGER_H_
#define CLIENT_CLIENTMANAGER_H_

#include <stddef.h>
#include <utils/List.h>

#include "channels/CpDumpEvent.h"
#include "config/CpType.h"
#include "core/FdHandler.h"

class ClientHandler;

class ClientManager : public FdHandler {
public:
    // max_clients: the most connections served at once; 0: no limit. Does not listen until
    // init().
    ClientManager(LogController* ctrl, Multiplexer* mux, size_t max_clients);
    // Disconnects every client.
    ~ClientManager() override;

    // Listens on the local socket of that name. 0, or -1 (logged).
    int init(const char* name);

    // Accepts one connection. A refusal, for want of descriptors say, leaves the client
    // waiting. A client who may not be served, or for whom the loop has no place, is disconnected
    // without a reply.
    void process(int events) override;

    // Accepts again if there is a place for another client; one that is gone() has none.
    void resume_listening();
    // Destroys the handler of a connection that has ended; its code must return at once.
    void process_client_disconn(ClientHandler* client);

    // Tells every client that has subscribed to the CP, in the order of connection.
    void notify_cp_dump(CpType type, CpDumpEvent event);

    size_t client_num() const { return m_clients.size(); }

private:
    bool full() const;
    static bool may_connect(int fd);

    const size_t m_max_clients;
    android::List<ClientHandler*> m_clients;
};

#endif  // CLIENT_CLIENTMANAGER_H_
