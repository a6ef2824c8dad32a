// SPDX-License-Identifier: Apache-2.0
// The scenes of the demo, each a function that plays on the stage in its own words: what
// is done, what is seen, what is checked. A scene leaves everything as it found it, so
// that scenes can be taken out, put in and moved in the list (Demo.cpp), and played again.
#ifndef SIM_SCENES_SCENES_H_
#define SIM_SCENES_SCENES_H_

class DemoStage;

// control_scenes.cpp
void play_control(DemoStage& stage);
// sd_scenes.cpp
void play_sd_inserted(DemoStage& stage);
void play_sd_removed(DemoStage& stage);
// retrieval_scenes.cpp
void play_retrieval(DemoStage& stage);
// crash_scenes.cpp
void play_modem_crash(DemoStage& stage);
void play_wcn_crash(DemoStage& stage);
// parsing_scenes.cpp
void play_parsing_library(DemoStage& stage);
void play_new_firmware(DemoStage& stage);
// dsp_scenes.cpp
void play_audio_dsp(DemoStage& stage);
// iq_scenes.cpp: raises the internal medium's quota for good, the captures have to fit
void play_iq_capture(DemoStage& stage);

#endif  // SIM_SCENES_SCENES_H_
