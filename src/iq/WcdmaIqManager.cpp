// SPDX-License-Identifier: Apache-2.0

#include "iq/WcdmaIqManager.h"

#include <fcntl.h>
#include <poll.h>
#include <sys/ioctl.h>
#include <sys/mman.h>
#include <sys/socket.h>
#include <unistd.h>

#include "core/Multiplexer.h"
#include "core/SavedErrno.h"
#include "core/log.h"
#include "core/system_paths.h"
#include "iq/IqStorRespHandler.h"
#include "iq/iq_mem.h"
#include "storage/CpChannel.h"
#include "storage/CpStorage.h"
#include "storage/log_name.h"

WcdmaIqManager::WcdmaIqManager(CpChannel* channel)
    : FdHandler(-1, channel->log_ctrl(), channel->multiplexer(), SERVES_CAPTURE),
      m_channel(channel) {}

WcdmaIqManager::~WcdmaIqManager() {
    stop();
}

// ---- Start and stop

int WcdmaIqManager::start(CpStorage* storage) {
    if (m_state != IQS_IDLE || prepare_iq_mem_map() < 0) {
        return -1;
    }
    m_storage = storage;
    if (start_save_thread() < 0) {
        release_iq_mem_map();
        m_storage = nullptr;
        return -1;
    }
    note_alive();
    poll_device();
    m_state = IQS_WAITING;
    m_storage->subscribe_ext_stor_umount_evt(this, on_ext_stor_umount);
    return 0;
}

int WcdmaIqManager::prepare_iq_mem_map() {
    m_fd = open(system_path(PATH_IQ_MEM).string(), O_RDONLY | O_NONBLOCK | O_CLOEXEC);
    if (m_fd < 0) {
        err_log("can not open /dev/iq_mem");
        return -1;
    }
    if (ioctl(m_fd, CMD_SET_IQ_CH_TYPE, 1) < 0) {
        err_log("ioctl CMD_SET_IQ_CH_TYPE error");
        const SavedErrno ioctl_errno;
        close();
        return -1;
    }
    void* base = mmap(nullptr, IQ_MEM_SIZE, PROT_READ | PROT_WRITE, MAP_PRIVATE, m_fd, 0);
    if (base == MAP_FAILED) {
        err_log("mmap error");
        const SavedErrno mmap_errno;
        close();
        return -1;
    }
    m_mem_base = static_cast<uint8_t*>(base);
    info_log("/dev/iq_mem mapped to %p", base);
    return 0;
}

void WcdmaIqManager::release_iq_mem_map() {
    const SavedErrno reason;
    ioctl(m_fd, CMD_SET_IQ_CH_TYPE, 0);
    munmap(m_mem_base, IQ_MEM_SIZE);
    m_mem_base = nullptr;
    del_events(POLLIN);
    close();
}

int WcdmaIqManager::start_save_thread() {
    int pair[2];
    if (socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0, pair) < 0) {
        return -1;
    }
    m_resp_handler = std::make_unique<IqStorRespHandler>(pair[0], m_log_ctrl, m_multiplexer, this);
    m_thread_sock = pair[1];
    const int error = pthread_create(&m_thread, nullptr, save_thread, this);
    if (error != 0) {
        m_resp_handler.reset();
        ::close(m_thread_sock);
        m_thread_sock = -1;
        errno = error;
        return -1;
    }
    m_resp_handler->poll_when_room(POLLIN, "the I/Q saving thread");
    return 0;
}

void WcdmaIqManager::stop_save_thread() {
    if (!m_resp_handler) {
        return;
    }
    m_resp_handler->end_thread();
    pthread_join(m_thread, nullptr);
    m_thread = 0;
    m_resp_handler.reset();
    ::close(m_thread_sock);
    m_thread_sock = -1;
}

int WcdmaIqManager::stop() {
    if (m_state == IQS_IDLE) {
        return 0;
    }
    m_storage->unsubscribe_ext_stor_umount_evt(this);
    stop_save_thread();
    settle_file();
    m_storage = nullptr;
    release_iq_mem_map();
    m_state = IQS_IDLE;
    return 0;
}

int WcdmaIqManager::pause() {
    switch (m_state) {
        case IQS_IDLE:
            return -1;
        case IQS_SAVING:
            wait_for_stop();
            settle_file();
            break;
        case IQS_WAITING:
            hold_events();
            break;
        case IQS_PAUSED:
            break;
    }
    m_state = IQS_PAUSED;
    return 0;
}

int WcdmaIqManager::resume() {
    if (m_state == IQS_IDLE) {
        return -1;
    }
    if (m_state == IQS_PAUSED) {
        note_alive();
        await_buffer();
    }
    return 0;
}

// ---- One buffer

// While it saves and while it is paused the device keeps its place: without it, others that wait
// with their devices could take all places for the ends of their threads, and nobody captures.
void WcdmaIqManager::poll_device() {
    poll_when_room(POLLIN, "the I/Q memory device");
}

void WcdmaIqManager::release_buffer() {
    const SavedErrno reason;
    ioctl(m_fd, CMD_RELEASE_IQ_BUF);
}

// The buffer is done with, the next one may come.
void WcdmaIqManager::await_buffer() {
    poll_device();
    m_state = IQS_WAITING;
    release_buffer();
}

// What a filled buffer came to. A driver that reports buffers and gives none, or a medium that
// takes none, would go on at once, for ever.
void WcdmaIqManager::note_saved(bool something) {
    if (something) {
        note_alive();
    } else {
        note_idle("the I/Q memory device");
    }
}

