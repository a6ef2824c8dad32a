// Captures the modem's WCDMA I/Q sample buffers into files. One manager a channel,
// held by value in the LogPipeHandler, which drives it. The capture itself is not
// part of the service yet: start() refuses and says so.
#ifndef IQ_WCDMAIQMANAGER_H_
#define IQ_WCDMAIQMANAGER_H_

#include "core/FdHandler.h"

class CpStorage;
class LogPipeHandler;

class WcdmaIqManager : public FdHandler {
public:
    enum IqState : int { IQS_IDLE = 0, IQS_WAITING = 1, IQS_SAVING = 2, IQS_PAUSED = 3 };

    WcdmaIqManager(LogPipeHandler* channel, LogController* ctrl, Multiplexer* mux);

    IqState state() const { return m_state; }

    // 0 on success, -1 on failure; pause and resume of an idle manager fail.
    int start(CpStorage* storage);
    int stop();
    int pause();
    int resume();
    // Forgets the files captured so far; they stay where they are.
    void clear_files();

    void process(int events) override;

private:
    LogPipeHandler* m_channel;
    IqState m_state = IQS_IDLE;
};

#endif  // IQ_WCDMAIQMANAGER_H_
