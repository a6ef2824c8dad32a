// SPDX-License-Identifier: Apache-2.0
// The one loop over the entries of a directory.
#ifndef STORAGE_DIR_ENTRIES_H_
#define STORAGE_DIR_ENTRIES_H_

#include <dirent.h>
#include <errno.h>
#include <fcntl.h>
#include <string.h>
#include <sys/stat.h>
#include <utils/String8.h>

// What for_each_entry returns when there are entries that could not be read or looked at.
constexpr int SOME_LEFT_OUT = 1;

// A directory whose scan left something out is scanned again once in this many times that somebody
// asks whether it is empty: on a dying medium each scan may take long to fail.
constexpr unsigned int ASKED_PER_SCAN = 16;

// Calls visit(name, st) for each entry other than "." and "..", in the file system's order.
// st (struct stat) is the entry's own: links are not followed, so that one on a card does not
// lead out of the tree. 0, SOME_LEFT_OUT, or -1 when the directory cannot be opened.
template <typename Visit>
int for_each_entry(const android::String8& path, Visit visit) {
    DIR* dir = opendir(path.string());
    if (!dir) {
        return -1;
    }
    int result = 0;
    errno = 0;
    while (const struct dirent* entry = readdir(dir)) {
        struct stat st;
        if (strcmp(entry->d_name, ".") != 0 && strcmp(entry->d_name, "..") != 0) {
            if (fstatat(dirfd(dir), entry->d_name, &st, AT_SYMLINK_NOFOLLOW) == 0) {
                visit(static_cast<const char*>(entry->d_name), st);
            } else if (errno != ENOENT) {  // deleted by somebody
                result = SOME_LEFT_OUT;
            }
        }
        errno = 0;
    }
    if (errno != 0) {
        result = SOME_LEFT_OUT;
    }
    closedir(dir);
    return result;
}

#endif  // STORAGE_DIR_ENTRIES_H_
