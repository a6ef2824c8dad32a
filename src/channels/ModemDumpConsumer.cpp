// SPDX-License-Identifier: Apache-2.0

#include "channels/ModemDumpConsumer.h"

#include <errno.h>
#include <poll.h>
#include <string.h>
#include <unistd.h>

#include "core/Multiplexer.h"
#include "core/SavedErrno.h"
#include "core/log.h"
#include "storage/CpStorage.h"

namespace {

constexpr char DUMP_REQUEST[] = {'3', '\n'};

}  // namespace

ModemDumpConsumer::ModemDumpConsumer(const char* cp_name, CpStorage* storage,
                                     const struct tm& dump_time, const char* mem_path)
    : CpDumpConsumer(cp_name, storage, dump_time),
      m_mem_path(mem_path),
      m_read_timer(nullptr, dump_read_timeout, this),
      m_whole_timer(nullptr, dump_does_not_end, this) {}

ModemDumpConsumer::~ModemDumpConsumer() {
    m_storage->unsubscribe_ext_stor_umount_evt(this);
}

int ModemDumpConsumer::start() {
    // The time-outs first: no request leaves whose dump nothing would end.
    m_read_timer.bind(m_handler->multiplexer()->timer_mgr());
    m_whole_timer.bind(m_handler->multiplexer()->timer_mgr());
    if (m_read_timer.start(READ_TIMEOUT_MS) < 0 || m_whole_timer.start(WHOLE_TIMEOUT_MS) < 0) {
        return -1;
    }
    if (write(m_handler->fd(), DUMP_REQUEST, sizeof(DUMP_REQUEST)) !=
        static_cast<ssize_t>(sizeof(DUMP_REQUEST))) {
        return -1;
    }
    if (!open_dump_file()) {
        return -1;
    }
    m_storage->subscribe_ext_stor_umount_evt(this, on_ext_stor_umount);
    return 0;
}

bool ModemDumpConsumer::check_end_of_dump(const DeviceFileHandler::DataBuffer& buf) {
    bool found = false;
    const uint8_t* data = buf.data();
    size_t left = buf.data_len;
    while (left > 0) {
        uint8_t* frame;
        size_t frame_len;
        size_t used;
        if (m_parser.unescape(data, left, frame, frame_len, used) &&
            frame_len == sizeof(DiagHeader) + MODEM_DUMP_END_LEN &&
            memcmp(frame + sizeof(DiagHeader), MODEM_DUMP_END, MODEM_DUMP_END_LEN) == 0) {
            found = true;
        }
        data += used;
        left -= used;
    }
    return found;
}

bool ModemDumpConsumer::process(DeviceFileHandler::DataBuffer& buf) {
    const bool end = check_end_of_dump(buf);
    m_read_timer.start(READ_TIMEOUT_MS);
    const size_t len = buf.data_len;
    ssize_t written = write_dump(buf.data(), len);
    if (end && written == static_cast<ssize_t>(len) && write_out_dump_file() < 0) {
        // The medium did not take what was staged: the dump is not complete.
        written = -1;
    }
    if (written == static_cast<ssize_t>(len)) {
        buf.consume_all();
        if (end) {
            m_handler->del_events(POLLIN);
            close_dump_file();
            stop_timers();
            notify_result(LPR_SUCCESS);
            info_log("dump complete");
        }
        return true;
    }
    {
        const SavedErrno write_errno;
        discard_dump_file();
        stop_timers();
    }
    err_log("need to write %lu, write returns %d", static_cast<unsigned long>(len),
            static_cast<int>(written));
    notify_result(save_dump_file() ? LPR_SUCCESS : LPR_FAILURE);
    return true;
}

void ModemDumpConsumer::dump_read_timeout(void* param) {
    ModemDumpConsumer* consumer = static_cast<ModemDumpConsumer*>(param);
    if (consumer->goes_on(consumer->m_read_timer, READ_TIMEOUT_MS)) {
        return;
    }
    consumer->stop_timers();
    consumer->discard_dump_file();
    err_log("read timeout");
    consumer->notify_result(consumer->save_dump_file() ? LPR_SUCCESS : LPR_FAILURE);
}

void ModemDumpConsumer::dump_does_not_end(void* param) {
    ModemDumpConsumer* consumer = static_cast<ModemDumpConsumer*>(param);
    consumer->m_read_timer.stop();
    consumer->discard_dump_file();
    err_log("no end of the dump");
    consumer->notify_result(consumer->save_dump_file() ? LPR_SUCCESS : LPR_FAILURE);
}

void ModemDumpConsumer::stop_timers() {
    m_read_timer.stop();
    m_whole_timer.stop();
}

bool ModemDumpConsumer::save_dump_file() {
    m_handler->del_events(POLLIN);
    LogFile* file = nullptr;
    int result = LogFile::NOT_TAKEN;
    for (CpStorage::Tries tries;;) {
        file = open_dump_mem_file();
        if (!file) {
            err_log("create dump mem file failed");
            return false;
        }
        result = file->copy(m_mem_path);
        if (result != LogFile::NOT_TAKEN || !m_storage->try_again(file->media(), tries)) {
            break;
        }
        file->discard();
    }
    const bool copied = result == 0;
    if (copied) {
        info_log("dump proc memory: %s successfully.", m_mem_path);
    } else {
        err_log("dump proc memory: %s failed.", m_mem_path);
    }
    file->close();
    return copied;
}

void ModemDumpConsumer::on_ext_stor_umount(void* param) {
    ModemDumpConsumer* consumer = static_cast<ModemDumpConsumer*>(param);
    // Also when making the ".mem" file finds that the card is gone: the dump that lay on it has
    // been given up by then, and the transaction goes on.
    if (!consumer->dump_on_sd()) {
        return;
    }
    consumer->stop_timers();
    info_log("SD card is gone, the dump of %s ends", consumer->m_cp_name);
    consumer->notify_result(LPR_FAILURE);
}
