// SPDX-License-Identifier: Apache-2.0
// Plays a recording's script against the real program while one of its calls fails, then again
// with all calls well, and checks from outside that the service came through: it answers as
// without the fault, lost no more than may be lost, keeps no descriptor and did not spin.
#ifndef TESTS_FAULTS_FAULTPLAYER_H_
#define TESTS_FAULTS_FAULTPLAYER_H_

#include <map>
#include <set>
#include <string>

#include "sim/FaultPlan.h"
#include "sim/ScriptPlayer.h"

// What a script comes to from outside.
struct ScriptResult {
    std::map<std::string, size_t> log_bytes;  // of each CP on the media
    std::map<std::string, size_t> new_bytes;  // of these, what the second round added
    std::map<std::string, size_t> unlogged;   // fed in the first round, and not there
    std::string dialogue;                     // of the second round
    std::string settings;
    std::set<std::string> records;  // contents of dumps and the like
    std::multiset<std::string> descriptors;
};

class FaultPlayer : public ScriptPlayer {
public:
    // The plan is shared with the service that is going to start.
    FaultPlayer(const std::string& program, FaultPlan* plan)
        : ScriptPlayer(program, false), m_plan(plan) {}

    // Without a fault. False with error() set.
    bool play_untouched(const std::string& script, ScriptResult* result);
    // With the fault of the plan, against what came of the script without one. What is wrong
    // in error(); *hit when the fault came about, *lost the log bytes that it cost.
    bool play_with_fault(const std::string& script, const ScriptResult& clean, bool* hit,
                         size_t* lost);

private:
    bool restart_if_ended();
    bool control_socket_missing() const;
    bool play_second_round(ScriptResult* result);
    bool settings_whole(const std::string& text) const;
    // Takes stock of the log bytes on the media; false when they are not those fed.
    bool count_log_bytes(ScriptResult* result);
    bool read_cp_dir(const std::string& dir, const std::string& cp, size_t* bytes);
    std::vector<std::string> log_roots() const;
    std::string settings() const;
    std::set<std::string> records() const;
    std::multiset<std::string> descriptors() const;

    FaultPlan* const m_plan;
};

#endif  // TESTS_FAULTS_FAULTPLAYER_H_
