// SPDX-License-Identifier: Apache-2.0
// kestlog follow.
#include <errno.h>
#include <stdlib.h>
#include <string.h>
#include <sys/stat.h>

#include "common/CommandLine.h"
#include "kestlog/Commands.h"
#include "kestlog/ExitStatus.h"
#include "kestlog/Follower.h"
#include "kestlog/Report.h"

namespace {

// The path that stays the same when directories on it come and go. False, after printing why,
// when it is no directory.
bool find_directory(const std::string& path, std::string* real) {
    struct stat st;
    char* const found = realpath(path.c_str(), nullptr);
    if (!found || stat(found, &st) < 0 || !S_ISDIR(st.st_mode)) {
        failure(ES_UNREADABLE, path + ": " + strerror(found ? ENOTDIR : errno));
        free(found);
        return false;
    }
    *real = found;
    free(found);
    return true;
}

}  // namespace

int run_follow(const CommandLine& line) {
    std::vector<std::string> roots;
    for (const std::string& param : line.params()) {
        roots.emplace_back();
        if (!find_directory(param, &roots.back())) {
            return ES_UNREADABLE;
        }
    }
    std::string card;
    if (line.has("card") && !find_directory(line.value("card", ""), &card)) {
        return ES_UNREADABLE;
    }
    return Follower(roots, card, line.has("json")).run();
}
