// SPDX-License-Identifier: Apache-2.0
// Paths of the log tree: joining without allocation, and the removal of directories.
#ifndef STORAGE_PATHS_H_
#define STORAGE_PATHS_H_

#include <limits.h>
#include <utils/String8.h>

#include "core/open_file.h"

// dir + "/" + name on the stack. A path that does not fit becomes "", which no file
// system call accepts.
class JoinedPath {
public:
    JoinedPath(const android::String8& dir, const android::String8& name);
    const char* string() const { return m_path; }

private:
    char m_path[PATH_MAX];
};

// The text that makes a shell read exactly this path as one argument. An ordinary
// path stands as it is; any other is quoted, and one that could be read as an option
// gets "./" in front.
android::String8 shell_path(const android::String8& path);

// Deletes a directory with everything below it: by rmdir when it is empty, else by a shell.
// 0, or what system() returns.
int remove_tree(const android::String8& path);

// Deletes every entry of the directory whose name begins with a digit, by a shell, or by several
// where there are too many for one. Result as above.
int remove_numbered_entries(const android::String8& dir);

// Whether the path names a symbolic link, which may lead out of the log tree: a directory of
// the tree that has become one is neither entered nor written to. Sets errno to ELOOP if so.
bool is_link(const android::String8& path);

// mkdir with mode 0775; 0 when the directory was made or something of this name exists
// already, else -1. A link that is not to be followed is not taken for the directory: ELOOP.
int make_log_dir(const android::String8& path, Links links = Links::REFUSE);

// True when this errno of a failed access means that the file or directory is not there any
// more, for us at least. Any other failure may be a passing one.
bool means_vanished(int error);

// False when the directory vanished: it is a link now that is not to be followed, or cannot be
// read, written and searched any more.
bool dir_usable(const android::String8& path, Links links = Links::REFUSE);

// rename() that never replaces anything: EEXIST when new_path exists. 0 or -1.
int rename_to_free_name(const char* old_path, const char* new_path);

#endif  // STORAGE_PATHS_H_
