// SPDX-License-Identifier: Apache-2.0
// The settings file: whatever was read can be written, and what was written is read
// back without a complaint but of limits of 0, and to the same settings.
#include <sstream>

#include "config/LogConfig.h"
#include "fuzz/fuzz.h"
#include "support/TestRoot.h"

namespace {

struct Surroundings {
    Surroundings() {
        // So that reading has nothing to complain of but the file.
        root.set_prop("persist.modem.w.enable", "1");
        root.set_prop("persist.storage.type", "1");
        setenv("EXTERNAL_STORAGE", root.path("sdcard").c_str(), 1);
    }
    TestRoot root;
    FuzzFile file;
    std::string text() const {
        std::ostringstream out;
        out << std::ifstream(file.path).rdbuf();
        return out.str();
    }
};

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    static const Surroundings around;
    around.file.write(fuzz_text(data, size));
    LogConfig config(around.file.path.c_str());
    FUZZ_CHECK(fuzz_read(config) == 0 && !config.dirty());
    FUZZ_CHECK(config.save() == 0 && !config.dirty());
    const std::string saved = around.text();

    LogConfig back(around.file.path.c_str());
    LogCapture log;
    FUZZ_CHECK(fuzz_read(back) == 0);
    const int zeros =
        (back.log_file_size() << 20 == 0) + (back.data_log_size() == 0) + (back.sd_log_size() == 0);
    FUZZ_CHECK(log.count("\n") == static_cast<size_t>(zeros));
    for (const LogConfig::ConfigEntry* entry : config.stream_entries()) {
        // Found by its type, so there is only one.
        FUZZ_CHECK(config.find_stream(entry->type) == entry);
    }
    FUZZ_CHECK(back.save() == 0 && around.text() == saved);
    return 0;
}
