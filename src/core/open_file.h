// SPDX-License-Identifier: Apache-2.0
// Opening of files that somebody else may have put in place: settings, kernel records, what
// lies on a card. Where a regular file is expected there may be a FIFO, a device, a socket
// or a directory, and an ordinary open() of a FIFO waits for ever for its other end. These
// never wait, and refuse whatever has no end to read to.
#ifndef CORE_OPEN_FILE_H_
#define CORE_OPEN_FILE_H_

// Whether a link as the last part of the path is taken: a symbolic one and, for writing, a second
// name of a file (a hard link). Never where others than root may make files, on a card or below
// /data/local/tmp: it may be another file's.
enum class Links { FOLLOW, REFUSE };

// Opens a regular file or a partition (a block device or raw flash) for reading, with the blocking
// mode of an ordinary open. The descriptor, which the caller owns, or -1 with errno: EISDIR for a
// directory, EINVAL for a file of another kind, ELOOP for a link refused.
int open_to_read(const char* path, Links links);

// Opens a regular file for writing; flags are those of open() (O_RDWR or O_WRONLY, with
// O_CREAT, O_TRUNC and so on), a file made has mode 0644. Result as above; ENXIO or EINVAL
// for a FIFO, EMLINK for a second name refused.
int open_to_write(const char* path, int flags, Links links);

#endif  // CORE_OPEN_FILE_H_
