// SPDX-License-Identifier: Apache-2.0
// The log channel of the audio DSP. It collects three sources, the log device, a PCM
// capture device and a memory dump device, into the same rotating log files, each chunk
// behind a DspChunkHeader. A readable dump device means that the DSP has asserted.
// Owned by the LogController.
#ifndef CHANNELS_AGDSPLOGHANDLER_H_
#define CHANNELS_AGDSPLOGHANDLER_H_

#include "channels/DspChunkHeader.h"
#include "channels/LogPipeHandler.h"
#include "storage/FileNotifier.h"

class AgDspLogHandler : public LogPipeHandler {
public:
    enum DspLogType : uint8_t {
        DLT_LOG = DSP_CHUNK_LOG,
        DLT_DUMP = DSP_CHUNK_DUMP,
        DLT_PCM = DSP_CHUNK_PCM
    };

    AgDspLogHandler(LogController* ctrl, Multiplexer* mux, const LogConfig::ConfigEntry* entry,
                    StorageManager* stor_mgr);

    int start() override;
    int stop() override;
    void process(int events) override;
    int start_dump(const struct tm& t) override;

    // Stores one read of the notifier's device as a chunk.
    void save_audio_log(FileNotifier* notifier, DspLogType type);
    // Stores the notifier's device to its end and tells the device so.
    void save_dump(FileNotifier* notifier);
    // Puts the header of a chunk of n data bytes at the start of the buffer.
    void fill_header(uint8_t* buffer, size_t n, DspLogType type);

    static void notify_pcm(FileNotifier* notifier, void* client);
    static void notify_dump(FileNotifier* notifier, void* client);

private:
    // What fits into the shared buffer behind the header.
    static constexpr size_t MAX_CHUNK = DSP_CHUNK_MAX_DATA;
    static_assert(MAX_CHUNK == IO_BUFFER_SIZE - DSP_CHUNK_HEADER_LEN, "one read fills the buffer");

    // Writes the chunk in the shared buffer, header and n data bytes; as CpStorage::write, and
    // reports a chunk that is taken in part only.
    int write_chunk(size_t n, DspLogType type);

    FileNotifier m_pcm_notifier;
    FileNotifier m_dump_notifier;
    uint32_t m_seq = 0;
};

#endif  // CHANNELS_AGDSPLOGHANDLER_H_
