// SPDX-License-Identifier: Apache-2.0
// What the ring buffer and the sleep log consumers share: one request frame to the CP,
// the payload of its data frames into a file, until an end frame, a refusal, an error, a
// silence of 3 seconds, 30 seconds of frames that are no answer, or 10 minutes. Owned by the
// channel for one transaction.
#ifndef CHANNELS_DIAGREPLYCONSUMER_H_
#define CHANNELS_DIAGREPLYCONSUMER_H_

#include "channels/DataConsumer.h"
#include "channels/DiagFrameParser.h"
#include "storage/LogFile.h"

class DiagReplyConsumer : public DataConsumer {
public:
    static constexpr unsigned int READ_TIMEOUT_MS = 3000;
    // A CP that logs on the same device may never fall silent and never answer.
    static constexpr unsigned int REPLY_TIMEOUT_MS = 30000;
    // Nor is what never ends an answer.
    static constexpr unsigned int WHOLE_TIMEOUT_MS = 10 * 60 * 1000;

    ~DiagReplyConsumer() override;

    bool process(DeviceFileHandler::DataBuffer& buf) override;

    // Closes the result file; it stays on the medium.
    void close_file();
    // Closes the result file and removes it from the medium, its lists and totals; one that
    // vanished from the medium, too.
    void discard_file();

protected:
    // Where the exchanges differ.
    struct Exchange {
        uint8_t diag_type;       // of the request and its replies
        const char* name_infix;  // stands before the time in the file's name
        LogType log_type;
        LogProcResult no_support;  // when the CP does not serve the request
        TimerManager::timer_callback read_timeout;
    };

    DiagReplyConsumer(const char* cp_name, CpStorage* storage, const Exchange& exchange);

    // Makes the result file, named by the present local time. False when the time is not
    // known, else name is the file's and file the result of its creation.
    bool create_result_file(android::String8& name, LogFile*& file);
    // Begins the exchange on its result file, null when it could not be made. 0 or -1.
    int start_exchange(LogFile* file);
    // For a time-out: ends the exchange, what was received stays. False when it goes on or
    // is over already; this object may be gone then.
    bool end_by_timeout();

private:
    enum Outcome { NOTHING, TAKEN, ENDED };

    static void on_no_reply(void* consumer);

    Outcome process_frame(const uint8_t* frame, size_t len);
    void fail_file(int error);
    void end(LogProcResult result);
    bool send_request();
    void stop_timers();

    const Exchange& m_exchange;
    DiagFrameParser m_parser;
    OneShotTimer m_read_timer;   // until the next chunk
    OneShotTimer m_reply_timer;  // until the next frame of this exchange
    OneShotTimer m_whole_timer;  // until the end frame
    ObjectRef<LogFile> m_file;
};

#endif  // CHANNELS_DIAGREPLYCONSUMER_H_
