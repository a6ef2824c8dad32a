// SPDX-License-Identifier: Apache-2.0
// One file in a CP directory: a rotating log file or one of the other files kept
// beside the logs. While open it owns a descriptor and a staging buffer that turns
// many small pieces of log data into few writes.
//
// Created, owned and destroyed by its CpDirectory only. Everybody else holds an
// ObjectRef<LogFile>, which becomes null when the directory destroys the file
// (trimmed, removed, vanished from the medium). Main thread only, except write_raw.
#ifndef STORAGE_LOGFILE_H_
#define STORAGE_LOGFILE_H_

#include <stdint.h>
#include <sys/types.h>
#include <time.h>
#include <utils/String8.h>

#include <memory>

#include "core/ObjectRef.h"
#include "storage/LogType.h"
#include "storage/log_name.h"

class CpDirectory;
class MediaStorage;

class LogFile : public RefTarget {
public:
    // What the writes of log files and CP storages return for a full medium.
    static constexpr int FULL = -2;
    // What copy() returns when it was not the source that failed.
    static constexpr int NOT_TAKEN = -3;

    static constexpr size_t BUFFER_SIZE = 65536;

    // A file found by a scan or made by a saver: no time, closed.
    LogFile(const android::String8& name, CpDirectory* dir, LogType type, uint32_t size);
    // A new log file (LT_LOG) made at the given local time, closed.
    LogFile(const android::String8& name, CpDirectory* dir, const struct tm& t);
    // Closes the file.
    ~LogFile();

    const android::String8& name() const { return m_name; }
    LogType type() const { return m_type; }
    const LogTime& time() const { return m_time; }
    uint32_t size() const { return m_size; }
    // What this file adds to the totals of the directory, the set and the medium. size() is
    // kept in 32 bits; a file found on a medium may be larger.
    uint64_t counted() const { return m_counted; }
    bool is_open() const { return m_fd >= 0; }
    CpDirectory* dir() const { return m_dir; }
    // The medium that the file lies on.
    MediaStorage* media() const;
    int fd() const { return m_fd; }

    // Opens the file for writing from its start, creating it when missing; with O_EXCL in
    // more_flags it must be missing. 0, or -1 when it is open already or cannot be opened.
    int open(int more_flags = 0);
    // Writes out what is staged and closes. Does nothing on a closed file. Always 0.
    int close();

    // Buffered write. Returns the bytes taken (they count in the sizes from now on),
    // 0 when none of the new data was taken, -1 on failure, FULL when the medium is full.
    ssize_t write(const void* data, size_t len);
    // Writes all bytes past the staging buffer and the sizes: len, or a negative value.
    ssize_t write_data(const void* data, size_t len);
    // As write_data, with FULL for a full medium. Touches nothing but the descriptor, so
    // that the I/Q thread may call it while it alone uses the file.
    ssize_t write_raw(const void* data, size_t len);
    // Writes out what is staged. What the system does not take is dropped and subtracted from
    // the sizes.
    void flush() { write_out(); }
    // The same; 0, or -1 when bytes were dropped.
    int write_out();
    // Adds the bytes written with write_raw to the totals. Call once per file.
    void set_size(uint32_t size);
    // Forgets what is staged, for a file that is being deleted. The sizes stay.
    void forget_staged() { m_staged = 0; }
    // Sets size() and counted() to what a scan found on the medium. The totals stay.
    void found(uint64_t bytes);

    // Fills this freshly opened file with the source file's content. 0, or with errno -1 for a
    // source that cannot be read, EFBIG when it has no end within MAX_COPY, or NOT_TAKEN when the
    // medium does not take it. What was copied before a failure stays and counts.
    int copy(const char* source);
    static constexpr uint64_t MAX_COPY = 0xFFFFFFFF;

    // Adds 1 to the number at the head of the name, on the medium and here. 0 or -1.
    int rotate(const android::String8& dir_path);
    // Sets that number. 0 or -1; does nothing when the name carries it already.
    int change_name_num(unsigned int num);
    // Gives the file another name in its directory, never one that is taken (EEXIST). 0 or
    // -1, without a message.
    int rename_to(const android::String8& dir_path, const android::String8& new_name);
    // Deletes the file from the medium; one that is gone already counts as deleted.
    int remove(const android::String8& dir_path);
    // Whether the last remove() failed, since when nobody has forgotten it.
    bool stuck() const { return m_stuck; }
    void forget_stuck() { m_stuck = false; }
    // Deletes the file from the medium and from its directory: this object is gone afterwards.
    void discard();
    // False when the file vanished: it cannot be read and written on the medium any more.
    bool exists() const;

    // A hook that runs at the start of the object's destruction, while the file is still
    // open: for a user on another thread, who has to let go first. Null: none.
    void set_destroy_hook(void (*hook)(void* client), void* client) {
        m_destroy_hook = hook;
        m_destroy_client = client;
    }

    // Sets type and time from the name.
    void parse_name();
    // Another name for a file that has not been opened yet.
    void set_name(const android::String8& name) { m_name = name; }

private:
    ssize_t write_staged_with(const void* data, size_t len);
    size_t write_some(const void* data, size_t len);
    void grow(uint64_t len);
    void shrink(uint64_t len);

    CpDirectory* m_dir;
    android::String8 m_name;
    LogType m_type;
    LogTime m_time;
    uint32_t m_size;
    uint64_t m_counted;
    bool m_stuck = false;
    int m_fd = -1;
    std::unique_ptr<uint8_t[]> m_buffer;  // while open
    size_t m_capacity = 0;
    size_t m_staged = 0;
    void (*m_destroy_hook)(void*) = nullptr;
    void* m_destroy_client = nullptr;
};

#endif  // STORAGE_LOGFILE_H_
