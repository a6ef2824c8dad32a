// SPDX-License-Identifier: Apache-2.0
// A private temporary directory. However this process ends, by a signal too, the directory is
// removed: a child process, which has made it, waits for that.
#ifndef KESTLOG_TEMPDIR_H_
#define KESTLOG_TEMPDIR_H_

#include <sys/types.h>

#include <string>

class TempDir {
public:
    TempDir() = default;
    // Removes the directory with all that is in it.
    ~TempDir();
    TempDir(const TempDir&) = delete;
    TempDir& operator=(const TempDir&) = delete;

    // Makes it in parent(). Called once, before the process has threads. False, with errno, on
    // failure.
    bool create();
    const std::string& path() const { return m_path; }

    static std::string parent();  // TMPDIR, or /tmp
    // An empty file in parent() that has no name any more, to be written and read; or -1.
    static int open_file();

private:
    std::string m_path;
    pid_t m_remover = -1;
    int m_lifeline = -1;  // the remover sees it close
};

#endif  // KESTLOG_TEMPDIR_H_
