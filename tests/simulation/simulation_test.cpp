// SPDX-License-Identifier: Apache-2.0
// The simulation in the test run: a few seeds of each weather, every plan that once found
// something, and the proof that a seed repeats.
#include <gtest/gtest.h>

#include <filesystem>

#include "simulation/Runner.h"

namespace {

TEST(Simulation, ASeedRepeatsExactlyAlsoWithKillsAndTwoThreads) {
    // The first seed in which all of it happens.
    uint64_t seed = 0;
    Plan plan;
    RunResult first;
    do {
        ASSERT_LT(seed, 50u);
        plan = make_plan(++seed, WEATHER_STORM, 300);
        first = run_plan(plan);
    } while (!first.counters.kills || !first.counters.faults || !first.counters.thread_steps ||
             !first.counters.iq_bytes);
    const RunResult second = run_plan(plan);
    EXPECT_EQ(second.digest, first.digest);
    EXPECT_EQ(second.counters.calls, first.counters.calls);
}

TEST(Simulation, APlanIsTheSameAfterItWasWrittenDown) {
    for (const Event& event : make_plan(7, WEATHER_STORM, 200)) {
        Plan again;
        ASSERT_TRUE(add_line(again, to_text(event)));
        EXPECT_EQ(to_text(again[0]), to_text(event));
    }
}

TEST(Simulation, PlansThatOnceFoundSomethingFindNothing) {
    size_t plans = 0;
    for (const auto& entry : std::filesystem::directory_iterator(SIMULATION_REGRESSIONS)) {
        Plan plan;
        EXPECT_EQ(read_plan(entry.path(), plan), "");
        const RunResult result = run_plan(plan);
        EXPECT_TRUE(result.passed)
            << entry.path() << ": " << result.failure_class << ": " << result.failure;
        ++plans;
    }
    EXPECT_GT(plans, 0u);
}

class SimulatedWeather : public testing::TestWithParam<Weather> {};

TEST_P(SimulatedWeather, NothingIsFound) {
    for (uint64_t seed = 1; seed <= 3; ++seed) {
        const RunResult result = run_plan(make_plan(seed, GetParam(), 300));
        EXPECT_TRUE(result.passed)
            << "seed " << seed << ": " << result.failure_class << ": " << result.failure;
    }
}

INSTANTIATE_TEST_SUITE_P(All, SimulatedWeather,
                         testing::Values(WEATHER_FAIR, WEATHER_OUTSIDE, WEATHER_FAULTS,
                                         WEATHER_STORM));

}  // namespace
