// SPDX-License-Identifier: Apache-2.0
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
#include "core/ObjectRef.h"

class CpStorage;
class OneShotTimer;

class DataConsumer : public RefTarget {
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

    // Tells the owner the outcome, which destroys this object and its handler.
    void notify_result(LogProcResult result);

protected:
    // For a read time-out that has fired. A device with data waiting may mean that the loop
    // was busy, not that the CP is silent: then what waits is read now. True when that
    // brought something and the exchange goes on, the time-out armed again, or when it
    // ended the exchange: this object may be gone. False: the CP is silent.
    bool goes_on(OneShotTimer& read_timer, unsigned int timeout_ms);

    const char* m_cp_name;
    DeviceFileHandler* m_handler = nullptr;
    CpStorage* m_storage;

private:
    bool data_waits() const;

    void* m_client = nullptr;
    trans_result_callback m_callback = nullptr;
};

#endif  // CHANNELS_DATACONSUMER_H_
