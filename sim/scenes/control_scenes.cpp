// SPDX-License-Identifier: Apache-2.0
// A client asks for settings and changes one.
#include "sim/DemoStage.h"
#include "sim/files.h"
#include "sim/scenes/scenes.h"

void play_control(DemoStage& stage) {
    const SimSizes& sizes = stage.handset().sizes();
    const std::string normal = std::to_string(sizes.log_file);
    const std::string changed = std::to_string(sizes.log_file + 1);
    stage.say("A client of the control socket asks and sets");
    stage.expect("GET_LOG_STATE WCDMA", "OK ON");
    stage.expect("GET_LOG_STATE TD", "OK OFF");
    stage.expect("GET_DATA_MAX_SIZE", "OK " + std::to_string(sizes.data));
    stage.expect("SET_LOG_FILE_SIZE " + changed + "MB", "ERROR 2");
    stage.expect("SET_LOG_FILE_SIZE " + changed, "OK");
    stage.expect("GET_LOG_FILE_SIZE", "OK " + changed);
    const std::string config =
        read_text_file(stage.handset().path("data/local/tmp/kestmodem/kest_modem.conf"));
    stage.check(config.find("log_file_size " + changed) != std::string::npos ||
                    config.find("log_file_size\t" + changed) != std::string::npos,
                "the settings file holds the new size");
    stage.expect("SET_LOG_FILE_SIZE " + normal, "OK");
}
