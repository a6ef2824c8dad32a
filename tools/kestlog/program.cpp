// SPDX-License-Identifier: Apache-2.0

#include "kestlog/program.h"

#include <stdint.h>
#include <stdio.h>

#include <algorithm>

#include "common/CommandLine.h"
#include "kestlog/Commands.h"
#include "kestlog/ExitStatus.h"
#include "kestlog/FileScan.h"
#include "kestlog/SampleFormat.h"
#ifdef KEST_WAV
#include "kestlog/WavFile.h"
#endif

namespace {

constexpr size_t ANY = SIZE_MAX;

struct Command {
    const char* name;
    const char* params;
    size_t min, max;  // number of parameters
    // Prints everything; returns the exit status.
    int (*run)(const CommandLine& line);
    const char* help;
};

// clang-format off
constexpr Command COMMANDS[] = {
    // what is there
    {"ls",     "ROOT...", 1, ANY, run_ls,     "list sets, CPs and files with sizes and time spans"},
    {"info",   "FILE...", 1, ANY, run_info,   "print what a file is, its time record, frames and damage"},
    {"verify", "ROOT...", 1, ANY, run_verify, "check names, numbers, headers and frames of all files"},
    {"frames", "FILE...", 1, ANY, run_frames, "list the frames, or the chunks of an audio DSP log"},
    {"follow", "ROOT...", 1, ANY, run_follow, "tell what grows, until Ctrl-C: files, crashes, damage"},
    // for others to look at
    {"report", "ROOT...", 1, ANY, run_report, "write a page for a browser that shows all of it over time"},
    {"bundle", "ROOT...", 1, ANY, run_bundle, "write all that belongs to a crash into a tar, for a bug report"},
    // for other programs
    {"join",   "ROOT...", 1, ANY, run_join,   "write a CP's log as one stream, oldest first"},
    {"extract", "FILE|ROOT...", 1, ANY, run_extract, "write memory images, ring buffers or the payloads of a type to files"},
    {"split",  "FILE...", 1, ANY, run_split,  "write the log, PCM and dump data of an audio DSP log to files"},
    {"export", "FILE|ROOT...", 1, ANY, run_export, "write a capture (pcapng) for Wireshark"},
#ifdef KEST_WAV
    {"wav",    "FILE|ROOT...", 1, ANY, run_wav, "write the PCM data of an audio DSP log to a WAV file"},
#endif
    {"sigmf",  "FILE...", 1, ANY, run_sigmf,  "write a SigMF meta file beside each I/Q capture"},
};

// The commands that take a ROOT.
constexpr char TREES[] = "ls verify report bundle join extract export wav";
// Those and the one that waits for what is still to come.
constexpr char CARDS[] = "ls verify follow report bundle join extract export wav";
// The commands for which files are chosen by their time.
constexpr char TIMES[] = "ls verify frames report join extract export wav";
// The commands that write files.
constexpr char WRITERS[] = "report bundle join extract split export wav sigmf";

constexpr Option OPTIONS[] = {
    {"json",         nullptr, nullptr, "print results as JSON, one object per line"},
    {"card",         "DIR",   CARDS,   "the card of the handset whose root is given"},
    {"since",        "T",     TIMES,   "leave out files that end before T"},
    {"until",        "T",     TIMES,   "leave out files that begin after T"},
    {"unpack-limit", "MIB",   TREES,   "the most that an archive may take (default: what is free)"},
    {"output",       "PATH",  WRITERS, "the directory, or the file (-: standard output), to write to", 'o'},
    {"force",        nullptr, WRITERS, "replace files that exist"},
    {"tree",         nullptr, "ls",    "draw the directories as a tree"},
    {"type",         "N",     "frames extract export", "only frames of this type: 0x9d, 157"},
    {"sub-type",     "N",     "frames extract", "only frames of this sub-type"},
    {"limit",        "N",     "frames", "stop after that many"},
    {"hex",          nullptr, "frames", "print the payload, too"},
    {"iq-rate",      "HZ",    "report", "draw the spectra of I/Q captures with this sample rate"},
    {"iq-format",    "F",     "report", "and this format, in SigMF's words: cu8, ci16_le, cf32_le, ..."},
    {"pcm-rate",     "HZ",    "report", "draw the PCM data of an audio DSP with this sample rate"},
    {"pcm-channels", "N",     "report", "and so many channels (default: 1)"},
    {"pcm-format",   "F",     "report", "and this format: u8, s8, s16le, s16be, s24le ... s32be, f32le, f32be"},
    {"crash",        "T",     "bundle", "the crash nearest to T"},
    {"minutes",      "N",     "bundle", "with the logs of so many minutes around it (default: 5)"},
    {"cp",           "NAME",  "bundle", "the crash of this CP nearest to T"},
    {"cp",           "NAME",  "join",  "the CP, when there are several"},
    {"records",      nullptr, "join",  "keep the time records"},
    {"kind",         "KIND",  "join",  "of an audio DSP's log only the data of chunks: log, pcm, dump"},
    {"cp",           "NAME",  "export", "only this CP"},
    {"broken",       nullptr, "export", "also what stands between flags and is no intact frame"},
    {"rate",         "HZ",    "wav sigmf", "samples per second"},
#ifdef KEST_WAV
    {"channels",     "N",     "wav",   "samples of one moment"},
    {"format",       "FORMAT", "wav",  "of a sample: u8, s16le, s16be, s24le ... s32be, f32le, f32be"},
    {"fill-gaps",    nullptr, "wav",   "put silence where chunks are missing"},
#endif
    {"datatype",     "TYPE",  "sigmf", "of a sample, in SigMF's words: ci16_le, cf32_le, ..."},
    {"frequency",    "HZ",    "sigmf", "the frequency of the middle of the band"},
};
// clang-format on

constexpr char NOTES[] =
    "ROOT is a handset's root, a medium's top directory, its modem_log, a set or a CP's\n"
    "directory, or a tar or zip of one of them (- for standard input).\n"
    "FILE may be - for standard input, but not for sigmf.\n"
    "T is a local time of the handset, \"2016-03-01 09:15:00\", \"2016-03-01\" or \"09:15\", or\n"
    "what lies before the newest time in the ROOTs: \"-10m\", \"-2h\".\n"
    "\nExit status:\n"
    "  0  no damage\n"
    "  1  wrong usage\n"
    "  2  something could not be read\n"
    "  3  damage found\n"
    "  4  the output could not be written, or already exists\n";

Args option_words(const std::string& option) {
    if (option == "kind") {
        return {std::begin(CHUNK_KINDS), std::end(CHUNK_KINDS)};
    }
#ifdef KEST_WAV
    if (option == "format") {
        return wav_format_names();
    }
#endif
    if (option == "pcm-format") {
        return pcm_format_names();
    }
    Args words = option == "iq-format" || option == "datatype" ? iq_format_names() : Args();
    if (option == "datatype") {
        for (const std::string& complex : iq_format_names()) {
            words.push_back("r" + complex.substr(1));
        }
    }
    return words;
}

Syntax make_syntax() {
    Syntax syntax = {
        "kestlog",
        "command ROOT...|FILE...",
        "Reads and checks what the service kestmodem writes.",
        {std::begin(OPTIONS), std::end(OPTIONS)},
        {},
        NOTES,
        nullptr,
        option_words,
    };
    for (const Command& command : COMMANDS) {
        const std::string usage = std::string(command.name) + " " + command.params;
        syntax.commands.push_back({command.name, usage, command.help});
    }
    return syntax;
}

int run(const CommandLine& line) {
    const Command& command =
        *std::find_if(std::begin(COMMANDS), std::end(COMMANDS),
                      [&line](const Command& each) { return line.command() == each.name; });
    const Args& params = line.params();
    if (params.size() < command.min) {
        return line.usage_error("a parameter is missing");
    }
    if (params.size() > command.max) {
        return line.usage_error("too many parameters");
    }
    if (std::find(params.begin(), params.end(), "") != params.end()) {
        return line.usage_error("a parameter is empty");
    }
    return command.run(line);
}

}  // namespace

int run_program(int argc, char** argv) {
    const Syntax syntax = make_syntax();
    CommandLine line(syntax);
    const int status = line.parse(argc, argv) ? run(line) : line.status();
    // A command whose own output this is has told it.
    if ((fflush(stdout) != 0 || ferror(stdout)) && status != ES_OUTPUT) {
        perror("kestlog: standard output");
        return ES_OUTPUT;
    }
    return status;
}
