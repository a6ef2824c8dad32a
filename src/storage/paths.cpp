// SPDX-License-Identifier: Apache-2.0

#include "storage/paths.h"

#include <errno.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include <vector>

#include "storage/dir_entries.h"

namespace {

constexpr char RM[] = "rm -fr ";
// One more path is added below this length; Linux takes 128 KiB.
constexpr size_t MAX_COMMAND = 65536;

bool is_ordinary(char c) {
    return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') ||
           strchr("/._-+,:@%=", c);
}

// The paths of the entries whose name begins with a digit.
std::vector<android::String8> numbered_entries(const android::String8& dir) {
    std::vector<android::String8> paths;
    for_each_entry(dir, [&](const char* name, const struct stat& /*st*/) {
        if (name[0] >= '0' && name[0] <= '9') {
            paths.emplace_back(JoinedPath(dir, android::String8(name)).string());
        }
    });
    return paths;
}

}  // namespace

JoinedPath::JoinedPath(const android::String8& dir, const android::String8& name) {
    const size_t dir_len = dir.length();
    const size_t name_len = name.length();
    if (dir_len + 1 + name_len >= sizeof(m_path)) {
        m_path[0] = '\0';
        return;
    }
    memcpy(m_path, dir.string(), dir_len);
    m_path[dir_len] = '/';
    memcpy(m_path + dir_len + 1, name.string(), name_len + 1);
}

android::String8 shell_path(const android::String8& path) {
    const char* text = path.string();
    android::String8 result;
    if (text[0] == '-') {
        result.append("./");
    }
    bool ordinary = true;
    for (const char* p = text; *p && ordinary; ++p) {
        ordinary = is_ordinary(*p);
    }
    if (ordinary) {
        result.append(text);
        return result;
    }
    result.append("'");
    for (const char* p = text; *p; ++p) {
        // A quote cannot stand inside quotes: close them, add it escaped, open again.
        if (*p == '\'') {
            result.append("'\\''");
        } else {
            result.append(p, 1);
        }
    }
    result.append("'");
    return result;
}

int remove_tree(const android::String8& path) {
    // A shell for each of many empty sets would hold the loop for a minute.
    if (rmdir(path.string()) == 0) {
        return 0;
    }
    android::String8 command(RM);
    command.append(shell_path(path));
    return system(command.string());
}

int remove_numbered_entries(const android::String8& dir) {
    android::String8 command(RM);
    command.append(shell_path(dir));
    command.append("/[0-9]*");
    int result = system(command.string());
    if (result == 0) {
        return 0;
    }
    // rm is not started at all where there are more names than the system passes to a program.
    const std::vector<android::String8> left = numbered_entries(dir);
    for (size_t i = 0; i < left.size();) {
        command.setTo(RM);
        do {
            command.append(shell_path(left[i++]));
            command.append(" ");
        } while (i < left.size() && command.length() < MAX_COMMAND);
        const int status = system(command.string());
        result = status != 0 ? status : result;
    }
    return left.empty() || !numbered_entries(dir).empty() ? result : 0;
}

bool is_link(const android::String8& path) {
    struct stat st;
    if (lstat(path.string(), &st) < 0 || !S_ISLNK(st.st_mode)) {
        return false;
    }
    errno = ELOOP;
    return true;
}

int make_log_dir(const android::String8& path, Links links) {
    if (mkdir(path.string(), 0775) == 0) {
        return 0;
    }
    return errno == EEXIST && (links == Links::FOLLOW || !is_link(path)) ? 0 : -1;
}

bool means_vanished(int error) {
    switch (error) {
        case ENOENT:
        case ENOTDIR:
        case EACCES:
        case EROFS:
        case ELOOP:
            return true;
        default:
            return false;
    }
}

bool dir_usable(const android::String8& path, Links links) {
    return (links == Links::FOLLOW || !is_link(path)) &&
           (access(path.string(), R_OK | W_OK | X_OK) == 0 || !means_vanished(errno));
}

int rename_to_free_name(const char* old_path, const char* new_path) {
    struct stat st;
    if (lstat(new_path, &st) == 0) {
        errno = EEXIST;
        return -1;
    }
    if (errno != ENOENT) {
        return -1;
    }
    return rename(old_path, new_path);
}
