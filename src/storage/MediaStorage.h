// SPDX-License-Identifier: Apache-2.0
// The log tree on one medium: scans the sets that earlier runs left, starts new sets,
// hands out files in the set being written (the working set), keeps the total size
// and frees space oldest data first, by a quota and when the medium is full. The
// protected files of the working set are never deleted.
//
// Owned by the StorageManager, one object per medium. Main thread only.
//
// Set names have one-second resolution. A set that is started within the same second as
// another one on the same medium is that set: create_cp_set() makes the existing object
// the working set again, so that one directory never has two objects.
#ifndef STORAGE_MEDIASTORAGE_H_
#define STORAGE_MEDIASTORAGE_H_

#include <stdint.h>
#include <utils/List.h>
#include <utils/String8.h>

#include <memory>

#include "core/open_file.h"
#include "storage/LogType.h"

class CpDirectory;
class CpSetDirectory;
class LogFile;
class StorageManager;

class MediaStorage {
public:
    explicit MediaStorage(StorageManager* manager);
    // Deletes the set objects; nothing on the medium changes.
    ~MediaStorage();
    MediaStorage(const MediaStorage&) = delete;
    MediaStorage& operator=(const MediaStorage&) = delete;

    // Sets the top directory and, below it, the log root, and whether that may be a link: not
    // where others than root could have made it.
    void set_dirs(const android::String8& top_dir, Links root_links);
    // Limits, in bytes. A quota of 0 means no limit. They apply from the next check.
    void set_quota(uint64_t quota) { m_quota = quota; }
    void set_file_size(uint32_t size) { m_file_size = size; }
    // Whether old data may be deleted to stay within the limits.
    void set_overwrite(bool overwrite) { m_overwrite = overwrite; }

    const android::String8& top_dir() const { return m_top_dir; }
    const android::String8& log_root() const { return m_log_root; }
    uint64_t quota() const { return m_quota; }
    uint32_t file_size() const { return m_file_size; }
    bool overwrite() const { return m_overwrite; }
    bool scanned() const { return m_scanned; }
    uint64_t size() const { return m_size; }
    CpSetDirectory* working_set() const { return m_working_set; }
    const android::List<CpSetDirectory*>& sets() const { return m_sets; }

    // Makes the log root if needed and scans it. 0 or -1.
    int stat();
    // Starts a new working set, named by the local time; makes the log root too when that
    // is missing. Null on failure, with errno.
    CpSetDirectory* create_cp_set();
    // The same; on a full medium after making room for it, also of what is spared in the set that
    // was written to so far.
    CpSetDirectory* start_set();
    // A usable working set: the present one, or a new one when there is none, when it
    // vanished or when the whole log root vanished. Null on failure, with errno.
    CpSetDirectory* prepare_cur_set();
    // An open file in the CP's directory of the working set: a new log file for
    // LT_LOG (name unused; new_dir tells whether the CP's directory was made for it),
    // else a file of that name. Null on failure, with errno.
    LogFile* create_file(const android::String8& cp_name, LogType type, bool& new_dir,
                         const android::String8& name);
    // The CP's directory in the working set, or null.
    CpDirectory* get_cp_dir(const android::String8& cp_name) const;

    // Whether the log root, or the kest directory above it, has become a symbolic link. Then
    // nothing below it is made, scanned or deleted: on a card it could lead anywhere.
    bool leads_away() const;

    // True when a file can be made in the log root and written now: makes one and deletes it. Also
    // when the medium is full: whoever makes a set or a file there makes room.
    bool can_make_files();

    void add_size(uint64_t num) { m_size += num; }
    void dec_size(uint64_t num) { m_size -= num; }
    // Something vanished from the medium: the totals may count what is no longer there.
    // check_quota counts again before it deletes anything because of them.
    void totals_uncertain() { m_uncertain = true; }
    // A file could not be deleted in the present trim, for the reason error.
    void deletion_failed(int error);
    // The same of one behind which it goes on.
    void passed_over(int error);
    // Whether it may go on behind one more: on a dying medium each try may last.
    bool may_pass_over() const { return m_passed_over < MAX_PASSED_OVER; }
    // The errno with which the last trim failed to delete files, if that says that the medium
    // fails; else 0.
    int deletion_error() const { return m_overwrite ? m_deletion_error : 0; }
    // Bytes of log data arrived for this medium, whether they can be written or not.
    void data_arrived(size_t len) { m_arrived += len; }

    // Frees at least the bytes wanted, if possible; returns the bytes freed.
    uint64_t trim(uint64_t wanted);
    // Trims to the quota. 0 when the total is within it now, else -1. Files deleted by
    // somebody else are found missing before it gives up.
    int check_quota();
    // The same without the working set.
    void trim_old_sets();
    // For a medium that is full, or above its quota even after check_quota, because trimming
    // spares files in the working set: starts a new set, so that the old one can be trimmed like
    // any other. At most once per file size of data that arrived. True when the total is within
    // the quota now. The CP storages may have closed their files.
    bool make_room_with_new_set();
    // Frees one file size after the medium ran full. 0 when at least half of it could
    // be freed, else -1.
    int free_space();
    // The same for a file that is not a log; the bytes freed, as the file may be small. What was
    // saved in the working set stays: it may be of the same crash.
    uint64_t free_logs();

    // Forgets all sets, so that the next use scans again; nothing on the medium changes.
    void clear();
    // Deletes all sets, on the medium too unless that leads away.
    void clear_all();

private:
    static constexpr size_t MAX_PASSED_OVER = 16;

    uint64_t trim_unless_vain(uint64_t wanted);
    uint64_t trim_sets_before(uint64_t wanted);
    uint64_t trim_sets(uint64_t wanted, uint64_t (CpSetDirectory::*walk)(uint64_t, Spare));
    uint64_t trim_working_set(uint64_t wanted, Spare spare);
    int prepare_top_dir() const;
    int remake_log_root();
    int scan_sets();
    void forget_sets();
    void insert_scanned(std::unique_ptr<CpSetDirectory> set);
    void drop_working_set();
    bool above_quota() const;
    bool recount_helps();
    void recount_if_uncertain();
    void recount();

    StorageManager* m_manager;
    bool m_scanned = false;
    bool m_rescan = false;         // the log root vanished: scan it when it is there again
    bool m_probe_cleared = false;  // what had the name of can_make_files()'s file
    uint64_t m_quota = 0;
    uint32_t m_file_size = 512u << 20;
    bool m_overwrite = true;
    android::String8 m_top_dir;
    android::String8 m_log_root;
    Links m_root_links = Links::REFUSE;
    android::List<CpSetDirectory*> m_sets;
    CpSetDirectory* m_working_set = nullptr;
    uint64_t m_size = 0;
    bool m_uncertain = false;         // something vanished since the last recount
    unsigned int m_refusals = 0;      // checks that failed in a row
    size_t m_stuck = 0;               // files that the last trim could not delete
    size_t m_vain_trims = 0;          // that are left out, as the last one was in vain
    int m_deletion_error = 0;         // see deletion_error()
    size_t m_passed_over = 0;         // those behind which it went on
    size_t m_recounted = 0;           // files that the last recount looked at
    uint64_t m_arrived = UINT32_MAX;  // bytes since the last set made for room; enough at first
};

#endif  // STORAGE_MEDIASTORAGE_H_
