// SPDX-License-Identifier: Apache-2.0
// One timestamped set directory under a medium's log root, with one CP directory per CP
// that wrote into it. A new set is started whenever writing on a medium begins.
// Owns its CpDirectory objects; owned by its MediaStorage. Files lying directly in
// the set directory are neither represented nor counted. Main thread only.
#ifndef STORAGE_CPSETDIRECTORY_H_
#define STORAGE_CPSETDIRECTORY_H_

#include <stdint.h>
#include <utils/List.h>
#include <utils/String8.h>

#include "storage/LogType.h"

class CpDirectory;
class LogFile;
class MediaStorage;

class CpSetDirectory {
public:
    CpSetDirectory(MediaStorage* media, const android::String8& path);
    // Deletes every CP directory object; nothing on the medium changes.
    ~CpSetDirectory();
    CpSetDirectory(const CpSetDirectory&) = delete;
    CpSetDirectory& operator=(const CpSetDirectory&) = delete;

    const android::String8& path() const { return m_path; }
    uint64_t size() const { return m_size; }
    MediaStorage* media() const { return m_media; }
    const android::List<CpDirectory*>& dirs() const { return m_dirs; }

    // Makes the directory on the medium; 0 also when it exists. -1 on failure.
    int create();
    bool empty() const { return m_dirs.empty(); }
    // Whether it is known to hold no CP directories. A scan that could not see everything is
    // repeated now and then.
    bool found_empty();
    // Deletes the directory on the medium with everything in it.
    int remove();
    // Scans the set on the medium. 0, or -1 when it cannot be opened.
    int stat();

    // The CP's directory object, or null.
    CpDirectory* get_cp_dir(const android::String8& cp_name) const;
    // Finds or makes the CP's directory; new_dir becomes true when it was made now.
    // One that vanished from the medium is dropped and made again. Null on failure.
    CpDirectory* prepare_cp_dir(const android::String8& cp_name, bool& new_dir);
    // An open file in the CP's directory, owned by that directory; null on failure.
    LogFile* create_file(const android::String8& cp_name, const android::String8& name,
                         LogType type);
    // A new log file. new_dir is set only on success: whether the CP's directory was
    // made by this call.
    LogFile* create_log_file(const android::String8& cp_name, bool& new_dir);

    // Bytes that came or went; the medium counts them too.
    void add_size(uint64_t num);
    void dec_size(uint64_t num);
    // Counts the listed directories again and drops those that are gone. Only this set's size
    // changes. Returns how many files it looked at.
    size_t recount();

    // Frees at least the bytes wanted, if possible, CP directory by CP directory,
    // removing those that become empty. Returns the bytes removed; the caller subtracts
    // them from the medium's total.
    uint64_t trim(uint64_t wanted);
    // The same for the set being written, but leaves the files that spare names.
    uint64_t trim_working_dir(uint64_t wanted, Spare spare);
    // The same behind the files that these two could not delete.
    uint64_t trim_past_stuck(uint64_t wanted, Spare spare);

private:
    typedef uint64_t (*Walk)(CpDirectory* dir, uint64_t wanted, Spare spare);

    uint64_t trim_with(Walk walk, uint64_t wanted, Spare spare);

    MediaStorage* m_media;
    android::String8 m_path;
    android::List<CpDirectory*> m_dirs;
    uint64_t m_size = 0;
    bool m_left_out = false;   // the scan could not look at everything
    unsigned int m_asked = 0;  // how often found_empty() was called then
};

#endif  // STORAGE_CPSETDIRECTORY_H_
