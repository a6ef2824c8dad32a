// SPDX-License-Identifier: Apache-2.0
// The SD card comes and goes; the logs follow it.
#include "sim/DemoStage.h"
#include "sim/scenes/scenes.h"

void play_sd_inserted(DemoStage& stage) {
    if (stage.options().sd) {
        stage.say("SD card inserted");
        stage.check(stage.handset().insert_sd(), "the property says so");
        stage.check(stage.wait_until([&] { return stage.medium() == "SD card"; }, 5),
                    "the logs went over to the SD card");
    }
}

void play_sd_removed(DemoStage& stage) {
    if (stage.options().sd) {
        stage.say("SD card removed");
        stage.check(stage.handset().remove_sd(), "the property says so");
        stage.check(stage.wait_until([&] { return stage.medium() == "internal"; }, 5),
                    "the logs came back to the internal medium");
    }
}
