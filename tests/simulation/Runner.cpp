// SPDX-License-Identifier: Apache-2.0

#include "simulation/Runner.h"

#include <sched.h>
#include <signal.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/mman.h>
#include <sys/mount.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <memory>
#include <new>

#include "config/LogConfig.h"
#include "control/LogController.h"
#include "core/Multiplexer.h"
#include "core/system_paths.h"
#include "simulation/Calls.h"
#include "simulation/World.h"

#if defined(__SANITIZE_ADDRESS__)
#include <sanitizer/lsan_interface.h>
#endif

namespace {

// Of processor time, for one life; it takes less than one even under sanitizers.
constexpr rlimit MAX_SECONDS = {300, 300};
constexpr int64_t RESTART_NS = int64_t{5} * 1000000000;

// A file system of this process and its children, where that is allowed: nobody else can delete
// anything there, and nothing stays when they are killed.
bool has_own_media() {
    static const bool has = !getenv("SIMULATION_KEEP") && unshare(CLONE_NEWNS) == 0 &&
                            mount("none", "/", nullptr, MS_REC | MS_PRIVATE, nullptr) == 0 &&
                            mount("simulation", "/media", "tmpfs", 0, "mode=0755") == 0;
    return has;
}

std::string make_root() {
    std::string root = has_own_media()                 ? "/media"
                       : access("/dev/shm", W_OK) == 0 ? "/dev/shm"
                                                       : "/tmp";
    root += "/sim-XXXXXX";
    if (!mkdtemp(&root[0])) {
        perror("mkdtemp");
        exit(2);
    }
    return root;
}

// One life of the service. Returns only from its orderly end.
void live(const std::string& root, const Plan& plan) {
    umask(0);
    setrlimit(RLIMIT_CPU, &MAX_SECONDS);
    signal(SIGPIPE, SIG_IGN);
    // An option in front of all else holds from the first start on.
    for (; g_state->next_event < plan.size() && plan[g_state->next_event].kind == EV_OPTION;
         ++g_state->next_event) {
        g_state->next_layout = plan[g_state->next_event].a % 2;
    }
    g_state->kest_layout = g_state->next_layout;
    World world(root, plan);
    set_world(&world);
    trace("life %u", g_state->lives);
    world.check_between_lives();
    {
        auto controller = std::make_unique<LogController>();
        world.attach(controller.get());
        char name[] = "kestmodem";
        char option[] = "-s";
        char* argv[] = {name, g_state->kest_layout ? option : nullptr, nullptr};
        g_state->starting = true;
        g_inside = true;
        LogConfig config(system_path(PATH_CONFIG_FILE).string());
        if (config.read_config(g_state->kest_layout ? 2 : 1, argv) < 0 ||
            controller->init(&config) < 0) {
            g_inside = false;
            if (!g_state->fault_in_step && !g_state->fault_seen) {
                fail_run("start", "the service does not start");
            }
            // Whoever starts it does so again, some time later.
            trace("start failed");
            world.pass_without_service(RESTART_NS);
            end_life(g_plan_over ? LIFE_OVER : LIFE_KILLED);
        }
        g_state->starting = false;
        while (!g_plan_over) {
            controller->multiplexer().run_once();
        }
        controller.reset();
        g_inside = false;
    }
    world.check_end();
#if defined(__SANITIZE_ADDRESS__)
    if (__lsan_do_recoverable_leak_check()) {
        fail_run("memory", "memory was not given back");
    }
#endif
}

}  // namespace

RunResult run_plan(const Plan& plan, int trace_fd) {
    void* const memory =
        mmap(nullptr, sizeof(State), PROT_READ | PROT_WRITE, MAP_SHARED | MAP_ANONYMOUS, -1, 0);
    if (memory == MAP_FAILED) {
        perror("mmap");
        exit(2);
    }
    g_state = new (memory) State();
    const std::string root = make_root();
    IqDevice::make_memory();
    World::make_handset(root);
    const int64_t start = g_state->boot_ns;
    print_traces_to(trace_fd);

    RunResult result;
    int status;
    do {
        ++g_state->lives;
        fflush(nullptr);
        const pid_t child = fork();
        if (child == 0) {
            live(root, plan);
            end_life(LIFE_OVER);
        }
        waitpid(child, &status, 0);
    } while (WIFEXITED(status) && WEXITSTATUS(status) == LIFE_KILLED);

    result.passed = WIFEXITED(status) && WEXITSTATUS(status) == LIFE_OVER;
    result.failure_class = g_state->failure_class;
    result.failure = g_state->failure;
    if (!result.passed && result.failure_class.empty()) {
        result.failure_class = "crash";
        result.failure = "the process ended with status " + std::to_string(status);
    }
    if (!result.passed && !has_own_media()) {
        usleep(200000);  // who deletes the root is done by then
        if (access((root + "/system").c_str(), F_OK) != 0) {
            result.failure_class = "simulation";
            result.failure = "somebody deleted " + root;
        }
    }
    result.digest = g_state->digest;
    result.counters = g_state->counters;
    result.hours = static_cast<double>(g_state->boot_ns - start) / 3.6e12;
    std::error_code error;
    if (!getenv("SIMULATION_KEEP")) {
        std::filesystem::remove_all(root, error);
    }
    munmap(memory, sizeof(State));
    g_state = nullptr;
    return result;
}

Plan shorten(const Plan& plan, const std::string& failure_class) {
    Plan shortest = plan;
    // The calm at the end stays: without it nothing has to be in order there.
    size_t end_len = 0;
    while (end_len < plan.size() && plan[plan.size() - 1 - end_len].kind != EV_CALM) {
        ++end_len;
    }
    end_len = std::min(end_len + 1, plan.size());
    for (size_t size = shortest.size() / 2; size > 0; size /= 2) {
        for (size_t at = 0; at + end_len < shortest.size();) {
            Plan shorter = shortest;
            const size_t end = std::min(at + size, shorter.size() - end_len);
            shorter.erase(shorter.begin() + static_cast<ptrdiff_t>(at),
                          shorter.begin() + static_cast<ptrdiff_t>(end));
            const RunResult result = run_plan(shorter);
            if (!result.passed && result.failure_class == failure_class) {
                shortest = shorter;
            } else {
                at += size;
            }
        }
    }
    return shortest;
}
