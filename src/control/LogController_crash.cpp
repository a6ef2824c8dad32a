// SPDX-License-Identifier: Apache-2.0
// The part of LogController that saves what tells of a crash: the mini dump of the CP and
// the records of the inter-processor communication driver.
#include "control/LogController.h"
#include "core/SavedErrno.h"
#include "core/log.h"
#include "core/system_paths.h"
#include "storage/CpStorage.h"

namespace {

// The result of the copy, with its errno.
int copy_and_close(LogFile* file, const char* source) {
    const int result = file->copy(system_path(source).string());
    const SavedErrno copy_errno;
    file->close();
    return result;
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
    LogFile* file = storage->create_file(name, LT_MINI_DUMP, media);
    if (!file) {
        err_log("create mini dump file %s failed", name.string());
        return -1;
    }
    const int result = copy_and_close(file, cp_mini_dump_path(type));
    if (result < 0) {
        err_log("save mini dump error");
        file->discard();
    }
    return result;
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
        LogFile* file = storage->create_file(name, LT_IPC_INFO);
        if (!file) {
            continue;
        }
        if (copy_and_close(file, source.path) != 0) {
            err_log("kestcp: save DIPX %s info failed", source.record);
            file->discard();
            result = -1;
        }
    }
    return result;
}
