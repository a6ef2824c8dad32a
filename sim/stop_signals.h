// SPDX-License-Identifier: Apache-2.0
// The signals that end a program of the simulated handset, which clears up first.
#ifndef SIM_STOP_SIGNALS_H_
#define SIM_STOP_SIGNALS_H_

// Has Ctrl-C, SIGTERM and a terminal that was closed run the handler, once: a second one ends the
// program at once. Not the closed terminal of a program that was started with nohup. A reader that
// closes its pipe ends nothing from now on.
void handle_stop_signals(void (*handler)(int));

#endif  // SIM_STOP_SIGNALS_H_
