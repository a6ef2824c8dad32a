// SPDX-License-Identifier: Apache-2.0
// The loop's end of the channel to the I/Q saving thread: commands out, responses in,
// one byte each. Owned by the WcdmaIqManager, whose end of the pair this is.
#ifndef IQ_IQSTORRESPHANDLER_H_
#define IQ_IQSTORRESPHANDLER_H_

#include "core/FdHandler.h"

class WcdmaIqManager;

enum IqStorCmd : int {
    IQST_QUIT = 0,       // to the thread: end
    IQST_STOP = 1,       // to the thread: end the save in progress; always answered
    IQST_SAVE = 2,       // to the thread: save the filled buffer
    IQST_STOPPED = 101,  // from the thread: nothing is being saved any more
    IQST_SAVED = 102     // from the thread: the save ended
};

class IqStorRespHandler : public FdHandler {
public:
    IqStorRespHandler(int fd, LogController* ctrl, Multiplexer* mux, WcdmaIqManager* manager);

    // Hands every response that has arrived to the manager, and the end of the connection:
    // the manager destroys this then.
    void process(int events) override;

    // 0 when the command was handed over, else -1.
    int send_cmd(int cmd);
    // Blocks until the thread responds; the response. While it waits it says so every few
    // seconds. -1 when the thread can not respond any more, or this end can not hear it.
    int wait_response();
    // Makes the thread end, which the caller waits for by joining it. No failure of the
    // connection keeps the thread running.
    void end_thread();

private:
    WcdmaIqManager* m_manager;
};

#endif  // IQ_IQSTORRESPHANDLER_H_
