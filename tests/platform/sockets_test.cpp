// SPDX-License-Identifier: Apache-2.0

#include <cutils/sockets.h>
#include <errno.h>
#include <fcntl.h>
#include <stddef.h>
#include <stdlib.h>
#include <sys/socket.h>
#include <sys/un.h>

#include "support/TestRoot.h"

namespace {
int server(const std::string& name, int name_space = ANDROID_SOCKET_NAMESPACE_ABSTRACT) {
    return socket_local_server(name.c_str(), name_space, SOCK_STREAM);
}
int client(const std::string& name, int name_space = ANDROID_SOCKET_NAMESPACE_ABSTRACT) {
    return socket_local_client(name.c_str(), name_space, SOCK_STREAM);
}

// The name a socket is bound to, without the NUL in front.
std::string bound_name(int fd) {
    struct sockaddr_un address;
    socklen_t len = sizeof(address);
    EXPECT_EQ(getsockname(fd, reinterpret_cast<struct sockaddr*>(&address), &len), 0);
    EXPECT_EQ(address.sun_path[0], '\0');
    return std::string(address.sun_path + 1, len - offsetof(struct sockaddr_un, sun_path) - 1);
}

class Sockets : public testing::Test {
protected:
    Sockets() : m_name("t" + std::to_string(getpid())), m_descriptors(open_descriptors()) {
        unsetenv("KESTMODEM_ROOT");
    }
    ~Sockets() override {
        unsetenv("KESTMODEM_ROOT");
        EXPECT_EQ(open_descriptors(), m_descriptors);
    }

    std::string m_name;
    size_t m_descriptors;
};

TEST_F(Sockets, NameIsThatOfTheRootUpToTheLongest) {
    const size_t longest = sizeof(sockaddr_un::sun_path) - 1;
    for (const std::string root : {"", "rel/../h1//"}) {
        setenv("KESTMODEM_ROOT", root.c_str(), 1);
        const std::string suffix = root.empty() ? "" : "@" + root;
        std::string name = m_name;
        name.resize(longest - suffix.size(), 'n');
        const int listening = server(name);
        const int connected = client(name);
        EXPECT_EQ(bound_name(listening), name + suffix);
        for (int fd : {listening, connected}) {
            EXPECT_EQ(fcntl(fd, F_GETFD), FD_CLOEXEC);
            EXPECT_FALSE(fcntl(fd, F_GETFL) & O_NONBLOCK);
            close(fd);
        }
        name += 'n';
        EXPECT_TRUE(server(name) == -1 && errno == ENAMETOOLONG);
        EXPECT_TRUE(client(name) == -1 && errno == ENAMETOOLONG);
    }
}

TEST_F(Sockets, FailuresTellTheReason) {
    EXPECT_TRUE(client(m_name) == -1 && errno == ECONNREFUSED);
    const int fd = server(m_name);
    ASSERT_GE(fd, 0);
    EXPECT_TRUE(server(m_name) == -1 && errno == EADDRINUSE);
    close(fd);
    EXPECT_TRUE(server("") == -1 && errno == EINVAL);
    for (int name_space :
         {ANDROID_SOCKET_NAMESPACE_RESERVED, ANDROID_SOCKET_NAMESPACE_FILESYSTEM}) {
        EXPECT_TRUE(server(m_name, name_space) == -1 && errno == EINVAL);
        EXPECT_TRUE(client(m_name, name_space) == -1 && errno == EINVAL);
    }
    EXPECT_EQ(socket_local_server(m_name.c_str(), ANDROID_SOCKET_NAMESPACE_ABSTRACT, SOCK_RDM), -1);
    EXPECT_EQ(errno, ESOCKTNOSUPPORT);
}

}  // namespace
