// SPDX-License-Identifier: Apache-2.0
// Saves the memory of the connectivity chip, which the chip pushes over its diag device
// on its own after a crash, raw into a ".dmp" file, until a fixed text ends the stream.
// There is no request and no time-out. Owned by the ExtWcnLogHandler for one dump.
#ifndef CHANNELS_EXTWCNDUMPCONSUMER_H_
#define CHANNELS_EXTWCNDUMPCONSUMER_H_

#include "channels/CpDumpConsumer.h"

class ExtWcnDumpConsumer : public CpDumpConsumer {
public:
    ExtWcnDumpConsumer(const char* cp_name, CpStorage* storage, const struct tm& dump_time);
    ~ExtWcnDumpConsumer() override;

    int start() override;
    bool process(DeviceFileHandler::DataBuffer& buf) override;

    static void on_ext_stor_umount(void* consumer);
};

#endif  // CHANNELS_EXTWCNDUMPCONSUMER_H_
