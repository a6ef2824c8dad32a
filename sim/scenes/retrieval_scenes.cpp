// SPDX-License-Identifier: Apache-2.0
// A client fetches the modem's ring buffer and sleep log while the modem goes on logging.
#include "sim/DemoStage.h"
#include "sim/scenes/scenes.h"

namespace {

void fetch(DemoStage& stage, SimDiagResponder::Exchange exchange, const char* request,
           const char* kind) {
    SimCp& cp = stage.modem();
    SimDiagResponder::Plan plan;
    plan.mode = stage.unhurried() ? SimDiagResponder::SLOW : SimDiagResponder::ANSWER;
    plan.size = 100000;
    stage.modem_diag().set_plan(exchange, plan);
    const std::string prefix = cp.name + "_" + kind + "_";
    const auto earlier = stage.files(cp, prefix, ".log");
    if (stage.expect(request, "OK", 10)) {
        stage.check_new_file(cp, prefix, ".log", earlier,
                             stage.modem_diag().file_content(exchange));
    }
}

}  // namespace

void play_retrieval(DemoStage& stage) {
    const std::string prefix = stage.modem().name + "_ringbuf_";
    stage.set_quotas(false);
    stage.say("The modem refuses a request");
    const auto earlier = stage.files(stage.modem(), prefix, ".log");
    SimDiagResponder::Plan plan;
    plan.mode = SimDiagResponder::REFUSE;
    stage.modem_diag().set_plan(SimDiagResponder::RING_BUFFER, plan);
    stage.expect("SAVE_RINGBUF WCDMA", "ERROR 7");
    stage.check(stage.files(stage.modem(), prefix, ".log") == earlier, "no file is left of it");

    stage.say("The client fetches the modem's ring buffer and its sleep log");
    fetch(stage, SimDiagResponder::RING_BUFFER, "SAVE_RINGBUF WCDMA", "ringbuf");
    fetch(stage, SimDiagResponder::SLEEP_LOG, "SAVE_SLEEP_LOG WCDMA", "sleeplog");
    stage.set_quotas(true);
}
