// SPDX-License-Identifier: Apache-2.0
// kestlog: reads and checks what the service writes.
#include <signal.h>

#include "common/standard_streams.h"
#include "kestlog/program.h"

int main(int argc, char** argv) {
    hold_standard_streams();
    // A reader of the output that has had enough ends the program without a word.
    signal(SIGPIPE, SIG_DFL);
    return run_program(argc, argv);
}
