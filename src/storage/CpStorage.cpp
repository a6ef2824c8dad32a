// SPDX-License-Identifier: Apache-2.0

#include "storage/CpStorage.h"

#include <errno.h>

#include "core/SavedErrno.h"
#include "core/log.h"
#include "storage/CpChannel.h"
#include "storage/CpDirectory.h"
#include "storage/MediaStorage.h"

CpStorage::CpStorage(StorageManager* manager, CpChannel* channel)
    : m_manager(manager), m_channel(channel) {}

CpStorage::~CpStorage() {
    stop();
}

void CpStorage::stop() {
    if (m_cur_file) {
        write_out();
        m_cur_file->close();
        m_cur_file = nullptr;
    }
}

// False when blocks that were taken are lost.
bool CpStorage::write_out() {
    if (m_cur_file->write_out() == 0) {
        return true;
    }
    err_log("what %s had staged is lost", m_channel->name().string());
    return false;
}

void CpStorage::flush() {
    if (m_cur_file && !write_out()) {
        // The medium hears of it as of a write: a failing card to which each block is only
        // staged, and lost as it is flushed, would else stay in use for ever.
        // On a full one the next write makes room, if that is still so: a crash flushes what was
        // logged before, and its own files would be the first to go.
        if (errno == ENOSPC) {
            m_was_full = true;
        } else {
            m_manager->write_failed(m_cur_file->media(), errno);
        }
    }
}

int CpStorage::write(const void* data, size_t len) {
    if (m_manager->check_media_change()) {
        stop();
    }
    if (!prepare_write(len)) {
        return -1;
    }
    MediaStorage* media = m_manager->get_media_stor();
    const int n = static_cast<int>(m_cur_file->write(data, len));
    const bool was_full = m_was_full;
    m_was_full = false;
    if (n > 0) {
        if (was_full && !has_room(media)) {
            errno = ENOSPC;
            return LogFile::FULL;
        }
        close_full_file(media);
        keep_quota(media);
    } else if (n < 0) {
        const SavedErrno keep;  // the caller reports why the block is lost
        if (n == LogFile::FULL) {
            make_room(media);
        } else {
            m_manager->write_failed(media, errno);
        }
    }
    return n;
}

void CpStorage::close_full_file(const MediaStorage* media) {
    if (m_cur_file && m_cur_file->size() >= media->file_size()) {
        flush();
        if (m_cur_file) {
            m_cur_file->dir()->close_log_file();
            stop();
        }
    }
}

void CpStorage::keep_quota(MediaStorage* media) {
    if (media->check_quota() != 0) {
        m_quota_pending = true;
        flush();
    }
}

// Since a flush found a medium full it may have got room, in whatever way, or be another one: what
// it takes now tells. False when it is still full; then room was made.
bool CpStorage::has_room(MediaStorage* media) {
    flush();
    if (!m_was_full) {
        return true;
    }
    m_was_full = false;
    make_room(media);
    return false;
}

// After a file or a block that the full medium did not take.
void CpStorage::make_room(MediaStorage* media) {
    if (media->free_space() == 0) {
        return;
    }
    const bool freed = media->make_room_with_new_set() && media->free_space() == 0;
    m_quota_pending = true;
    flush();
    if (!freed) {
        report_deletions(media);
    }
}

// Where there is no room because nothing can be deleted any more, nothing is written that could
// tell that the medium fails: it hears of that as of a write. Returns the errno, or 0.
int CpStorage::report_deletions(MediaStorage* media) {
    const int error = media->deletion_error();
    if (error != 0) {
        m_manager->write_failed(media, error);
    }
    return error;
}

// Sees to it that there is a current file that may take len bytes more. The hooks for a new
// file may create files themselves, which can switch the medium, and room may have to be made
// with a new set: both close the file just opened, hence the further tries.
bool CpStorage::prepare_write(size_t len) {
    MediaStorage* in_use = m_manager->get_media_stor();
    if (in_use) {
        in_use->data_arrived(len);
    }
    for (int tries = 0; tries < 3; ++tries) {
        if (!prepare_file()) {
            return false;
        }
        if (!m_cur_file) {
            continue;  // a hook switched the medium
        }
        if (!pass_quota(m_manager->get_media_stor())) {
            return false;
        }
        if (m_cur_file) {
            return true;
        }
    }
    return false;
}

// False while the medium is above its quota after an earlier write.
bool CpStorage::pass_quota(MediaStorage* media) {
    if (m_quota_pending && media->check_quota() != 0 && !media->make_room_with_new_set()) {
        const int error = report_deletions(media);
        errno = error != 0 ? error : EDQUOT;  // for who reports the block that is lost
        return false;
    }
    m_quota_pending = false;
    return true;
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
        MediaStorage* media = vanished->media();
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
        const SavedErrno keep;  // the caller reports why the block is lost
        if (errno == ENOSPC) {
            make_room(media);
        } else {
            m_manager->write_failed(media, errno);
        }
        return false;  // the next write tries again
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
    // Crash material has no next write: a medium that was full or has failed is tried again, or
    // the other one instead of it.
    for (Tries tries;;) {
        if (media_type == MT_NONE) {
            m_manager->check_media_change();
        }
        MediaStorage* media =
            media_type == MT_NONE ? m_manager->get_media_stor() : m_manager->get_media(media_type);
        if (!media) {
            return nullptr;
        }
        bool new_dir = false;
        LogFile* file = media->create_file(m_channel->name(), type, new_dir, name);
        if (file || !try_again(media, tries)) {
            return file;
        }
    }
}

int CpStorage::check_quota(MediaType media_type) {
    MediaStorage* media =
        media_type == MT_NONE ? m_manager->get_media_stor() : m_manager->get_media(media_type);
    return media ? media->check_quota() : 0;
}

void CpStorage::trim_old_sets() {
    if (MediaStorage* const media = m_manager->get_media_stor()) {
        media->trim_old_sets();
    }
}

bool CpStorage::write_failed(MediaStorage* media, int error) {
    const bool again =
        error == ENOSPC ? media->free_logs() > 0 : m_manager->write_failed(media, error);
    errno = error;
    return again;
}

bool CpStorage::try_again(MediaStorage* media, Tries& tries) {
    ++tries.failed;
    const bool full = errno == ENOSPC;
    if (full && tries.made_room) {
        return false;
    }
    tries.made_room = tries.made_room || full;
    return write_failed(media, errno) && tries.failed < (tries.made_room ? 4 : 3);
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
    return file->media() == m_manager->get_media(MT_EXTERNAL);
}
