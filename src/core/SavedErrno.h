// SPDX-License-Identifier: Apache-2.0
// Keeps errno across clean-up: what a scope does after it has made one of these does not
// change the errno that its caller sees.
#ifndef CORE_SAVEDERRNO_H_
#define CORE_SAVEDERRNO_H_

#include <errno.h>

class SavedErrno {
public:
    SavedErrno() : m_errno(errno) {}
    ~SavedErrno() { errno = m_errno; }
    SavedErrno(const SavedErrno&) = delete;
    SavedErrno& operator=(const SavedErrno&) = delete;

private:
    const int m_errno;
};

#endif  // CORE_SAVEDERRNO_H_
