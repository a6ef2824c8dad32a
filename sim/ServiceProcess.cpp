// SPDX-License-Identifier: Apache-2.0

#include "sim/ServiceProcess.h"

#include <fcntl.h>
#include <stdlib.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>

#include "sim/SimHandset.h"
#include "sim/byte_text.h"
#include "sim/files.h"

namespace {

// "NAME=added", with what the variable holds already in front of it: a library that somebody
// preloads has the calls first.
std::string extended_variable(const std::string& name, const std::string& added) {
    const char* old = getenv(name.c_str());
    return name + "=" + (old && *old ? old + std::string(":") : "") + added;
}

// Beside the program, or where packages place it. -1 with errno set on failure.
int open_drivers() {
    std::error_code ec;
    const std::filesystem::path dir =
        std::filesystem::read_symlink("/proc/self/exe", ec).parent_path();
    int library = -1;
    for (const char* place : {".", "../lib/kestmodem"}) {
        if (library < 0) {
            library = open((dir / place / "libkestsim_devices.so").c_str(), O_RDONLY | O_CLOEXEC);
        }
    }
    return library;
}

}  // namespace

bool ServiceProcess::start(const std::string& program, const SimHandset& handset,
                           const std::vector<std::string>& args) {
    if (program.find('/') != std::string::npos && access(program.c_str(), X_OK) != 0) {
        return false;
    }
    m_log_file = handset.path("kestmodem.log");
    Start start = {{program}, m_log_file, "", true, {}, -1};
    start.args.insert(start.args.end(), args.begin(), args.end());
    std::vector<std::string>& env = start.environment;
    env = {"KESTMODEM_ROOT=" + handset.root(), "EXTERNAL_STORAGE=" + handset.sd_root(),
           "SECONDARY_STORAGE=" + handset.sd_root()};
    int library = -1;
    if (handset.needs_drivers()) {
        library = open_drivers();
        if (library < 0) {
            return false;
        }
        // LD_PRELOAD separates at blanks and colons, which the path may have; a descriptor
        // that the service inherits has neither.
        const std::string inherited = "/proc/self/fd/" + std::to_string(library);
        env.push_back(extended_variable("LD_PRELOAD", inherited));
        // A build with the address sanitizer wants its own library in front.
        env.push_back(extended_variable("ASAN_OPTIONS", "verify_asan_link_order=0"));
    }
    start.inherited = library;
    const bool started = ChildProcess::start(start);
    if (library >= 0) {
        close(library);
    }
    return started;
}

std::string ServiceProcess::log_text() const {
    return read_text_file(m_log_file);
}

std::string ServiceProcess::last_log_lines(size_t count) const {
    const std::string text = log_text();
    size_t at = text.size();
    for (; at > 0; --at) {
        // The line feed that ends the last line does not start another one.
        if (text[at - 1] == '\n' && at < text.size() && count-- <= 1) {
            break;
        }
    }
    // What a card has as names may be in it.
    std::string lines;
    for (size_t end; at < text.size(); at = end + 1) {
        end = std::min(text.find('\n', at), text.size());
        lines += show_name(text.substr(at, end - at)) + "\n";
    }
    return lines;
}
