#include "config/CpType.h"

#include <gtest/gtest.h>
#include <string.h>

#include <string>

namespace {

typedef CpType (*FromName)(const void*, size_t);

int from(FromName lookup, const char* name) {
    return lookup(name, strlen(name));
}

// Every name of one vocabulary that another one must not know.
TEST(CpTypeTest, VocabulariesAreSeparateAndExact) {
    static const struct {
        const char* name;
        int own, foreign, request;
    } CASES[] = {
        {"cp_wcdma", 0, 0, -1},    {"cp_td-scdma", 1, 1, -1}, {"cp_3mode", 2, -1, -1},
        {"cp_4mode", 3, -1, -1},   {"cp_5mode", 4, -1, -1},   {"cp_wcn", 5, 5, -1},
        {"cp_gnss", 6, 6, -1},     {"agdsp", 7, -1, -1},      {"cp_tdd-lte", -1, 2, -1},
        {"cp_fdd-lte", -1, 3, -1}, {"cp_td-lte", -1, 4, -1},  {"WCDMA", -1, -1, 0},
        {"TD", -1, -1, 1},         {"TDD-LTE", -1, -1, 2},    {"FDD-LTE", -1, -1, 3},
        {"5MODE", -1, -1, 4},      {"WCN", -1, -1, 5},        {"GNSS", -1, -1, 6},
        {"AG-DSP", -1, -1, 7},     {"CP_WCDMA", -1, -1, -1},  {"cp_wcdma2", -1, -1, -1},
        {"cp_wcdm", -1, -1, -1},   {"td", -1, -1, -1},        {"", -1, -1, -1},
        {"(unknown)", -1, -1, -1},
    };
    for (const auto& c : CASES) {
        EXPECT_EQ(from(cp_type_from_name, c.name), c.own) << c.name;
        EXPECT_EQ(from(cp_type_from_foreign_name, c.name), c.foreign) << c.name;
        EXPECT_EQ(from(cp_type_from_request_name, c.name), c.request) << c.name;
    }
    EXPECT_EQ(cp_type_from_name("cp_wcnXX", 6), CT_WCN);  // the length decides, not a NUL
}

TEST(CpTypeTest, CellsByType) {
    static const struct {
        int type;
        const char *name, *request, *mem, *mini_dump, *suffix;
    } CASES[] = {
        {0, "cp_wcdma", "WCDMA", "/proc/cpw/mem", "/proc/cpw/mini_dump", "w.nvp"},
        {1, "cp_td-scdma", "TD", "/proc/cpt/mem", "/proc/cpt/mini_dump", "t.nvp"},
        {2, "cp_3mode", "TDD-LTE", "/proc/cptl/mem", "/proc/cptl/mini_dump", "tl.nvp"},
        {3, "cp_4mode", "FDD-LTE", "/proc/cptl/mem", "/proc/cptl/mini_dump", "lf.nvp"},
        {4, "cp_5mode", "5MODE", "/proc/cptl/mem", "/proc/cptl/mini_dump", "l.nvp"},
        {5, "cp_wcn", "WCN", nullptr, "/proc/cptl/mini_dump", "l.nvp"},
        {7, "agdsp", "AG-DSP", nullptr, "/proc/cptl/mini_dump", "l.nvp"},
        {8, "(unknown)", "(unknown)", nullptr, "/proc/cptl/mini_dump", "l.nvp"},
        {CT_UNKNOWN, "(unknown)", "(unknown)", nullptr, "/proc/cptl/mini_dump", "l.nvp"},
    };
    for (const auto& c : CASES) {
        const CpType type = static_cast<CpType>(c.type);
        EXPECT_STREQ(cp_type_to_name(type), c.name);
        EXPECT_STREQ(cp_type_to_request_name(type), c.request);
        EXPECT_STREQ(cp_mem_path(type), c.mem) << c.type;
        EXPECT_STREQ(cp_mini_dump_path(type), c.mini_dump) << c.type;
        EXPECT_STREQ(cp_image_prop_suffix(type), c.suffix) << c.type;
    }
}

}  // namespace
