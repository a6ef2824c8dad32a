// SPDX-License-Identifier: Apache-2.0

#include "bench/measurements.h"

#include <string.h>

int measure_log_path(const Options& options, const std::string& dir);
int count_system_calls(const Options& options, const std::string& dir);

const Measurement* find_measurement(const char* option) {
    static const Measurement MEASUREMENTS[] = {
        {nullptr, measure_log_path},
        {"--strace", count_system_calls},
    };
    for (const Measurement& m : MEASUREMENTS) {
        if (m.option && option ? strcmp(m.option, option) == 0 : m.option == option) {
            return &m;
        }
    }
    return nullptr;
}
