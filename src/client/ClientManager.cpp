// SPDX-License-Identifier: Apache-2.0

// For accept4 and struct ucred, which are Linux's own. C++ compilers define it, C++ does not say
// so.
#ifndef _GNU_SOURCE
#define _GNU_SOURCE
#endif

#include "client/ClientManager.h"

#include <cutils/properties.h>
#include <cutils/sockets.h>
#include <errno.h>
#include <fcntl.h>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <memory>

#include "client/ClientHandler.h"
#include "client/uid_list.h"
#include "config/property_names.h"
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
    : FdHandler(-1, ctrl, mux, SERVES_CONTROL), m_max_clients(max_clients) {}

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

// Whether the user at the other end may be served. The property is read for each client, so that
// a change holds from the next one on.
bool ClientManager::may_connect(int fd) {
    char uids[PROPERTY_VALUE_MAX];
    property_get(PROP_CONTROL_UIDS, uids, "");
    if (!uids[0]) {
        return true;
    }
    // The ids that the other end had when it connected, from the kernel.
    struct ucred peer;
    socklen_t len = sizeof(peer);
    if (getsockopt(fd, SOL_SOCKET, SO_PEERCRED, &peer, &len) < 0) {
        err_log("can not tell the user of a client, closing it");
        return false;
    }
    const UidMatch match = find_uid(uids, peer.uid);
    if (match == UidMatch::NO_LIST) {
        info_log("%s is no list of user ids, only root is served", PROP_CONTROL_UIDS);
    }
    if (peer.uid == 0 || match == UidMatch::NAMED) {
        return true;
    }
    info_log("user %u, process %d: may not use the control socket, closing it", peer.uid, peer.pid);
    return false;
}

void ClientManager::process(int /*events*/) {
    const int fd = accept4(m_fd, nullptr, nullptr, SOCK_CLOEXEC);
    if (fd < 0) {
        note_idle("server socket");
        return;
    }
    if (!may_connect(fd)) {
        ::close(fd);
        note_alive();  // strangers must not make the socket rest for those who may connect
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

bool ClientManager::full() const {
    const auto gone = std::count_if(m_clients.begin(), m_clients.end(),
                                    [](const ClientHandler* client) { return client->gone(); });
    return m_max_clients && m_clients.size() - static_cast<size_t>(gone) >= m_max_clients;
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
    resume_listening();
}

void ClientManager::notify_cp_dump(CpType type, CpDumpEvent event) {
    for (ClientHandler* client : m_clients) {
        client->notify_cp_dump(type, event);
    }
}

void ClientManager::resume_listening() {
    if (!full()) {
        poll_when_room(POLLIN, "server socket");
    }
}
