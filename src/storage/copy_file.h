// SPDX-License-Identifier: Apache-2.0
// Copying of whole files by path; used to put the default settings in place.
#ifndef STORAGE_COPY_FILE_H_
#define STORAGE_COPY_FILE_H_

// Copies the whole file src to dst, which is created with mode 0644 or truncated, but is no
// link (Links::REFUSE). Both paths are used as given. 0, or -1 with errno: what cannot be opened,
// or is no regular file, is logged; after a read or write error, which is not, the part already
// written stays in dst. Not reentrant (static buffer).
int copy_file(const char* src, const char* dst);

#endif  // STORAGE_COPY_FILE_H_
