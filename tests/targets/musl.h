// SPDX-License-Identifier: Apache-2.0
// Included before everything: what the headers of libstdc++, which were configured for the GNU
// C library, expect of that and musl does not have. None of it is anything the service calls.
#ifndef TARGETS_MUSL_H_
#define TARGETS_MUSL_H_

#define __GLIBC_PREREQ(major, minor) 0
#define __locale_t locale_t

#include <pthread.h>
#include <time.h>

// Declared only: the service has no locks with a time-out.
extern "C" int pthread_mutex_clocklock(pthread_mutex_t*, clockid_t, const struct timespec*);
extern "C" int pthread_cond_clockwait(pthread_cond_t*, pthread_mutex_t*, clockid_t,
                                      const struct timespec*);

#endif  // TARGETS_MUSL_H_
