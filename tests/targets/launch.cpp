// SPDX-License-Identifier: Apache-2.0
// Stands where a program for another processor is expected and runs that, which lies beside it
// as NAME.elf, in the emulator. So programs that start each other need not know of it. Linked
// statically, as LD_PRELOAD is meant for the emulated program.
#include <limits.h>
#include <stdio.h>
#include <string.h>
#include <unistd.h>

#include <vector>

int main(int argc, char** argv) {
    static const char SUFFIX[] = ".elf";
    static char program[PATH_MAX];
    const ssize_t len = readlink("/proc/self/exe", program, sizeof(program) - sizeof(SUFFIX));
    if (len < 0 || argc < 1) {
        return 126;
    }
    memcpy(program + len, SUFFIX, sizeof(SUFFIX));
    // The system's own cache of libraries may name others for that processor.
    static char emulator[] = KEST_EMULATOR, prefix[] = "-L", libraries[] = KEST_LIBRARIES,
                set[] = "-E", path[] = "LD_LIBRARY_PATH=" KEST_LIBRARIES "/lib", name[] = "-0";
    std::vector<char*> args = {emulator, prefix, libraries, set, path, name, argv[0], program};
    args.insert(args.end(), argv + 1, argv + argc + 1);  // with the null
    execv(emulator, args.data());
    perror(emulator);
    return 126;
}
