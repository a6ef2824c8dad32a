// Interprets what one transaction reads from a CP's diag device, keeps the result in
// the CP's storage and reports the outcome once.
//
// Life of a transaction: the channel makes a consumer and a DiagDeviceHandler for it,
// registers the handler, binds the two and calls start(). Chunks arrive through
// process(). The end is told by notify_result, called exactly once; the channel
// destroys both objects inside that callback, so nothing may touch them afterwards.
#ifndef CHANNELS_DATACONSUMER_H_
#define CHANNELS_DATACONSUMER_H_

#include "channels/DeviceFileHandler.h"

class CpStorage;

class DataConsumer {
public:
    enum LogProcResult : int {
        LPR_SUCCESS = 0,
        LPR_FAILURE = 1,
        LPR_SLEEPLOG_NO_SUPPORT = 2,
        LPR_RINGBUF_NO_SUPPORT = 3
    };

    typedef void (*trans_result_callback)(void* client, LogProcResult result);

    // cp_name and storage belong to the channel and outlive the consumer.
    DataConsumer(const char* cp_name, CpStorage* storage);
    virtual ~DataConsumer();
    DataConsumer(const DataConsumer&) = delete;
    DataConsumer& operator=(const DataConsumer&) = delete;

    void set_callback(void* client, trans_result_callback callback);
    // The handler that feeds this consumer; not owned.
    void bind(DeviceFileHandler* handler) { m_handler = handler; }

    // Begins the exchange. 0, or -1: the owner then destroys both objects.
    virtual int start() = 0;
    // Takes a chunk. True: stop reading now (always so after notify_result).
    virtual bool process(DeviceFileHandler::DataBuffer& buf) = 0;

protected:
    void notify_result(LogProcResult result);
    // True when the device has data that has not been read yet: a read time-out that comes
    // then tells that the loop was busy, not that the CP is silent.
    bool data_waits() const;

    const char* m_cp_name;
    DeviceFileHandler* m_handler = nullptr;
    CpStorage* m_storage;

private:
    void* m_client = nullptr;
    trans_result_callback m_callback = nullptr;
};

#endif  // CHANNELS_DATACONSUMER_H_
