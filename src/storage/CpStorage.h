// SPDX-License-Identifier: Apache-2.0
// The single door through which one CP's channel and the savers of its crash material
// reach the storage. Every write follows a change of medium, notices a log file that
// vanished, renumbers and starts log files at the size limit, calls the channel back
// for new directories and files, and keeps the quota.
//
// Made by StorageManager::create_storage for one channel, destroyed by delete_storage.
// The channel's name names the CP's directory. Main thread only.
#ifndef STORAGE_CPSTORAGE_H_
#define STORAGE_CPSTORAGE_H_

#include <stddef.h>
#include <utils/String8.h>

#include "core/ObjectRef.h"
#include "storage/LogFile.h"
#include "storage/LogType.h"
#include "storage/MediaType.h"
#include "storage/StorageManager.h"

class CpChannel;

class CpStorage {
public:
    typedef void (*new_log_callback)(CpChannel* channel, LogFile* file);
    typedef void (*new_dir_callback)(CpChannel* channel);

    CpStorage(StorageManager* manager, CpChannel* channel);
    // Closes the current file.
    ~CpStorage();
    CpStorage(const CpStorage&) = delete;
    CpStorage& operator=(const CpStorage&) = delete;

    // Called after a new log file was started, before its first data; may be null.
    void set_new_log_callback(new_log_callback callback) { m_new_log_cb = callback; }
    // Called after a CP directory was made for a new log file; may be null.
    void set_new_dir_callback(new_dir_callback callback) { m_new_dir_cb = callback; }

    // Writes log data. Returns the bytes taken, 0, -1 on failure or LogFile::FULL; what was
    // not taken is lost.
    int write(const void* data, size_t len);
    // Hands what is staged in the current file to the system.
    void flush();
    // Closes and forgets the current file; it stays in its directory.
    void stop();

    // An open file of another kind in the CP's directory on the given medium (MT_NONE:
    // the one in use, after a check for a change). Owned by its directory: keep an
    // ObjectRef. Null on failure.
    LogFile* create_file(const android::String8& name, LogType type, MediaType media = MT_NONE);
    // Trims the medium to its quota. 0 when it is within it now or there is no such
    // medium, else -1.
    int check_quota(MediaType media);
    // Trims the medium in use to its quota by deleting older sets only: captures in the set in use
    // are spared, so that deleting the rest of it would not help.
    void trim_old_sets();
    // Another file than the log could not be written, for the reason error: as after a failed
    // write of the log an SD card is left for now, or room is made on a full medium, by deleting
    // older sets and logs only. True when another try may come to something. errno becomes error.
    bool write_failed(MediaStorage* media, int error);
    struct Tries {
        int failed = 0;
        bool made_room = false;
    };
    // The same with a limit, for a caller that tries again until this is false. A card seems to
    // work again after its first failure, so it takes two to reach the other medium; room is made
    // once.
    bool try_again(MediaStorage* media, Tries& tries);

    void subscribe_media_change_evt(StorageManager::media_change_callback callback, void* client);
    void unsubscribe_media_change_evt(void* client);
    void subscribe_ext_stor_umount_evt(void* client, StorageManager::ext_umount_callback callback);
    void unsubscribe_ext_stor_umount_evt(void* client);

    // True when the file lies on the SD card.
    bool on_sd(const LogFile* file) const;

    LogFile* current_file() const { return m_cur_file.get(); }

private:
    bool write_out();
    bool prepare_write(size_t len);
    void close_full_file(const MediaStorage* media);
    void keep_quota(MediaStorage* media);
    bool has_room(MediaStorage* media);
    void make_room(MediaStorage* media);
    int report_deletions(MediaStorage* media);
    bool prepare_file();
    bool open_log_file(MediaStorage* media);
    bool pass_quota(MediaStorage* media);

    StorageManager* m_manager;
    CpChannel* m_channel;
    new_log_callback m_new_log_cb = nullptr;
    new_dir_callback m_new_dir_cb = nullptr;
    ObjectRef<LogFile> m_cur_file;
    bool m_quota_pending = false;  // the next write has to pass the quota check first
    bool m_was_full = false;       // what was staged found the medium full
};

#endif  // STORAGE_CPSTORAGE_H_
