// SPDX-License-Identifier: Apache-2.0

#include "bench/EchoServer.h"

#include <poll.h>
#include <signal.h>
#include <sys/prctl.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <unistd.h>

#include "bench/common.h"
#include "sim/local_socket.h"

namespace {

// Serves one client and returns when it leaves.
void serve(int listener) {
    struct pollfd wait = {listener, POLLIN, 0};
    poll(&wait, 1, -1);
    wait.fd = accept(listener, nullptr, nullptr);
    char request[256];
    do {
        poll(&wait, 1, -1);
    } while (recv(wait.fd, request, sizeof(request), 0) > 0 &&
             send(wait.fd, "OK\n", 3, MSG_NOSIGNAL) == 3);
}

}  // namespace

EchoServer::EchoServer(const std::string& root) {
    const int listener = listen_local("kestmodem", root);
    if (listener < 0) {
        fail("listen in", root);
        return;
    }
    m_pid = fork();
    if (m_pid == 0) {
        prctl(PR_SET_PDEATHSIG, SIGKILL);
        serve(listener);
        _exit(0);
    }
    close(listener);
}

EchoServer::~EchoServer() {
    if (m_pid > 0) {
        kill(m_pid, SIGKILL);
        waitpid(m_pid, nullptr, 0);
    }
}
