// SPDX-License-Identifier: Apache-2.0
// The platform's local sockets: AF_UNIX sockets known by a name. On this host only
// the abstract namespace exists. With a root directory (KESTMODEM_ROOT set and not
// empty) the name in use is the given name, "@" and the root, so that services with
// different roots do not meet.
#ifndef PLATFORM_CUTILS_SOCKETS_H_
#define PLATFORM_CUTILS_SOCKETS_H_

#define ANDROID_SOCKET_NAMESPACE_ABSTRACT 0
#define ANDROID_SOCKET_NAMESPACE_RESERVED 1
#define ANDROID_SOCKET_NAMESPACE_FILESYSTEM 2

#ifdef __cplusplus
extern "C" {
#endif

// Both take a socket type (SOCK_STREAM, ..., with SOCK_NONBLOCK if wanted) and return
// a close-on-exec descriptor that the caller owns, or -1 with errno set: EINVAL for
// another namespace or an empty name, ENAMETOOLONG for a name that does not fit into a
// socket address, otherwise what the failing system call reported.

// Creates a socket, binds it to the name and listens on it.
int socket_local_server(const char* name, int namespaceId, int type);

// Connects to the server of that name. ECONNREFUSED when there is none.
int socket_local_client(const char* name, int namespaceId, int type);

#ifdef __cplusplus
}
#endif

#endif  // PLATFORM_CUTILS_SOCKETS_H_
