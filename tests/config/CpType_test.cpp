// SPDX-License-Identifier: Apache-2.0

#include "config/CpType.h"

#include <gtest/gtest.h>
#include <string.h>

namespace {

typedef CpType (*FromName)(const void*, size_t);

CpType from(FromName lookup, const char* name) {
    return lookup(name, strlen(name));
}

TEST(CpTypeTest, VocabulariesAreSeparateAndExact) {
    static const struct {
        const char* name;
        CpType own, foreign, request;
    } CASES[] = {
        {"cp_wcn", CT_WCN, CT_WCN, CT_UNKNOWN},
        {"cp_5mode", CT_5MODE, CT_UNKNOWN, CT_UNKNOWN},
        {"cp_td-lte", CT_UNKNOWN, CT_5MODE, CT_UNKNOWN},
        {"5MODE", CT_UNKNOWN, CT_UNKNOWN, CT_5MODE},
        {"cp_wcn2", CT_UNKNOWN, CT_UNKNOWN, CT_UNKNOWN},
        {"", CT_UNKNOWN, CT_UNKNOWN, CT_UNKNOWN},
    };
    for (const auto& c : CASES) {
        EXPECT_EQ(from(cp_type_from_name, c.name), c.own) << c.name;
        EXPECT_EQ(from(cp_type_from_foreign_name, c.name), c.foreign) << c.name;
        EXPECT_EQ(from(cp_type_from_request_name, c.name), c.request) << c.name;
    }
    EXPECT_EQ(cp_type_from_name("cp_wcnXX", 6), CT_WCN);  // the length decides, not a NUL
}

TEST(CpTypeTest, ValuesThatAreNoCpAreTakenForTheLatestModem) {
    for (int value : {-1, 8}) {
        const CpType type = static_cast<CpType>(value);
        EXPECT_STREQ(cp_type_to_name(type), "(unknown)");
        EXPECT_STREQ(cp_mem_path(type), "/proc/cptl/mem");
        EXPECT_STREQ(cp_image_prop_suffix(type), "l.nvp");
    }
}

}  // namespace
