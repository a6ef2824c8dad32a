// SPDX-License-Identifier: Apache-2.0
// A log channel as the storage and the I/Q capture know it: something that is called back
// when a file is made, and whose name is that of its CP's directory and files.
#ifndef STORAGE_CPCHANNEL_H_
#define STORAGE_CPCHANNEL_H_

#include <utils/String8.h>

#include "core/FdHandler.h"

class CpChannel : public FdHandler {
public:
    using FdHandler::FdHandler;

    // The CP's name, for the life of the channel.
    virtual const android::String8& name() const = 0;
};

#endif  // STORAGE_CPCHANNEL_H_
