// SPDX-License-Identifier: Apache-2.0
// Entry point: builds the configuration and the controller, prepares the process and
// hands the thread to the event loop. Exit status 255: the configuration cannot be
// read; 2: the storage cannot be initialised. Otherwise the process runs until killed.
#include <signal.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include "config/LogConfig.h"
#include "control/LogController.h"
#include "core/log.h"
#include "core/system_paths.h"

int main(int argc, char** argv) {
    // Files and directories get exactly the mode that is asked for.
    umask(0);

    LogController controller;
    LogConfig config(system_path(PATH_CONFIG_FILE).string());
    info_log("kestmodem start ID=%u/%u, GID=%u/%u", getuid(), geteuid(), getgid(), getegid());
    const int result = config.read_config(argc, argv);
    if (result < 0) {
        return result;
    }

    // Writing to a client that has gone must fail, not end the process.
    struct sigaction ignore;
    memset(&ignore, 0, sizeof(ignore));
    ignore.sa_handler = SIG_IGN;
    sigemptyset(&ignore.sa_mask);
    sigaction(SIGPIPE, &ignore, nullptr);

    if (controller.init(&config) < 0) {
        return 2;
    }
    controller.run();
}
