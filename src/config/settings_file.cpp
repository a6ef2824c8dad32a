// SPDX-License-Identifier: Apache-2.0

#include "config/settings_file.h"

#include <errno.h>
#include <fcntl.h>
#include <stddef.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include "core/SavedErrno.h"
#include "core/log.h"
#include "core/open_file.h"
#include "storage/copy_file.h"

using android::String8;

namespace {

// A copy that was cut ends where a block of the medium or a page of memory does. None is
// smaller.
const off_t BLOCK_SIZE = 1024;

// The most that is written over with a comment. A longer file is none that the service would
// write.
const size_t MAX_PADDED_SIZE = 65536;

// Lines of a comment, so that text is len long. Wherever a page ends it is in such a line, and
// the rest of an old line that may follow there belongs to the comment.
void append_comment(String8& text, size_t len) {
    const size_t line_len = 64;
    while (text.length() < len) {
        text.append(text.length() % line_len == 0 ? "\n" : "#");
    }
}

void append_blank_lines(String8& text, size_t len) {
    while (text.length() < len) {
        text.append("\n");
    }
}

int write_at(int fd, const String8& text, off_t at) {
    const char* data = text.string();
    size_t left = text.length();
    while (left > 0) {
        const ssize_t n = pwrite(fd, data, left, at);
        if (n <= 0) {
            return -1;
        }
        data += n;
        at += n;
        left -= static_cast<size_t>(n);
    }
    return 0;
}

// First room is made by blank lines at the end, which fails on a full medium and leaves the
// old settings. Then nothing but blocks that the file has is written to. The one write takes
// all of the old text away, not only as much as the new one is long: lines of both must not
// stand in one file. Cutting the comment off comes last.
int replace_content(int fd, const String8& text) {
    struct stat st;
    if (fstat(fd, &st) < 0) {
        return -1;
    }
    const size_t old_len = static_cast<size_t>(st.st_size);
    String8 room;
    String8 content(text);
    if (old_len > text.length()) {
        append_comment(content, old_len < MAX_PADDED_SIZE ? old_len : MAX_PADDED_SIZE);
    } else if (old_len > 0) {
        append_blank_lines(room, text.length() - old_len);
    }
    if (write_at(fd, room, st.st_size) < 0 || write_at(fd, content, 0) < 0) {
        const SavedErrno write_errno;
        if (old_len < text.length() && ftruncate(fd, st.st_size) < 0) {
            // Blank lines stay.
        }
        return -1;
    }
    return ftruncate(fd, static_cast<off_t>(text.length()));
}

// Whether the rest of one file is how the other goes on.
bool begins_like(int whole_fd, int part_fd) {
    char whole[1024];
    char part[sizeof(whole)];
    for (;;) {
        const ssize_t n = read(part_fd, part, sizeof(part));
        if (n <= 0) {
            return n == 0;
        }
        if (read(whole_fd, whole, static_cast<size_t>(n)) != n ||
            memcmp(whole, part, static_cast<size_t>(n)) != 0) {
            return false;
        }
    }
}

// Whether the file at path is the beginning of the default, with a length that is a
// multiple of unit.
bool is_cut_default(const char* path, const char* default_path, off_t unit) {
    const int fd = open_to_read(path, Links::REFUSE);
    const int default_fd = open_to_read(default_path, Links::FOLLOW);
    struct stat st;
    struct stat default_st;
    const bool cut = fd >= 0 && default_fd >= 0 && fstat(fd, &st) == 0 &&
                     fstat(default_fd, &default_st) == 0 && st.st_size < default_st.st_size &&
                     st.st_size % unit == 0 && begins_like(default_fd, fd);
    for (int opened : {fd, default_fd}) {
        if (opened >= 0) {
            close(opened);
        }
    }
    return cut;
}

// A default that cannot be read does not even begin the copy.
bool is_empty(const char* path) {
    struct stat st;
    return lstat(path, &st) == 0 && S_ISREG(st.st_mode) && st.st_size == 0;
}

}  // namespace

int put_settings(const char* path, const String8& text) {
    const int fd = open_to_write(path, O_RDWR | O_CREAT, Links::REFUSE);
    if (fd < 0) {
        return -1;
    }
    if (replace_content(fd, text) < 0) {
        const SavedErrno replace_errno;
        close(fd);
        return -1;
    }
    return close(fd);
}

bool is_unfinished_copy(const char* path, const char* default_path) {
    return is_cut_default(path, default_path, BLOCK_SIZE);
}

void copy_default_settings(const char* default_path, const char* path) {
    const bool was_empty = is_empty(path);
    if (copy_file(default_path, path) == 0) {
        return;
    }
    // What could not be opened for the copy is not the copy's to delete.
    const int error = errno;
    const bool emptied = !was_empty && is_empty(path);
    if ((emptied || is_cut_default(path, default_path, 1)) && unlink(path) == 0) {
        errno = error;
        err_log("incomplete copy %s deleted", path);
    }
}
