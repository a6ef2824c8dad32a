// SPDX-License-Identifier: Apache-2.0

#include "core/system_paths.h"

#include <stdlib.h>

#include "platform/env_root.h"

android::String8 system_path(const char* path) {
    const char* root = getenv(ENV_ROOT);
    android::String8 result(root ? root : "");
    result.append(path);
    return result;
}
