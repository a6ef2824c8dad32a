// What the ring buffer and the sleep log consumers share: one request frame to the CP,
// the payload of its data frames into a file, until an end frame, a refusal, an error or
// a silence of 3 seconds. Owned by the channel for one transaction.
#ifndef CHANNELS_DIAGREPLYCONSUMER_H_
#define CHANNELS_DIAGREPLYCONSUMER_H_

#include "channels/DataConsumer.h"
#include "channels/DiagFrameParser.h"
#include "core/ObjectRef.h"
#include "core/TimerManager.h"
#include "storage/LogFile.h"

class DiagReplyConsumer : public DataConsumer {
public:
    static constexpr unsigned int READ_TIMEOUT_MS = 3000;

    ~DiagReplyConsumer() override;

    int start() override;
    bool process(DeviceFileHandler::DataBuffer& buf) override;

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

    // Makes the result file, named by the present local time. Null on failure.
    virtual LogFile* open_file() = 0;
    // The same for the subclasses: false when the time is not known, else name is the
    // file's and file the result of its creation.
    bool create_result_file(android::String8& name, LogFile*& file);

    // Ends the exchange after a silence; what was received stays. False when it goes on
    // because data has arrived after all.
    bool end_by_timeout();
    void close_file();
    void discard_file();

private:
    enum Outcome { GO_ON, ENDED };

    Outcome process_frame(const uint8_t* frame, size_t len);
    void end(LogProcResult result);
    bool send_request();
    void start_timer();
    void stop_timer();

    const Exchange& m_exchange;
    DiagFrameParser m_parser;
    TimerManager::Timer* m_read_timer = nullptr;
    ObjectRef<LogFile> m_file;
};

#endif  // CHANNELS_DIAGREPLYCONSUMER_H_
