// SPDX-License-Identifier: Apache-2.0
// What the consumers of CP memory dumps share: naming, opening and discarding the dump
// files. Owned by the channel for one dump.
#ifndef CHANNELS_CPDUMPCONSUMER_H_
#define CHANNELS_CPDUMPCONSUMER_H_

#include <time.h>

#include "channels/DataConsumer.h"
#include "core/ObjectRef.h"
#include "storage/LogFile.h"

class CpDumpConsumer : public DataConsumer {
public:
    // dump_time: local time of the assert; it names the files.
    CpDumpConsumer(const char* cp_name, CpStorage* storage, const struct tm& dump_time);
    // Closes the dump file.
    ~CpDumpConsumer() override;

    // Makes the ".dmp" file, kept as the dump file. Null, with a message, on failure.
    LogFile* open_dump_file();
    // Makes the ".mem" file for the copy of the kernel's memory file. Not kept.
    LogFile* open_dump_mem_file();
    // Closes the dump file and removes it from the medium, its lists and totals; one that
    // vanished from the medium, too.
    void discard_dump_file();

protected:
    // Writes out and closes the dump file, if it still exists; it stays on the medium.
    void close_dump_file();
    // Writes out what is staged; 0, or -1 when bytes were lost or the file is gone.
    int write_out_dump_file();
    // True when the SD card carries the dump file.
    bool dump_on_sd() const;
    // Writes a chunk to the dump file; the bytes stored, or a negative value.
    ssize_t write_dump(const void* data, size_t len);

private:
    // The file may have gone with its set or its medium, been trimmed or deleted: false with
    // a message then, errno ENOENT and nothing of it left in lists and totals.
    bool dump_file_there();
    int checked(ssize_t result);
    android::String8 file_name(const char* extension) const;

    struct tm m_dump_time;
    ObjectRef<LogFile> m_dump_file;
};

#endif  // CHANNELS_CPDUMPCONSUMER_H_
