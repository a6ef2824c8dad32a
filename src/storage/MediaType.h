// SPDX-License-Identifier: Apache-2.0
// The storage media.
#ifndef STORAGE_MEDIATYPE_H_
#define STORAGE_MEDIATYPE_H_

enum MediaType : int {
    MT_NONE = 0,      // no medium chosen yet; as an argument: the medium in use
    MT_INTERNAL = 1,  // internal data partition
    MT_EXTERNAL = 2   // external SD card
};

#endif  // STORAGE_MEDIATYPE_H_
