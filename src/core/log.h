// SPDX-License-Identifier: Apache-2.0
// Diagnostics of the whole service. Every message begins with the full signature
// of the function that logs it; a message about a failure ends with errno and its
// text. Both macros give one line at error priority under the tag "KESTCP" and
// leave errno as it was.
#ifndef CORE_LOG_H_
#define CORE_LOG_H_

#include <android/log.h>
#include <errno.h>
#include <string.h>

#define KEST_LOG_TAG "KESTCP"

// An event that is worth a line: info_log("CP %s dev %s", name, path).
#define info_log(fmt, ...)                                                                         \
    do {                                                                                           \
        const int kest_saved_errno_ = errno;                                                       \
        __android_log_print(ANDROID_LOG_ERROR, KEST_LOG_TAG, "%s: " fmt "\n", __PRETTY_FUNCTION__, \
                            ##__VA_ARGS__);                                                        \
        errno = kest_saved_errno_;                                                                 \
    } while (0)

// A failure: as info_log, with " [errno(text)]" at the end.
#define err_log(fmt, ...)                                                              \
    do {                                                                               \
        const int kest_saved_errno_ = errno;                                           \
        __android_log_print(ANDROID_LOG_ERROR, KEST_LOG_TAG, "%s: " fmt " [%d(%s)]\n", \
                            __PRETTY_FUNCTION__, ##__VA_ARGS__, kest_saved_errno_,     \
                            strerror(kest_saved_errno_));                              \
        errno = kest_saved_errno_;                                                     \
    } while (0)

#endif  // CORE_LOG_H_
