// SPDX-License-Identifier: Apache-2.0
// The part of LogController that saves what tells of a crash: the mini dump of the CP and
// the records of the inter-processor communication driver.
#include "control/LogController.h"
#include "core/SavedErrno.h"
#include "core/log.h"
#include "core/system_paths.h"
#include "storage/CpStorage.h"

namespace {

enum SaveResult { SAVED, NO_FILE, NO_COPY };

// Copies the source into a new file. Crash material has no next write: when the medium does not
// take it, it is tried again, with room made or on the other medium. errno is the reason.
SaveResult save_copy(CpStorage* storage, const android::String8& name, LogType type,
                     MediaType media_type, const char* source) {
    for (CpStorage::Tries tries;;) {
        LogFile* file = storage->create_file(name, type, media_type);
        if (!file) {
            return tries.failed == 0 ? NO_FILE : NO_COPY;
        }
        const int result = file->copy(system_path(source).string());
        if (result == 0) {
            file->close();
            return SAVED;
        }
        const SavedErrno copy_errno;
        const bool again = result == LogFile::NOT_TAKEN && storage->try_again(file->media(), tries);
        file->discard();
        if (!again) {
            return NO_COPY;
        }
    }
}

}  // namespace

int LogController::save_mini_dump(CpStorage* storage, const tm& time, CpType type) {
    const android::String8 name =
        android::String8::format("mini_dump_%s.bin", LogTime::from_tm(time).file_stamp().string());
    const MediaType media = m_config->md_int_stor() ? MT_INTERNAL : MT_NONE;
    if (storage->check_quota(media) < 0) {
        err_log("no space for mini dump");
        return -1;
    }
    switch (save_copy(storage, name, LT_MINI_DUMP, media, cp_mini_dump_path(type))) {
        case NO_FILE:
            err_log("create mini dump file %s failed", name.string());
            return -1;
        case NO_COPY:
            err_log("save mini dump error");
            return -1;
        default:
            return 0;
    }
}

int LogController::save_dipx_dump(CpStorage* storage, const tm& time) {
    const android::String8 stamp = LogTime::from_tm(time).file_stamp();
    const struct {
        const char* record;
        const char* path;
    } sources[] = {
        {"smsg", PATH_DIPX_SMSG}, {"sbuf", PATH_DIPX_SBUF}, {"sblock", PATH_DIPX_SBLOCK}};
    int result = 0;
    for (const auto& source : sources) {
        const android::String8 name =
            android::String8::format("%s_%s.log", source.record, stamp.string());
        if (save_copy(storage, name, LT_IPC_INFO, MT_NONE, source.path) == NO_COPY) {
            err_log("kestcp: save DIPX %s info failed", source.record);
            result = -1;
        }
    }
    return result;
}
