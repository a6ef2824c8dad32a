// SPDX-License-Identifier: Apache-2.0

#include "channels/DiagReplyConsumer.h"

#include <errno.h>
#include <string.h>
#include <unistd.h>

#include <memory>

#include "core/Multiplexer.h"
#include "core/log.h"
#include "storage/CpStorage.h"

namespace {

// Sub-types of the reply frames.
constexpr uint8_t REPLY_NOT_SERVED = 0x00;
constexpr uint8_t REPLY_END = 0x01;
constexpr uint8_t REPLY_DATA = 0x64;

}  // namespace

DiagReplyConsumer::DiagReplyConsumer(const char* cp_name, CpStorage* storage,
                                     const Exchange& exchange)
    : DataConsumer(cp_name, storage),
      m_exchange(exchange),
      m_read_timer(nullptr, exchange.read_timeout, this),
      m_reply_timer(nullptr, on_no_reply, this),
      m_whole_timer(nullptr, on_no_reply, this) {}

DiagReplyConsumer::~DiagReplyConsumer() {
    close_file();
}

void DiagReplyConsumer::stop_timers() {
    m_read_timer.stop();
    m_reply_timer.stop();
    m_whole_timer.stop();
}

bool DiagReplyConsumer::create_result_file(android::String8& name, LogFile*& file) {
    struct tm now;
    if (get_local_time(now) < 0) {
        return false;
    }
    name = m_cp_name;
    name.appendFormat("_%s_%s.log", m_exchange.name_infix,
                      LogTime::from_tm(now).file_stamp().string());
    file = m_storage->create_file(name, m_exchange.log_type, MT_NONE);
    return true;
}

bool DiagReplyConsumer::send_request() {
    uint8_t* request;
    size_t len;
    DiagFrameParser::frame(m_exchange.diag_type, 0, nullptr, 0, request, len);
    const std::unique_ptr<uint8_t[]> owner(request);
    return write(m_handler->fd(), request, len) == static_cast<ssize_t>(len);
}

int DiagReplyConsumer::start_exchange(LogFile* file) {
    m_file = file;
    if (!m_file) {
        return -1;
    }
    // The time-outs first: no request leaves whose exchange nothing would end.
    m_read_timer.bind(m_handler->multiplexer()->timer_mgr());
    m_reply_timer.bind(m_handler->multiplexer()->timer_mgr());
    m_whole_timer.bind(m_handler->multiplexer()->timer_mgr());
    if (m_read_timer.start(READ_TIMEOUT_MS) < 0 || m_reply_timer.start(REPLY_TIMEOUT_MS) < 0 ||
        m_whole_timer.start(WHOLE_TIMEOUT_MS) < 0 || !send_request()) {
        stop_timers();
        discard_file();
        return -1;
    }
    return 0;
}

void DiagReplyConsumer::close_file() {
    if (m_file && !m_file->exists()) {
        discard_file();
    } else if (m_file) {
        m_file->close();
        m_file = nullptr;
    }
}

void DiagReplyConsumer::discard_file() {
    if (m_file) {
        m_file->discard();
    }
}

// The medium did not take the result: the next one may find room, or the other medium.
void DiagReplyConsumer::fail_file(int error) {
    MediaStorage* const media = m_file->media();
    discard_file();
    m_storage->write_failed(media, error);
}

bool DiagReplyConsumer::process(DeviceFileHandler::DataBuffer& buf) {
    m_read_timer.start(READ_TIMEOUT_MS);
    bool answered = false;
    const uint8_t* data = buf.data();
    size_t left = buf.data_len;
    while (left > 0) {
        uint8_t* frame;
        size_t frame_len;
        size_t used;
        if (m_parser.unescape(data, left, frame, frame_len, used)) {
            const Outcome outcome = process_frame(frame, frame_len);
            if (outcome == ENDED) {
                return true;
            }
            answered = answered || outcome == TAKEN;
        }
        data += used;
        left -= used;
    }
    if (answered) {
        m_reply_timer.start(REPLY_TIMEOUT_MS);
    }
    buf.consume_all();
    return false;
}

// After ENDED this object is gone.
DiagReplyConsumer::Outcome DiagReplyConsumer::process_frame(const uint8_t* frame, size_t len) {
    DiagHeader header;
    if (len < sizeof(header)) {
        return NOTHING;
    }
    memcpy(&header, frame, sizeof(header));
    if (header.type != m_exchange.diag_type) {
        return NOTHING;
    }
    if (header.sub_type == REPLY_NOT_SERVED) {
        discard_file();
        end(m_exchange.no_support);
        return ENDED;
    }
    if (header.sub_type != REPLY_DATA && header.sub_type != REPLY_END) {
        discard_file();
        end(LPR_FAILURE);
        return ENDED;
    }
    // The file may have gone with its set or its medium, or been trimmed.
    if (!m_file || !m_file->exists()) {
        err_log("result file of %s is gone", m_cp_name);
        discard_file();
        end(LPR_FAILURE);
        return ENDED;
    }
    if (header.sub_type == REPLY_END) {
        if (m_file->write_out() < 0) {
            err_log("result file of %s is not complete", m_cp_name);
            fail_file(errno);
            end(LPR_FAILURE);
            return ENDED;
        }
        close_file();
        end(LPR_SUCCESS);
        return ENDED;
    }
    const size_t payload = len - sizeof(header);
    const ssize_t written = m_file->write(frame + sizeof(header), payload);
    if (written != static_cast<ssize_t>(payload)) {
        if (written >= 0) {
            errno = ENOSPC;
            err_log("result file of %s is not complete", m_cp_name);
        }
        fail_file(written == -1 ? errno : ENOSPC);
        end(LPR_FAILURE);
        return ENDED;
    }
    return payload > 0 ? TAKEN : NOTHING;
}

void DiagReplyConsumer::end(LogProcResult result) {
    stop_timers();
    notify_result(result);
}

bool DiagReplyConsumer::end_by_timeout() {
    if (m_reply_timer.pending() && m_whole_timer.pending() &&
        goes_on(m_read_timer, READ_TIMEOUT_MS)) {
        return false;
    }
    stop_timers();
    close_file();
    return true;
}

void DiagReplyConsumer::on_no_reply(void* param) {
    DiagReplyConsumer* consumer = static_cast<DiagReplyConsumer*>(param);
    consumer->m_exchange.read_timeout(consumer);
}
