// SPDX-License-Identifier: Apache-2.0
// kestlog export.
#include <stdio.h>

#include <algorithm>
#include <nlohmann/json.hpp>

#include "common/text.h"
#include "kestlog/Commands.h"
#include "kestlog/ExitStatus.h"
#include "kestlog/ExportPlan.h"
#include "kestlog/FrameExporter.h"
#include "kestlog/OutputFile.h"
#include "kestlog/PcapngWriter.h"
#include "kestlog/Progress.h"
#include "kestlog/Report.h"
#include "kestlog/TreeInput.h"
#include "kestlog/option_numbers.h"

namespace {

constexpr char ABOUT_TIMES[] =
    "A packet has the time of its file: that of the file's time record or, without one, that in "
    "the file's name. Both are local times of the handset in whole seconds. Show them as UTC.";

constexpr size_t BUFFER_SIZE = 256 * 1024;

void print_summary(FILE* to, bool json, const std::string& path, const ExportPlan& plan,
                   const FrameExporter::Totals& totals) {
    if (json) {
        const Json object = {{"file", json_text(path)},    {"interfaces", plan.interfaces.size()},
                             {"files", totals.files},      {"left_out", plan.left_out},
                             {"packets", totals.packets},  {"broken", totals.broken},
                             {"other_bytes", totals.other}};
        fprintf(to, "%s\n", object.dump(-1, ' ', true).c_str());
        return;
    }
    const auto number = [](uint64_t value) { return static_cast<unsigned long long>(value); };
    fprintf(to, "%s: %llu packets on %zu interfaces from %llu files, %llu other bytes\n",
            escape_text(path).c_str(), number(totals.packets), plan.interfaces.size(),
            number(totals.files), number(totals.other));
}

}  // namespace

int run_export(const CommandLine& line) {
    FrameExporter::Wanted wanted;
    wanted.broken = line.has("broken");
    int status = ES_OK;
    if (!read_type(line, "type", &wanted.type, &status) || !takes_binary(line, &status)) {
        return status;
    }
    const std::string path = line.value("output", "-");
    const bool piped = path == "-";
    LogTree tree;
    if (!open_tree(line, &tree, &status, LogTree::FILES_TOO)) {
        return status;
    }
    const ExportPlan plan(tree, line.value("cp", ""));
    if (plan.sources.empty()) {
        tell_failures(tree);
        return failure(ES_UNREADABLE, "no file with frames or chunks to export");
    }
    OutputFile out;
    if (!out.open(path, line.has("force"))) {
        return out.failed();
    }
    setvbuf(out.stream(), nullptr, _IOFBF, BUFFER_SIZE);
    const Progress progress(plan.size());
    PcapngWriter writer(&out);
    writer.begin(ABOUT_TIMES);
    for (const ExportInterface& interface : plan.interfaces) {
        writer.add_interface(interface.name, interface.description);
    }
    FrameExporter exporter(plan, &writer, wanted);
    for (const ExportSource& source : plan.sources) {
        status = std::max(status, exporter.add(source));
        if (!writer.good()) {
            break;
        }
    }
    if (status <= ES_DAMAGE && writer.good() && exporter.totals().packets == 0) {
        if (status == ES_OK) {
            status = failure(ES_UNREADABLE, "found nothing to export");
        }
        return std::max(status, tell_failures(tree));  // a capture of nothing is not kept
    }
    if (!writer.finish() || !out.close()) {
        return out.failed();
    }
    if (!piped || line.has("json")) {
        print_summary(piped ? stderr : stdout, line.has("json"), path, plan, exporter.totals());
    }
    return std::max(status, tell_failures(tree));
}
