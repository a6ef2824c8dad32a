// SPDX-License-Identifier: Apache-2.0

#include "channels/ExtWcnDumpConsumer.h"

#include <errno.h>
#include <poll.h>

#include "core/log.h"
#include "core/text.h"
#include "storage/CpStorage.h"

namespace {

constexpr char END_MARKER[] = "corbet_memdump_finish";
constexpr size_t END_MARKER_LEN = sizeof(END_MARKER) - 1;
// The marker comes in a short chunk. In a longer one the same bytes are memory content.
constexpr size_t MARKER_CHUNK_LIMIT = 4096;

bool ends_dump(const uint8_t* chunk, size_t len) {
    return len < MARKER_CHUNK_LIMIT && find_bytes(chunk, len, END_MARKER, END_MARKER_LEN);
}

}  // namespace

ExtWcnDumpConsumer::ExtWcnDumpConsumer(const char* cp_name, CpStorage* storage,
                                       const struct tm& dump_time)
    : CpDumpConsumer(cp_name, storage, dump_time) {}

ExtWcnDumpConsumer::~ExtWcnDumpConsumer() {
    m_storage->unsubscribe_ext_stor_umount_evt(this);
}

int ExtWcnDumpConsumer::start() {
    if (!open_dump_file()) {
        err_log("open dump file failed!");
        return -1;
    }
    m_storage->subscribe_ext_stor_umount_evt(this, on_ext_stor_umount);
    return 0;
}

bool ExtWcnDumpConsumer::process(DeviceFileHandler::DataBuffer& buf) {
    if (ends_dump(buf.data(), buf.data_len)) {
        m_handler->del_events(POLLIN);
        buf.consume_all();
        const bool complete = write_out_dump_file() == 0;
        if (!complete) {
            err_log("dump of %s is not complete", m_cp_name);
        }
        close_dump_file();
        notify_result(complete ? LPR_SUCCESS : LPR_FAILURE);
        return true;
    }
    const size_t len = buf.data_len;
    const ssize_t written = write_dump(buf.data(), len);
    buf.consume_all();
    if (written < static_cast<ssize_t>(len)) {
        if (written >= 0) {
            errno = ENOSPC;
            err_log("dump of %s is not complete", m_cp_name);
        }
        m_handler->del_events(POLLIN);
        discard_dump_file();
        notify_result(LPR_FAILURE);
        return true;
    }
    return false;
}

void ExtWcnDumpConsumer::on_ext_stor_umount(void* param) {
    ExtWcnDumpConsumer* consumer = static_cast<ExtWcnDumpConsumer*>(param);
    if (!consumer->dump_on_sd()) {
        return;
    }
    info_log("SD card is gone, the dump of %s ends", consumer->m_cp_name);
    consumer->notify_result(LPR_FAILURE);
}
