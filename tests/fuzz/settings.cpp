// SPDX-License-Identifier: Apache-2.0
// The settings file: whatever was read can be written, and what was written is read back
// without a complaint but of limits of 0, and to the same settings; kestctl's reader takes
// every line as the service does. And the general logger's file, of the same kind of lines:
// only the CPs known to it come out, off without the global switch, in the order and number
// of the file.
#include <filesystem>
#include <vector>

#include "config/KestConfig.h"
#include "config/LogConfig.h"
#include "core/system_paths.h"
#include "fuzz/fuzz.h"
#include "kestctl/SettingsFile.h"
#include "sim/files.h"
#include "support/TestRoot.h"

namespace {

struct Handset {
    Handset() {
        // So that reading has nothing to complain of but the file.
        root.set_prop("persist.modem.w.enable", "1");
        root.set_prop("persist.storage.type", "1");
        setenv("EXTERNAL_STORAGE", root.path("sdcard").c_str(), 1);
        std::filesystem::create_directories(std::filesystem::path(file.path).parent_path());
    }
    TestRoot root;
    FuzzFile file{system_path(PATH_CONFIG_FILE).string()};
};

FileSettings read_settings() {
    FileSettings settings;
    std::string reason;
    FUZZ_CHECK(settings.read(&reason) && reason.empty());
    return settings;
}

// The file is saved again, by the service.
void check_settings(const Handset& handset) {
    const FileSettings settings = read_settings();
    LogConfig config(handset.file.path.c_str());
    FUZZ_CHECK(fuzz_read(config) == 0 && !config.dirty());
    FUZZ_CHECK(settings.md == config.save_md());
    for (const LogConfig::ConfigEntry* entry : config.stream_entries()) {
        // Found by its type, so there is only one.
        FUZZ_CHECK(config.find_stream(entry->type) == entry);
    }
    FUZZ_CHECK(config.save() == 0 && !config.dirty());
    const FileSettings saved = read_settings();
    FUZZ_CHECK(saved.md == settings.md);
    for (int cp = 0; cp < CP_TYPE_NUM; ++cp) {
        const std::string& iq = settings.iq[cp];
        FUZZ_CHECK(iq.empty() || iq == "GSM" || iq == "WCDMA" || iq == "GSM WCDMA");
        FUZZ_CHECK((iq.find("WCDMA") != std::string::npos) ==
                   config.wcdma_iq_enabled(static_cast<CpType>(cp)));
        FUZZ_CHECK(saved.iq[cp] == iq);
    }
}

void check_saved_settings(const Handset& handset) {
    const std::string saved = read_text_file(handset.file.path);
    LogConfig back(handset.file.path.c_str());
    LogCapture log;
    FUZZ_CHECK(fuzz_read(back) == 0);
    const int zeros =
        (back.log_file_size() << 20 == 0) + (back.data_log_size() == 0) + (back.sd_log_size() == 0);
    FUZZ_CHECK(log.count("\n") == static_cast<size_t>(zeros));
    FUZZ_CHECK(back.save() == 0 && read_text_file(handset.file.path) == saved);
}

typedef std::vector<std::pair<CpType, bool>> Entries;

Entries read_foreign(const FuzzFile& file, const std::string& text) {
    file.write(text);
    KestConfig config;
    FUZZ_CHECK(config.read_config(file.path.c_str()) == 0);
    Entries entries;
    for (const KestConfig::StreamEntry* entry : config.stream_entries()) {
        entries.emplace_back(entry->type, entry->enable);
    }
    return entries;
}

void check_foreign(const FuzzFile& file, const std::string& text) {
    const Entries entries = read_foreign(file, text);
    const Entries switched_on = read_foreign(file, "enable\n" + text);
    FUZZ_CHECK(switched_on.size() == entries.size());
    for (size_t i = 0; i < entries.size(); ++i) {
        const CpType type = entries[i].first;
        FUZZ_CHECK(type >= CT_WCDMA && type <= CT_GNSS && switched_on[i].first == type);
        // On only by the global switch, which then is on for all.
        FUZZ_CHECK(!entries[i].second || entries == switched_on);
    }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    static const Handset handset;
    const std::string text = fuzz_text(data, size);
    handset.file.write(text);
    check_settings(handset);
    check_saved_settings(handset);
    check_foreign(handset.file, text);
    return 0;
}
