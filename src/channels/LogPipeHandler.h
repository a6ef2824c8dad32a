// SPDX-License-Identifier: Apache-2.0
// The log channel of one CP. Owns the CP's log device and copies everything it yields
// into the CP's storage, reopens the device when it fails, reacts to the CP's assert
// and alive events and runs the exchanges over the CP's diag device.
//
// Made by the LogController, one per configured CP, which owns it for the life of the
// process, sets its device paths, starts and stops it and forwards events to it. Owns
// the running transaction (diag handler and consumer) and its I/Q manager; its CpStorage
// is made on first need and handed back in the destructor. Loop thread only.
#ifndef CHANNELS_LOGPIPEHANDLER_H_
#define CHANNELS_LOGPIPEHANDLER_H_

#include <stddef.h>
#include <stdint.h>
#include <time.h>
#include <utils/String8.h>

#include <memory>

#include "channels/ChannelResult.h"
#include "channels/CpDumpEvent.h"
#include "channels/DataConsumer.h"
#include "config/CpType.h"
#include "config/LogConfig.h"
#include "core/ObjectRef.h"
#include "iq/WcdmaIqManager.h"
#include "storage/CpChannel.h"

class CpStorage;
class DiagDeviceHandler;
class LogFile;
class StorageManager;
class TransClient;

enum CpWorkState : int {
    CWS_NOT_WORKING = 0,  // the CP asserted; its log device is closed
    CWS_WORKING = 1,
    CWS_DUMP = 2,
    CWS_SAVE_SLEEP_LOG = 3,
    CWS_SAVE_RINGBUF = 4
};

class LogPipeHandler : public CpChannel, public RefTarget {
public:
    // How long a device that cannot be opened is left alone.
    static constexpr unsigned int REOPEN_MS = 3000;

    LogPipeHandler(LogController* ctrl, Multiplexer* mux, const LogConfig::ConfigEntry* entry,
                   StorageManager* stor_mgr);
    ~LogPipeHandler() override;

    bool enabled() const { return m_enabled; }
    CpType type() const { return m_type; }
    const android::String8& name() const override { return m_name; }
    CpWorkState state() const { return m_state; }
    CpStorage* storage() const { return m_storage; }

    // The devices, set before start: two, or one that carries log and diag traffic.
    void set_dev_paths(const android::String8& log, const android::String8& diag);
    void set_log_diag_dev_path(const android::String8& path);

    // Switches the CP's logging on and off. 0 or -1.
    virtual int start() = 0;
    virtual int stop() = 0;
    // Starts the exchange that saves the memory of the CP, which asserted at that local time,
    // as the running transaction (CWS_DUMP). 0 or -1.
    virtual int start_dump(const struct tm& t) = 0;

    // What start and stop of all channels have in common. 0.
    int start_logging();
    int stop_logging();
    // Makes the CP's storage, for a modem with the hooks that head new directories and log
    // files. 0 or -1.
    int create_storage();
    // Writes the time record to a new log file; it may take a second. False, with a message,
    // without an answer of the time service.
    bool save_timestamp(LogFile* file);

    // The CP asserted or is blocked; save_md: a mini dump is wanted.
    void process_assert(bool save_md);
    // The CP runs again.
    void process_alive();

    // Start fetching the CP's sleep log or ring buffer for a client. CR_STARTED when the
    // transaction runs: the client is told its result through trans_ended. Else
    // CR_FAILED, CR_BUSY, CR_LOG_DISABLED or CR_NOT_WORKING.
    int save_sleep_log(TransClient* client);
    int save_ringbuf(TransClient* client);
    // The client does not wait for its result any more.
    void cancel_trans_result_notify(TransClient* client);

    int enable_wcdma_iq();
    int disable_wcdma_iq();
    int pause_wcdma_iq();
    int resume_wcdma_iq();

    // Hands buffered log data to the system.
    void flush();

    // Reads the log device once into the storage.
    void process(int events) override;

    // Ends a client's transaction; the result of its consumer.
    static void diag_transaction_notify(void* client, DataConsumer::LogProcResult result);
    // Timer: opens the log device again.
    static void reopen_log_dev(void* handler);
    // Hooks of the storage: a log file, a CP directory was made.
    static void new_log_callback(CpChannel* channel, LogFile* file);
    static void new_dir_callback(CpChannel* channel);

protected:
    static constexpr size_t IO_BUFFER_SIZE = 32768;
    // Shared by all channels: only one read is in progress at any time.
    static uint8_t s_io_buffer[IO_BUFFER_SIZE];

    StorageManager* stor_mgr() const { return m_stor_mgr; }

    // Opens the log device; 0 or -1. Nothing happens when it is open.
    int open_dev();
    void close_dev();
    void renew_dev();
    // A wake-up in which the log device gave nothing. On a failed read, with its errno, the
    // device is closed and opened again, now or in a while.
    void dev_gave_nothing();
    void dev_read_failed();

    // The diag device of a transaction, opened or borrowed; null on failure.
    std::unique_ptr<DiagDeviceHandler> create_diag_device(DataConsumer* consumer);
    void start_transaction(std::unique_ptr<DiagDeviceHandler> diag,
                           std::unique_ptr<DataConsumer> consumer, CpWorkState state);
    void stop_transaction(CpWorkState new_state);
    void take_place_back(DiagDeviceHandler* diag);
    // Registers the diag handler, in place of the log device when both are one, binds it and
    // starts the consumer as a transaction. 0, or -1 without a diag handler and when the
    // consumer can not start. A handler that the loop has no room for is polled once there is
    // some: until then the exchange's time-out counts.
    int run_transaction(std::unique_ptr<DiagDeviceHandler> diag,
                        std::unique_ptr<DataConsumer> consumer, CpWorkState state);
    // Ends a transaction that a client waits for; the client gets the result.
    void end_client_transaction(int result);
    // Ends a dump: the CP counts as not working until it is alive again.
    void end_dump();
    void notify_cp_dump(CpDumpEvent event);

private:
    int check_client_transaction() const;
    int begin_client_transaction(std::unique_ptr<DataConsumer> consumer, CpWorkState state,
                                 TransClient* client);
    bool client_transaction_runs() const {
        return m_state == CWS_SAVE_SLEEP_LOG || m_state == CWS_SAVE_RINGBUF;
    }
    android::String8 dev_label() const;
    void poll_dev();
    // The log device is tried again in a while. Should the timer fail, as it does without a
    // clock, the next chance is a flush, the end of a transaction, a start or an alive event.
    void arm_reopen();
    // Opens a log device that is missing without being tried again.
    void open_missing_dev();
    // For the crash path, which may come before the log was first started: makes the storage
    // with the hook for new log files only. False when there is none.
    bool need_storage();
    bool will_be_reset() const;
    bool is_modem() const { return m_type >= CT_WCDMA && m_type <= CT_5MODE; }
    void close_on_assert();
    bool save_version();

    bool m_enabled = false;
    bool m_save_wcdma_iq = false;
    android::String8 m_name;
    CpType m_type;
    bool m_log_diag_same = false;
    android::String8 m_log_dev_path;
    android::String8 m_diag_dev_path;
    const char* m_reset_prop;
    CpWorkState m_state = CWS_WORKING;
    std::unique_ptr<DiagDeviceHandler> m_diag_handler;
    std::unique_ptr<DataConsumer> m_consumer;
    ObjectRef<TransClient> m_trans_client;
    StorageManager* m_stor_mgr;
    CpStorage* m_storage = nullptr;
    OneShotTimer m_reopen_timer;
    WcdmaIqManager m_iq;
};

#endif  // CHANNELS_LOGPIPEHANDLER_H_
