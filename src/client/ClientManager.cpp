// SPDX-License-Identifier: Apache-2.0

#include "client/ClientManager.h"

#include <cutils/sockets.h>
#include <errno.h>
#include <fcntl.h>
#include <poll.h>
#include <sys/socket.h>

#include <memory>

#include "client/ClientHandler.h"
#include "core/Multiplexer.h"
#include "core/SavedErrno.h"
#include "core/log.h"

namespace {

int set_nonblock(int fd) {
    const int flags = fcntl(fd, F_GETFL);
    return flags < 0 ? -1 : fcntl(fd, F_SETFL, flags | O_NONBLOCK);
}

}  // namespace

ClientManager::ClientManager(LogController* ctrl, Multiplexer* mux, size_t max_clients)
    : FdHandler(-1, ctrl, mux), m_max_clients(max_clients) {}

ClientManager::~ClientManager() {
    for (ClientHandler* client : m_clients) {
        delete client;
    }
    m_clients.clear();
}

int ClientManager::init(const char* name) {
    m_fd = socket_local_server(name, ANDROID_SOCKET_NAMESPACE_ABSTRACT, SOCK_STREAM);
    if (m_fd < 0) {
        err_log("can not create server socket");
        return -1;
    }
    if (set_nonblock(m_fd) < 0) {
        err_log("set server socket non-block error");
        const SavedErrno nonblock_errno;
        close();
        return -1;
    }
    resume_listening();
    return 0;
}

void ClientManager::process(int /*events*/) {
    const int fd = accept4(m_fd, nullptr, nullptr, SOCK_CLOEXEC);
    if (fd < 0) {
        note_idle("server socket");
        return;
    }
    if (set_nonblock(fd) < 0) {
        err_log("set accepted socket to O_NONBLOCK error");
    }
    auto client = std::make_unique<ClientHandler>(fd, m_log_ctrl, m_multiplexer, this);
    if (client->add_events(POLLIN) < 0) {
        errno = ENOBUFS;
        err_log("no room to poll a new client, closing it");
        note_idle("server socket");
        return;
    }
    note_alive();
    m_clients.push_back(client.release());
    info_log("new client accepted");
    if (full()) {
        del_events(POLLIN);
    }
}

void ClientManager::process_client_disconn(ClientHandler* client) {
    for (auto it = m_clients.begin(); it != m_clients.end(); ++it) {
        if (*it == client) {
            m_clients.erase(it);
            break;
        }
    }
    delete client;
    info_log("client disconnected, remaining %u clients",
             static_cast<unsigned int>(m_clients.size()));
    if (m_max_clients && !full()) {
        resume_listening();
    }
}

void ClientManager::notify_cp_dump(CpType type, CpDumpEvent event) {
    for (ClientHandler* client : m_clients) {
        client->notify_cp_dump(type, event);
    }
}

void ClientManager::resume_listening() {
    poll_when_room(POLLIN, "server socket");
}
