#include "storage/CpStorage.h"

#include "channels/LogPipeHandler.h"
#include "storage/CpDirectory.h"
#include "storage/CpSetDirectory.h"
#include "storage/MediaStorage.h"

CpStorage::CpStorage(StorageManager* manager, LogPipeHandler* channel)
    : m_manager(manager), m_channel(channel) {}

CpStorage::~CpStorage() {
    stop();
}

void CpStorage::stop() {
    if (m_cur_file) {
        m_cur_file->close();
        m_cur_file = nullptr;
    }
}

void CpStorage::flush() {
    if (m_cur_file) {
        m_cur_file->flush();
    }
}

int CpStorage::write(const void* data, size_t len) {
    if (m_manager->check_media_change()) {
        stop();
    }
    // The channel's hooks for a new file make files of their own and so may bring a change
    // of medium with them, which closes the file just started: then once more.
    if (!prepare_file() || (!m_cur_file && (!prepare_file() || !m_cur_file))) {
        return -1;
    }
    MediaStorage* media = m_manager->get_media_stor();
    if (m_quota_pending) {
        if (media->check_quota() != 0) {
            return -1;
        }
        m_quota_pending = false;
        if (!m_cur_file) {
            return -1;  // trimmed: it was not in the working set any more
        }
    }
    const int n = static_cast<int>(m_cur_file->write(data, len));
    if (n <= 0) {
        if (n == -2 && media->free_space() != 0) {
            m_quota_pending = true;
            flush();
        }
        return n;
    }
    if (m_cur_file->size() >= media->file_size()) {
        m_cur_file->dir()->close_log_file();
        stop();
    }
    if (media->check_quota() != 0) {
        m_quota_pending = true;
        flush();
    }
    return n;
}

// Sees to it that there is a current file that exists on the medium. False when none could
// be made.
bool CpStorage::prepare_file() {
    if (m_cur_file) {
        if (m_cur_file->exists()) {
            return true;
        }
        // It vanished: its successor goes to the same medium and takes its number.
        LogFile* vanished = m_cur_file.get();
        MediaStorage* media = vanished->dir()->set()->media();
        stop();
        vanished->dir()->file_removed(vanished);
        return open_log_file(media);
    }
    MediaStorage* media = m_manager->get_media_stor();
    if (!media) {
        return false;
    }
    CpDirectory* dir = media->get_cp_dir(m_channel->name());
    if (dir) {
        dir->rotate_logs();
    }
    return open_log_file(media);
}

// Starts a new log file on the medium and tells the channel. False when no file could be
// made.
bool CpStorage::open_log_file(MediaStorage* media) {
    bool new_dir = false;
    m_cur_file = media->create_file(m_channel->name(), LT_LOG, new_dir, android::String8());
    if (!m_cur_file) {
        return false;
    }
    if (new_dir && m_new_dir_cb) {
        m_new_dir_cb(m_channel);
    }
    if (m_cur_file && m_new_log_cb) {
        m_new_log_cb(m_channel, m_cur_file.get());
    }
    return true;
}

LogFile* CpStorage::create_file(const android::String8& name, LogType type, MediaType media_type) {
    if (media_type == MT_NONE) {
        m_manager->check_media_change();
        media_type = m_manager->media_type();
    }
    MediaStorage* media = m_manager->get_media(media_type);
    if (!media) {
        return nullptr;
    }
    bool new_dir = false;
    return media->create_file(m_channel->name(), type, new_dir, name);
}

int CpStorage::check_quota(MediaType media_type) {
    MediaStorage* media =
        media_type == MT_NONE ? m_manager->get_media_stor() : m_manager->get_media(media_type);
    return media ? media->check_quota() : 0;
}

void CpStorage::subscribe_media_change_evt(StorageManager::media_change_callback callback,
                                           void* client) {
    m_manager->subscribe_media_change_evt(client, callback);
}

void CpStorage::unsubscribe_media_change_evt(void* client) {
    m_manager->unsubscribe_media_change_evt(client);
}

void CpStorage::subscribe_ext_stor_umount_evt(void* client,
                                              StorageManager::ext_umount_callback callback) {
    m_manager->subscribe_ext_stor_umount_evt(client, callback);
}

void CpStorage::unsubscribe_ext_stor_umount_evt(void* client) {
    m_manager->unsubscribe_ext_stor_umount_evt(client);
}

bool CpStorage::on_sd(const LogFile* file) const {
    return file->dir()->set()->media() == m_manager->get_media(MT_EXTERNAL);
}
