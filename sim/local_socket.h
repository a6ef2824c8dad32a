// SPDX-License-Identifier: Apache-2.0
// The handset's local sockets: stream sockets in the abstract namespace whose names carry
// "@" and the handset's root behind them, so that several handsets run side by side.
#ifndef SIM_LOCAL_SOCKET_H_
#define SIM_LOCAL_SOCKET_H_

#include <string>

// A non-blocking descriptor, closed on exec; -1 with errno set on failure (ENAMETOOLONG
// when the root's path is too long for a name). The caller closes it.
int listen_local(const std::string& name, const std::string& root);
int connect_local(const std::string& name, const std::string& root);

#endif  // SIM_LOCAL_SOCKET_H_
