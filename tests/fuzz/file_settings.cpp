// SPDX-License-Identifier: Apache-2.0
// kestctl's reader of the settings file takes every line as the service does: the same mini
// dump setting and I/Q types, from the file as it is and as the service writes it again.
#include <filesystem>

#include "config/LogConfig.h"
#include "core/system_paths.h"
#include "fuzz/fuzz.h"
#include "kestctl/SettingsFile.h"
#include "support/TestRoot.h"

namespace {

struct Handset {
    Handset() {
        const std::filesystem::path path = system_path(PATH_CONFIG_FILE).string();
        std::filesystem::create_directories(path.parent_path());
        std::filesystem::create_symlink(file.path, path);
    }
    TestRoot root;
    FuzzFile file;
};

FileSettings read_settings() {
    FileSettings settings;
    std::string reason;
    FUZZ_CHECK(settings.read(&reason) && reason.empty());
    return settings;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    static const Handset handset;
    handset.file.write(fuzz_text(data, size));
    const FileSettings settings = read_settings();
    LogConfig config(handset.file.path.c_str());
    FUZZ_CHECK(fuzz_read(config) == 0);
    FUZZ_CHECK(settings.md == config.save_md());
    FUZZ_CHECK(config.save() == 0);
    const FileSettings saved = read_settings();
    FUZZ_CHECK(saved.md == settings.md);
    for (int cp = 0; cp < CP_TYPE_NUM; ++cp) {
        const std::string& iq = settings.iq[cp];
        FUZZ_CHECK(iq.empty() || iq == "GSM" || iq == "WCDMA" || iq == "GSM WCDMA");
        FUZZ_CHECK((iq.find("WCDMA") != std::string::npos) ==
                   config.wcdma_iq_enabled(static_cast<CpType>(cp)));
        FUZZ_CHECK(saved.iq[cp] == iq);
    }
    return 0;
}
