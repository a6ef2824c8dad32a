// SPDX-License-Identifier: Apache-2.0
// Tells its owner that a file, in practice a device of a CP, can be read: it keeps the
// file open and registered with the loop and calls the owner back each time the
// descriptor is ready. The owner reads the descriptor itself, says whether it
// got something and may close the notifier from the callback. Closed after
// construction; may be opened and closed any number of times.
#ifndef STORAGE_FILENOTIFIER_H_
#define STORAGE_FILENOTIFIER_H_

#include <utils/String8.h>

#include "core/FdHandler.h"

class FileNotifier : public FdHandler {
public:
    typedef void (*notify_callback)(FileNotifier* notifier, void* client);

    // path is one of the fixed paths of the service (PATH_...), resolved here.
    FileNotifier(LogController* ctrl, Multiplexer* mux, const char* path);

    // Sets whom to call; a null callback (the initial state) leaves readiness unanswered.
    void set_callback(void* client, notify_callback callback);

    // Opens the file for reading, non-blocking, without ever waiting for it, and has the
    // loop watch it, as soon as there is room. 0, also when it is open already; -1 with
    // errno, not logged, when it cannot be opened.
    int open();

    // Stops watching and closes the file, if open.
    void close();

    // For the owner: whether its read got something.
    void note_read(bool got_data);

    void process(int events) override;

private:
    android::String8 m_path;
    void* m_client = nullptr;
    notify_callback m_callback = nullptr;
};

#endif  // STORAGE_FILENOTIFIER_H_