void WcdmaIqManager::process(int /*events*/) {
    if (!m_resp_handler && start_save_thread() < 0) {
        release_buffer();
        err_log("no thread to save WCDMA I/Q");
        note_saved(false);
        return;
    }
    // While the CP logs nothing, nobody else trims, and the captures of each start would pile up.
    m_storage->trim_old_sets();
    m_cur_file = create_iq_file();
    if (!m_cur_file) {
        release_buffer();
        err_log("create WCDMA I/Q file error");
        note_saved(false);
        return;
    }
    m_save_file = m_cur_file.get();
    m_saved_bytes = 0;
    m_save_error = 0;
    if (m_resp_handler->send_cmd(IQST_SAVE) < 0) {
        m_save_file = nullptr;
        m_cur_file->discard();
        prune_files();
        release_buffer();
        note_saved(false);
        return;
    }
    m_cur_file->set_destroy_hook(on_file_destroyed, this);
    m_state = IQS_SAVING;
    hold_events();
}

int WcdmaIqManager::gen_iq_file_name(android::String8& name) {
    struct tm now;
    if (get_local_time(now) < 0) {
        return -1;
    }
    name = m_channel->name();
    name.appendFormat("_wiq_%s.bin", LogTime::from_tm(now).file_stamp().string());
    return 0;
}

LogFile* WcdmaIqManager::create_iq_file() {
    prune_files();
    while (m_files.size() >= MAX_FILES) {
        // A device that hung up or fails leaves empty files: these go before what was captured.
        android::List<FileRef>::iterator goes = --m_files.end();
        if (idle_wakeups() == 0 || (*goes)->counted() > 0) {
            goes = m_files.begin();
        }
        (*goes)->discard();
        m_files.erase(goes);
    }
    android::String8 name;
    if (gen_iq_file_name(name) < 0) {
        return nullptr;
    }
    LogFile* file = m_storage->create_file(name, LT_WCDMA_IQ, MT_NONE);
    if (file) {
        m_files.push_back(FileRef(file));
    }
    return file;
}

// Entries whose file is gone are worth nothing.
void WcdmaIqManager::prune_files() {
    android::List<FileRef>::iterator it = m_files.begin();
    while (it != m_files.end()) {
        if (*it) {
            ++it;
        } else {
            it = m_files.erase(it);
        }
    }
}

size_t WcdmaIqManager::num_files() {
    prune_files();
    return m_files.size();
}

void WcdmaIqManager::clear_files() {
    m_files.clear();
}

// Accounts for the file that the thread has written and closes it.
void WcdmaIqManager::settle_file() {
    m_save_file = nullptr;
    if (m_cur_file) {
        m_cur_file->set_destroy_hook(nullptr, nullptr);
        m_cur_file->set_size(m_saved_bytes);
        m_cur_file->close();
        m_cur_file = nullptr;
    }
}

void WcdmaIqManager::process_stor_response(int response) {
    if (response == IQST_SAVED && m_state == IQS_SAVING) {
        info_log("WCDMA I/Q saved");
        MediaStorage* const media = m_cur_file ? m_cur_file->media() : nullptr;
        settle_file();
        if (media && m_save_error != 0) {
            m_storage->write_failed(media, m_save_error);
        }
        await_buffer();
        note_saved(m_saved_bytes != 0);
    } else if (response == IQST_SAVED) {
        err_log("IQST_SAVED received in state %d", m_state);
    } else {
        err_log("response %d received in state %d", response, m_state);
    }
}

void WcdmaIqManager::process_thread_lost() {
    err_log("I/Q saving thread is gone");
    stop_save_thread();
    if (m_state == IQS_SAVING) {
        settle_file();
        await_buffer();
        note_saved(false);
    }
}

// Makes the thread stop saving; a response to a save that ended by itself is dropped.
void WcdmaIqManager::wait_for_stop() {
    const bool sent = m_resp_handler->send_cmd(IQST_STOP) == 0;
    if (!sent) {
        err_log("can not stop saving WCDMA I/Q");
    }
    int response;
    do {
        response = m_resp_handler->wait_response();
    } while (response >= 0 && response != IQST_STOPPED && (sent || response != IQST_SAVED));
    if (response < 0) {
        // The file is free only when the thread has ended for certain.
        err_log("I/Q saving thread is gone");
        stop_save_thread();
    }
}

int WcdmaIqManager::cancel_save() {
    wait_for_stop();
    m_save_file = nullptr;
    if (m_cur_file) {
        m_cur_file->set_destroy_hook(nullptr, nullptr);
        m_cur_file->close();
        m_cur_file = nullptr;
    }
    clear_files();
    await_buffer();
    return 0;
}

void WcdmaIqManager::on_ext_stor_umount(void* param) {
    WcdmaIqManager* manager = static_cast<WcdmaIqManager*>(param);
    if (manager->m_state == IQS_SAVING && manager->m_cur_file &&
        manager->m_storage->on_sd(manager->m_cur_file.get())) {
        manager->cancel_save();
    }
}

// The file being saved goes with its set or directory: the thread lets go of it first.
void WcdmaIqManager::on_file_destroyed(void* param) {
    WcdmaIqManager* manager = static_cast<WcdmaIqManager*>(param);
    if (manager->m_state != IQS_SAVING) {
        return;
    }
    info_log("WCDMA I/Q file is gone, its save ends");
    manager->wait_for_stop();
    manager->m_save_file = nullptr;
    manager->m_cur_file = nullptr;
    manager->await_buffer();
}
