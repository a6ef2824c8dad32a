// SPDX-License-Identifier: Apache-2.0

#include <android/log.h>
#include <errno.h>
#include <fcntl.h>
#include <stdarg.h>
#include <stdio.h>
#include <unistd.h>

#include <algorithm>

namespace {

const size_t LINE_SIZE = 8192;

char priority_letter(int prio) {
    static const char letters[] = "??VDIWEF";
    return prio >= 0 && prio <= ANDROID_LOG_FATAL ? letters[prio] : '?';
}

// Length of what snprintf put into a buffer of size bytes.
size_t stored(int result, size_t size) {
    if (result < 0) {
        return 0;
    }
    const size_t len = static_cast<size_t>(result);
    return len < size ? len : size - 1;
}

// Whether a terminal would take the byte for a command. Names of files on a card may hold any.
bool is_control(char byte) {
    return (static_cast<unsigned char>(byte) < ' ' && byte != '\n' && byte != '\t') || byte == 0x7f;
}

// A program started with standard error closed would open some file or device in its
// place and log into that.
struct StandardError {
    StandardError() {
        while (fcntl(STDERR_FILENO, F_GETFD) < 0 && open("/dev/null", O_RDWR) >= 0) {
        }
    }
} keep_standard_error_open;

}  // namespace

int __android_log_print(int prio, const char* tag, const char* fmt, ...) {
    const int saved_errno = errno;
    char line[LINE_SIZE];
    size_t len = stored(snprintf(line, sizeof(line), "%c/%s(%d): ", priority_letter(prio),
                                 tag ? tag : "", static_cast<int>(getpid())),
                        sizeof(line));
    const size_t text_start = len;

    errno = saved_errno;  // for %m
    va_list args;
    va_start(args, fmt);
    len += stored(vsnprintf(line + len, sizeof(line) - len, fmt, args), sizeof(line) - len);
    va_end(args);
    while (len > text_start && line[len - 1] == '\n') {
        --len;
    }
    char* const control = std::find_if(line, line + len, is_control);
    if (control != line + len && isatty(STDERR_FILENO)) {
        std::replace_if(control, line + len, is_control, '?');
    }
    // The last byte of a full line was the terminating NUL, so this always fits.
    line[len++] = '\n';

    ssize_t written;
    do {
        written = write(STDERR_FILENO, line, len);
    } while (written < 0 && errno == EINTR);
    const int result = written < 0 ? -errno : static_cast<int>(written);
    errno = saved_errno;
    return result;
}
