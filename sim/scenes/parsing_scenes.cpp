// SPDX-License-Identifier: Apache-2.0
// The database that the modem's logs are decoded with lies beside them, on each medium, and
// follows the modem's firmware.
#include "sim/DemoStage.h"
#include "sim/scenes/scenes.h"

namespace {

void check_saved(DemoStage& stage, const SimModemImage& image, const std::string& medium_name) {
    for (const LogCollector::Medium& medium : stage.logs().media()) {
        if (medium.name == medium_name) {
            stage.check(stage.wait_until([&] { return image.saved_in(medium.log_root); }, 3),
                        "modem_db.gz, " + std::to_string(image.database().size()) +
                            " bytes, and sha1.txt (" + image.digest_text().substr(0, 8) +
                            "...) are on the medium: " + medium_name);
        }
    }
}

}  // namespace

void play_parsing_library(DemoStage& stage) {
    stage.say("Beside the logs lies what the modem's firmware brings to decode them");
    check_saved(stage, stage.modem_image(), "internal");
    if (stage.options().sd) {
        check_saved(stage, stage.modem_image(), "SD card");
    }
}

void play_new_firmware(DemoStage& stage) {
    stage.say("The modem gets another firmware and its log starts anew");
    const SimModemImage image(123456, 2, 0);
    stage.check(image.install(stage.handset(), "w"), "the image is in its partition");
    stage.expect("DISABLE_LOG WCDMA", "OK");
    stage.expect("ENABLE_LOG WCDMA", "OK");
    check_saved(stage, image, "internal");
}
