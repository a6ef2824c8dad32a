// SPDX-License-Identifier: Apache-2.0
// The directory of one CP inside one set directory. Owns the LogFile objects of the
// files in it, keeps them in the order in which trimming deletes them (unknown files,
// then timed files from oldest to newest, then version records; files made at run time
// at the end), knows their total size, and makes, renumbers and trims them.
//
// Owned by its CpSetDirectory. Every change of size made through add_size and dec_size
// is passed on to the set and the medium; trim and trim_working_dir return what they
// removed and leave that to their callers. Main thread only.
#ifndef STORAGE_CPDIRECTORY_H_
#define STORAGE_CPDIRECTORY_H_

#include <stdint.h>
#include <utils/List.h>
#include <utils/String8.h>

#include <memory>
#include <set>
#include <string_view>

#include "core/ObjectRef.h"
#include "storage/LogType.h"

class CpSetDirectory;
class LogFile;

class CpDirectory {
public:
    CpDirectory(CpSetDirectory* set, const android::String8& name);
    // Closes and deletes every file object; nothing on the medium changes.
    ~CpDirectory();
    CpDirectory(const CpDirectory&) = delete;
    CpDirectory& operator=(const CpDirectory&) = delete;

    const android::String8& name() const { return m_name; }
    const android::String8& path() const { return m_path; }
    uint64_t size() const { return m_size; }
    CpSetDirectory* set() const { return m_set; }
    const android::List<LogFile*>& files() const { return m_files; }

    // Makes the directory on the medium; 0 also when it exists. -1 on failure.
    int create();
    bool empty() const { return m_files.empty(); }
    // Whether it is known to hold no files. A scan that could not see everything is repeated now
    // and then.
    bool found_empty();
    // Deletes the directory on the medium with everything in it.
    int remove();
    // Scans the directory on the medium. 0, or -1 when it cannot be opened.
    int stat();

    // Makes, opens and appends a new log file numbered 0, which becomes the current
    // one. The caller renumbers the older ones first (rotate_logs). Null on failure.
    LogFile* create_log_file();
    // Makes, opens and appends another file. Null on failure. Owned by this directory.
    //
    // Neither of the two overwrites anything. Names have one-second resolution: an older file of
    // the same name, listed or not, is set aside as "NAME-N.EXT".
    LogFile* create_file(const android::String8& name, LogType type);
    // Deletes a listed file: its object, and the file on the medium, where it may be gone
    // already. 0, and the object is gone; -1 when it is not in the list.
    int remove_file(LogFile* file);
    // The file vanished from the medium: drops the object. Only this directory's size
    // changes; the totals of the set and the medium become uncertain.
    void file_removed(LogFile* file);
    // Closes the current log file; the next one starts fresh.
    void close_log_file();
    // Frees the number 0 for a new log file: adds 1 to the number of every log file, or more
    // where two share a number because a renaming failed. Does nothing while no log file has
    // the number 0. Never replaces a file; drops those that are gone.
    void rotate_logs();

    // Bytes that came or went; the set and the medium count them too.
    void add_size(uint64_t num);
    void dec_size(uint64_t num);
    // Counts the listed files on the medium again and drops those that are gone, or no files any
    // more.
    // Only this directory's size changes. Returns how many files it looked at.
    size_t recount();

    // Deletes files from the front until at least the bytes wanted are gone (at least
    // one file is deleted, if there is one). Returns the bytes removed.
    uint64_t trim(uint64_t wanted);
    // As trim, but leaves the protected files; renumbers the first log file to follow the oldest
    // one left.
    uint64_t trim_working_dir(uint64_t wanted);
    // The same, but deletes nothing but logs.
    uint64_t trim_logs(uint64_t wanted);
    // Each of the three ends at a file that cannot be deleted. This goes on behind those: it
    // passes over them, and over more that it finds as long as the medium allows that. Leaves
    // what spare names.
    uint64_t trim_past_stuck(uint64_t wanted, Spare spare);

private:
    typedef android::List<LogFile*>::iterator FileIter;

    LogFile* open_and_list(std::unique_ptr<LogFile> file, const android::String8& wanted);
    LogFile* find(const android::String8& name) const;
    android::String8 free_name(const android::String8& name);
    android::String8 aside_name(const android::String8& name);
    bool taken_by_stranger(const android::String8& name,
                           const std::set<std::string_view>& listed) const;
    bool is_replaced(const LogFile* file) const;
    FileIter drop(FileIter it);
    uint64_t delete_oldest(uint64_t wanted, Spare spare, const LogFile*& stuck);
    bool is_spared(const LogFile* file, Spare spare) const;
    bool leads_away() const;
    void renumber_first_log();
    void insert_scanned(LogFile** files, size_t num);

    CpSetDirectory* m_set;
    android::String8 m_name;
    android::String8 m_path;
    uint64_t m_size = 0;
    bool m_left_out = false;   // the scan could not look at everything
    unsigned int m_asked = 0;  // how often found_empty() was called then
    ObjectRef<LogFile> m_first_log;
    android::List<LogFile*> m_files;
    ObjectRef<LogFile> m_cur_log;
    unsigned int m_aside_num = 0;  // last N given by aside_name
};

#endif  // STORAGE_CPDIRECTORY_H_
