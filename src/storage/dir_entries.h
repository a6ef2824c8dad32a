// SPDX-License-Identifier: Apache-2.0
// The one loop over the entries of a directory.
#ifndef STORAGE_DIR_ENTRIES_H_
#define STORAGE_DIR_ENTRIES_H_

#include <dirent.h>
#include <fcntl.h>
#include <string.h>
#include <sys/stat.h>
#include <utils/String8.h>

// Calls visit(name, st) for each entry other than "." and "..", in the file system's order.
// st (struct stat) is the entry's own: links are not followed, so that one on a card does not
// lead out of the tree. An entry that cannot be looked at is left out. 0, or -1 when the
// directory cannot be opened.
template <typename Visit>
int for_each_entry(const android::String8& path, Visit visit) {
    DIR* dir = opendir(path.string());
    if (!dir) {
        return -1;
    }
    while (const struct dirent* entry = readdir(dir)) {
        struct stat st;
        if (strcmp(entry->d_name, ".") != 0 && strcmp(entry->d_name, "..") != 0 &&
            fstatat(dirfd(dir), entry->d_name, &st, AT_SYMLINK_NOFOLLOW) == 0) {
            visit(static_cast<const char*>(entry->d_name), st);
        }
    }
    closedir(dir);
    return 0;
}

#endif  // STORAGE_DIR_ENTRIES_H_
