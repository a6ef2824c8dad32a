// SPDX-License-Identifier: Apache-2.0
// kestlog report.
#include <errno.h>
#include <stdio.h>

#include "common/text.h"
#include "kestlog/CardReport.h"
#include "kestlog/Commands.h"
#include "kestlog/ExitStatus.h"
#include "kestlog/OutputFile.h"
#include "kestlog/Progress.h"
#include "kestlog/ReportPage.h"
#include "kestlog/TreeInput.h"
#include "kestlog/option_numbers.h"

namespace {

bool read_options(const CommandLine& line, ReportOptions* options, int* status) {
    options->whole = !line.has("since");
    if (line.has("iq-rate") != line.has("iq-format")) {
        *status = line.usage_error("--iq-rate and --iq-format need each other");
        return false;
    }
    if (line.has("pcm-rate") != line.has("pcm-format") ||
        (line.has("pcm-channels") && !line.has("pcm-rate"))) {
        *status = line.usage_error("--pcm-rate and --pcm-format need each other");
        return false;
    }
    if (line.has("iq-rate")) {
        options->iq = iq_format(line.value("iq-format", ""));
        if (!check_word(line, "iq-format", iq_format_names(), status) ||
            !read_hertz(line, "iq-rate", true, &options->iq_rate, status)) {
            return false;
        }
    }
    uint64_t channels = 1;
    if (line.has("pcm-rate")) {
        options->pcm = pcm_format(line.value("pcm-format", ""));
        if (!check_word(line, "pcm-format", pcm_format_names(), status) ||
            !read_hertz(line, "pcm-rate", true, &options->pcm_rate, status) ||
            !read_whole(line, "pcm-channels", 1, Waveform::MAX_CHANNELS, &channels, status)) {
            return false;
        }
    }
    options->pcm_channels = static_cast<size_t>(channels);
    return true;
}

}  // namespace

int run_report(const CommandLine& line) {
    const bool json = line.has("json");
    if (!json && !line.has("output")) {
        return line.usage_error("-o FILE is missing");
    }
    ReportOptions options;
    LogTree tree;
    int status;
    if (!read_options(line, &options, &status) || !open_tree(line, &tree, &status)) {
        return status;
    }
    // Before the work: it may not be possible.
    OutputFile out;
    if (!out.open(line.value("output", "-"), line.has("force"))) {
        return out.failed();
    }
    const Progress progress(tree.size());
    CardReport report(tree, options);
    report.set_roots(line.params());
    const std::string text =
        json ? report.json().dump(-1, ' ', true) + "\n" : report_page(report.json());
    if (!out.write(text.data(), text.size()) || !out.close()) {
        return out.failed();
    }
    if (!json && line.value("output", "-") != "-") {
        Progress::clear();
        printf("%s: %s\n", escape_text(out.path()).c_str(), report.words().c_str());
    }
    if (options.iq && report.json()["spectra"].empty()) {
        failure(ES_OK, "no I/Q captures to show");
    }
    if (options.pcm && report.json()["waveforms"].empty()) {
        failure(ES_OK, "no PCM chunks to show");
    }
    return report.status();
}
