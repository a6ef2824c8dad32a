// SPDX-License-Identifier: Apache-2.0
// Captures the modem's WCDMA I/Q sample buffers: maps the I/Q memory device, waits until
// the driver reports a filled buffer and has a thread of its own copy it into a new file
// in the CP's log directory, so that the loop goes on serving the log channels. The
// newest 60 files are kept.
//
// One manager a channel, held by value in the LogPipeHandler, which drives it. Loop
// thread only, except save_thread and process_save.
//
// The saving thread touches the device descriptor, the mapping, m_save_file (write_raw and fd
// only), m_saved_bytes, m_save_error and its end of the socket pair, and these only between a
// command and its response; the bytes on the socket pair are the only synchronisation. A file that
// is about to be destroyed while it is being saved ends the save first.
#ifndef IQ_WCDMAIQMANAGER_H_
#define IQ_WCDMAIQMANAGER_H_

#include <pthread.h>
#include <stdint.h>
#include <utils/List.h>
#include <utils/String8.h>

#include <memory>

#include "core/FdHandler.h"
#include "core/ObjectRef.h"
#include "storage/LogFile.h"

class CpChannel;
class CpStorage;
class IqStorRespHandler;

class WcdmaIqManager : public FdHandler {
public:
    enum IqState : int {
        IQS_IDLE = 0,     // not started, device closed
        IQS_WAITING = 1,  // for the driver to fill a buffer
        IQS_SAVING = 2,   // the thread writes the filled buffer
        IQS_PAUSED = 3    // around log clearing
    };

    static constexpr size_t MAX_FILES = 60;

    // The channel's controller and loop serve the manager as well.
    explicit WcdmaIqManager(CpChannel* channel);
    // Stops the capture.
    ~WcdmaIqManager() override;

    IqState state() const { return m_state; }
    // Number of files kept that still exist.
    size_t num_files();

    // Starts the capture into the channel's storage, which outlives it. 0, or -1 when it
    // runs already or the device cannot be opened or the thread not created. A loop without room
    // takes the device later.
    int start(CpStorage* storage);
    // Ends it; a save in progress ends with what is written. 0.
    int stop();
    // Ends the save in progress, if any, and takes no new buffer until resume. The file
    // being written keeps its bytes. 0, or -1 when the capture is not started.
    int pause();
    int resume();
    // Forgets the files captured so far; they stay where they are.
    void clear_files();

    void process(int events) override;
    void process_stor_response(int response);
    // The thread ended, or cannot be reached: the save in progress ends, and the next
    // buffer starts another thread.
    void process_thread_lost();

    // Steps of the above, each 0 or -1; a file or null.
    int prepare_iq_mem_map();
    int start_save_thread();
    LogFile* create_iq_file();
    int gen_iq_file_name(android::String8& name);
    // Ends the save in progress and forgets all files: their medium is going.
    int cancel_save();
    static void on_ext_stor_umount(void* manager);

    // On the saving thread. process_save: false when the thread is to end.
    static void* save_thread(void* manager);
    bool process_save();

private:
    static void on_file_destroyed(void* manager);

    int next_command();
    void respond(int response);

    void release_iq_mem_map();
    void stop_save_thread();
    void prune_files();
    void wait_for_stop();
    void settle_file();
    void release_buffer();
    void poll_device();
    void await_buffer();
    void note_saved(bool something);

    typedef ObjectRef<LogFile> FileRef;

    CpChannel* m_channel;
    CpStorage* m_storage = nullptr;
    IqState m_state = IQS_IDLE;
    android::List<FileRef> m_files;  // oldest first
    uint8_t* m_mem_base = nullptr;
    FileRef m_cur_file;
    std::unique_ptr<IqStorRespHandler> m_resp_handler;  // null: no thread
    pthread_t m_thread = 0;
    int m_thread_sock = -1;
    LogFile* m_save_file = nullptr;  // m_cur_file as the saving thread sees it
    uint32_t m_saved_bytes = 0;
    int m_save_error = 0;  // errno of a write that the medium did not take
};

#endif  // IQ_WCDMAIQMANAGER_H_
