// SPDX-License-Identifier: Apache-2.0
// kestlog sigmf: a SigMF meta file for an I/Q capture. The capture stays as it is, a
// "non-conforming dataset" that core:dataset names, so that nothing large is copied.
#include <errno.h>
#include <stdio.h>

#include <algorithm>
#include <nlohmann/json.hpp>

#include "common/CommandLine.h"
#include "common/text.h"
#include "kestlog/Commands.h"
#include "kestlog/ExitStatus.h"
#include "kestlog/OutputFile.h"
#include "kestlog/Problems.h"
#include "kestlog/SampleFormat.h"
#include "kestlog/option_numbers.h"
#include "kestlog/small_files.h"

namespace {

constexpr char SIGMF_VERSION[] = "1.0.0";

struct Settings {
    std::string datatype;
    uint64_t sample_bytes;
    double rate;
    double frequency;
};

struct Capture {
    std::string path;
    FileName name;
    uint64_t size;
};

// The bytes of a sample, 0 when it is no datatype: a complex one, or a real one for an "r".
uint64_t sample_bytes(std::string datatype) {
    const bool real = datatype[0] == 'r';
    datatype[0] = real ? 'c' : datatype[0];
    const SampleFormat* const format = iq_format(datatype);
    return format ? (real ? 1 : 2) * format->bytes : 0;
}

bool read_settings(const CommandLine& line, Settings* settings, int* status) {
    settings->datatype = line.value("datatype", "");
    settings->sample_bytes = sample_bytes(settings->datatype);
    if (settings->sample_bytes == 0) {
        *status = line.usage_error("--datatype: give one of SigMF, such as ci16_le or cf32_le");
        return false;
    }
    for (const char* option : {"rate", "frequency"}) {
        if (!line.has(option)) {
            *status = line.usage_error("--" + std::string(option) + " is missing");
            return false;
        }
    }
    // No rate is 0, a frequency may be.
    return read_hertz(line, "rate", true, &settings->rate, status) &&
           read_hertz(line, "frequency", false, &settings->frequency, status);
}

// A whole number without a fraction.
Json number(double value) {
    const int64_t whole = static_cast<int64_t>(value);
    return static_cast<double>(whole) == value ? Json(whole) : Json(value);
}

// The version record of the CP beside the capture; "" when there is none.
std::string firmware_version(const Capture& capture, Problems* problems) {
    if (capture.name.cp().empty()) {
        return "";
    }
    const std::string dir = capture.path.substr(0, capture.path.rfind('/') + 1);
    const std::string path = version_path(dir, capture.name.cp());
    int error;
    const std::string version = read_version(path, &error);
    if (error && error != ENOENT) {
        problems->unreadable(path, error);
    }
    return version;
}

// A text as it is, if JSON can hold it.
Json own_text(const std::string& bytes) {
    const Json text = bytes;
    const bool utf8 = Json::parse(text.dump(-1, ' ', false, Json::error_handler_t::ignore)) == text;
    return utf8 ? text : Json(json_text(bytes));
}

Json make_meta(const Capture& capture, const Settings& settings, const std::string& firmware) {
    const FileName& name = capture.name;
    std::string description = "I/Q capture";
    Json global = {{"core:version", SIGMF_VERSION},
                   {"core:datatype", settings.datatype},
                   {"core:sample_rate", number(settings.rate)},
                   {"core:num_channels", 1},
                   {"core:dataset", own_text(name.text())}};
    if (const uint64_t rest = capture.size % settings.sample_bytes) {
        global["core:trailing_bytes"] = rest;
    }
    global["core:recorder"] = "kestmodem";
    if (!name.cp().empty()) {
        description += " of " + name.cp();
        global["core:hw"] =
            own_text(name.cp() + (firmware.empty() ? "" : ", firmware " + firmware));
    }
    // SigMF times are in UTC, and a name does not say the zone: so there is no core:datetime.
    if (has_time(name.time())) {
        description += ", begun to be saved at " + time_text(name.time()) +
                       " local time of the handset (its time zone is not known)";
    }
    global["core:description"] = description;
    return {
        {"global", global},
        {"captures",
         Json::array({{{"core:sample_start", 0}, {"core:frequency", number(settings.frequency)}}})},
        {"annotations", Json::array()}};
}

void print_result(const Problems& problems, const Capture& capture, const Settings& settings,
                  const OutputFile& out) {
    const uint64_t samples = capture.size / settings.sample_bytes;
    const double seconds = static_cast<double>(samples) / settings.rate;
    if (problems.json()) {
        problems.print({{"file", json_text(capture.path)},
                        {"output", json_text(out.path())},
                        {"samples", samples},
                        {"seconds", seconds},
                        {"trailing_bytes", capture.size % settings.sample_bytes}});
    } else if (!out.is_standard()) {
        printf("%s: %llu samples, %.6f seconds\n", escape_text(out.path()).c_str(),
               static_cast<unsigned long long>(samples), seconds);
    }
}

int describe(const CommandLine& line, const Settings& settings, const std::string& path) {
    LogReader in;
    if (const int status = open_input(in, path)) {
        return status;
    }
    const Capture capture = {path, FileName(file_part(path)), in.size()};
    if (capture.name.exact && capture.name.type != LT_WCDMA_IQ) {
        return failure(ES_UNREADABLE, path + ": not an I/Q capture");
    }
    if (capture.size < settings.sample_bytes) {
        return failure(ES_UNREADABLE, path + ": holds no sample");
    }
    const size_t dot = path.rfind('.');
    const bool extension = dot != std::string::npos && dot > path.rfind('/') + 1;
    const std::string beside = path.substr(0, extension ? dot : path.size()) + SIGMF_ENDING;
    OutputFile out;
    if (!out.open(line.value("output", beside), line.has("force"))) {
        return out.failed();
    }
    Problems problems(line.has("json"), out.is_standard() ? stderr : stdout);
    if (const uint64_t rest = capture.size % settings.sample_bytes) {
        problems.add(path, {{true, "size",
                             std::to_string(rest) + " bytes are left behind the last sample of " +
                                 std::to_string(settings.sample_bytes) + " bytes",
                             static_cast<int64_t>(capture.size - rest)}});
    }
    const Json meta = make_meta(capture, settings, firmware_version(capture, &problems));
    const std::string text = meta.dump(4, ' ', true) + "\n";
    if (!out.write(text.data(), text.size()) || !out.close()) {
        return out.failed();
    }
    print_result(problems, capture, settings, out);
    return problems.status();
}

}  // namespace

int run_sigmf(const CommandLine& line) {
    Settings settings;
    int status;
    if (!read_settings(line, &settings, &status)) {
        return status;
    }
    const Args& paths = line.params();
    if (std::find(paths.begin(), paths.end(), "-") != paths.end()) {
        return line.usage_error("the meta file names the capture; give its path");
    }
    if (line.has("output") && paths.size() > 1) {
        return line.usage_error("--output is for one FILE");
    }
    return for_each_file(line, [&settings](const CommandLine& each, const std::string& path) {
        return describe(each, settings, path);
    });
}
