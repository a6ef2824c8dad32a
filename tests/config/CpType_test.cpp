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

TEST(CpTypeTest, ValuesThatAreNoCpAreTakenForTheLatestModem) {
    for (int value : {-1, 8, 9}) {
        const CpType type = static_cast<CpType>(value);
        EXPECT_STREQ(cp_type_to_name(type), "(unknown)");
        EXPECT_STREQ(cp_type_to_request_name(type), "(unknown)");
        EXPECT_STREQ(cp_mem_path(type), "/proc/cptl/mem");
        EXPECT_STREQ(cp_mini_dump_path(type), "/proc/cptl/mini_dump");
        EXPECT_STREQ(cp_image_prop_suffix(type), "l.nvp");
    }
    EXPECT_STREQ(cp_mem_path(CT_WCN), nullptr);
}

}  // namespace
