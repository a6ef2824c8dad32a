// SPDX-License-Identifier: Apache-2.0
// A process that answers each request on a control socket of its own with "OK" and does nothing
// else. Ends with the object.
#ifndef BENCH_ECHOSERVER_H_
#define BENCH_ECHOSERVER_H_

#include <sys/types.h>

#include <string>

class EchoServer {
public:
    // Listens where the service of this root would.
    explicit EchoServer(const std::string& root);
    ~EchoServer();
    EchoServer(const EchoServer&) = delete;
    EchoServer& operator=(const EchoServer&) = delete;

    bool ok() const { return m_pid > 0; }

private:
    pid_t m_pid = -1;
};

#endif  // BENCH_ECHOSERVER_H_
