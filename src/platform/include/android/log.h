// SPDX-License-Identifier: Apache-2.0
// The platform's log interface. On this host a message is one line on standard
// error: "E/<tag>(<pid>): <text>", written by a single write() so that lines of
// several threads and processes never mix.
#ifndef PLATFORM_ANDROID_LOG_H_
#define PLATFORM_ANDROID_LOG_H_

typedef enum android_LogPriority {
    ANDROID_LOG_UNKNOWN = 0,
    ANDROID_LOG_DEFAULT,
    ANDROID_LOG_VERBOSE,
    ANDROID_LOG_DEBUG,
    ANDROID_LOG_INFO,
    ANDROID_LOG_WARN,
    ANDROID_LOG_ERROR,
    ANDROID_LOG_FATAL,
    ANDROID_LOG_SILENT
} android_LogPriority;

#ifdef __cplusplus
extern "C" {
#endif

// Logs one message. The line ends in exactly one line feed, however many the text
// ends in; a text too long for one line buffer (8 KiB) is cut. Allocates nothing,
// may be called from any thread and leaves errno as it was. Returns the number of
// bytes written or a negative errno.
int __android_log_print(int prio, const char* tag, const char* fmt, ...)
    __attribute__((format(printf, 3, 4)));

#ifdef __cplusplus
}
#endif

#endif  // PLATFORM_ANDROID_LOG_H_
