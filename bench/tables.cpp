// SPDX-License-Identifier: Apache-2.0

#include "bench/tables.h"

Outcome measure_log_path(const Options& options, const std::string& dir);
Outcome measure_floor_calls(const Options& options, const std::string& dir);
Outcome measure_memory(const Options& options, const std::string& dir);
Outcome measure_start(const Options& options, const std::string& dir);
Outcome measure_trimming(const Options& options, const std::string& dir);
Outcome measure_rotation(const Options& options, const std::string& dir);
Outcome measure_requests(const Options& options, const std::string& dir);
Outcome measure_iq_save(const Options& options, const std::string& dir);
Outcome measure_read_gaps(const Options& options, const std::string& dir);
Outcome measure_wake_ups(const Options& options, const std::string& dir);
Outcome measure_kestlog(const Options& options, const std::string& dir);
Outcome count_system_calls(const Options& options, const std::string& dir);

namespace {

const TableMaker TABLES[] = {
    {"log-path", true, measure_log_path}, {"floor", true, measure_floor_calls},
    {"memory", true, measure_memory},     {"start", true, measure_start},
    {"trim", true, measure_trimming},     {"rotate", true, measure_rotation},
    {"requests", true, measure_requests}, {"iq", true, measure_iq_save},
    {"gaps", true, measure_read_gaps},    {"wake-ups", true, measure_wake_ups},
    {"kestlog", true, measure_kestlog},   {"strace", false, count_system_calls},
};

}  // namespace

const TableMaker* find_table(const std::string& name) {
    for (const TableMaker& table : TABLES) {
        if (name == table.name) {
            return &table;
        }
    }
    return nullptr;
}

std::vector<const TableMaker*> default_tables() {
    std::vector<const TableMaker*> tables;
    for (const TableMaker& table : TABLES) {
        if (table.by_default) {
            tables.push_back(&table);
        }
    }
    return tables;
}
