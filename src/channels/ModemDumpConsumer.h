// SPDX-License-Identifier: Apache-2.0
// Saves the memory of an asserted modem, which the modem sends over its diag device
// after a short request, raw into a ".dmp" file. When the stream breaks off, the
// kernel's memory file of the modem is copied into a ".mem" file instead.
// Owned by the WanModemLogHandler for one dump.
#ifndef CHANNELS_MODEMDUMPCONSUMER_H_
#define CHANNELS_MODEMDUMPCONSUMER_H_

#include "channels/CpDumpConsumer.h"
#include "channels/DiagFrameParser.h"
#include "channels/modem_dump_end.h"
#include "core/OneShotTimer.h"

class ModemDumpConsumer : public CpDumpConsumer {
public:
    // A modem that is silent for this long has stopped.
    static constexpr unsigned int READ_TIMEOUT_MS = 3000;
    // One that does not know the request goes on to log on the same device, for ever.
    static constexpr unsigned int WHOLE_TIMEOUT_MS = 30 * 60 * 1000;

    ModemDumpConsumer(const char* cp_name, CpStorage* storage, const struct tm& dump_time,
                      const char* mem_path);
    ~ModemDumpConsumer() override;

    int start() override;
    bool process(DeviceFileHandler::DataBuffer& buf) override;

    // Copies the kernel's memory file; false when that failed.
    bool save_dump_file();

    static void dump_read_timeout(void* consumer);
    static void dump_does_not_end(void* consumer);
    static void on_ext_stor_umount(void* consumer);

private:
    // Follows the frames of the chunk; true when one of them was the end marker.
    bool check_end_of_dump(const DeviceFileHandler::DataBuffer& buf);
    void stop_timers();

    const char* m_mem_path;
    OneShotTimer m_read_timer;   // until the next chunk
    OneShotTimer m_whole_timer;  // until the end
    DiagFrameParser m_parser;
};

#endif  // CHANNELS_MODEMDUMPCONSUMER_H_
