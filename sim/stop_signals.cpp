// SPDX-License-Identifier: Apache-2.0

#include "sim/stop_signals.h"

#include <signal.h>

void handle_stop_signals(void (*handler)(int)) {
    struct sigaction action = {};
    action.sa_handler = handler;
    action.sa_flags = static_cast<int>(SA_RESETHAND);
    sigaction(SIGINT, &action, nullptr);
    sigaction(SIGTERM, &action, nullptr);
    struct sigaction before = {};
    sigaction(SIGHUP, nullptr, &before);
    if (before.sa_handler != SIG_IGN) {
        sigaction(SIGHUP, &action, nullptr);
    }
    signal(SIGPIPE, SIG_IGN);
}
