// SPDX-License-Identifier: Apache-2.0
// kestlog report.
#include <errno.h>
#include <stdio.h>
#include <stdlib.h>

#include <cmath>

#include "common/text.h"
#include "kestlog/CardReport.h"
#include "kestlog/Commands.h"
#include "kestlog/ExitStatus.h"
#include "kestlog/OutputFile.h"
#include "kestlog/Progress.h"
#include "kestlog/ReportPage.h"
#include "kestlog/TreeInput.h"

namespace {

// A number above 0.
bool read_number(const CommandLine& line, const char* option, double* value, int* status) {
    const std::string text = line.value(option, "");
    char* end;
    *value = strtod(text.c_str(), &end);
    if (text.empty() || *end || !std::isfinite(*value) || *value <= 0) {
        *status = line.usage_error("--" + std::string(option) + ": '" + text +
                                   "' is not a number above 0");
        return false;
    }
    return true;
}

bool read_format(const CommandLine& line, const char* option, const SampleFormat* format,
                 const std::string& names, int* status) {
    if (!format) {
        *status = line.usage_error("--" + std::string(option) + ": '" + line.value(option, "") +
                                   "' is none of " + names);
    }
    return format != nullptr;
}

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
        if (!read_format(line, "iq-format", options->iq, iq_format_names(), status) ||
            !read_number(line, "iq-rate", &options->iq_rate, status)) {
            return false;
        }
    }
    double channels = 1;
    if (line.has("pcm-rate")) {
        options->pcm = pcm_format(line.value("pcm-format", ""));
        if (!read_format(line, "pcm-format", options->pcm, pcm_format_names(), status) ||
            !read_number(line, "pcm-rate", &options->pcm_rate, status) ||
            (line.has("pcm-channels") && !read_number(line, "pcm-channels", &channels, status))) {
            return false;
        }
    }
    if (channels > static_cast<double>(Waveform::MAX_CHANNELS) ||
        channels != std::floor(channels)) {
        *status = line.usage_error("--pcm-channels: a number from 1 to " +
                                   std::to_string(Waveform::MAX_CHANNELS));
        return false;
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
    return report.status();
}
