// SPDX-License-Identifier: Apache-2.0

#include "config/CpType.h"

#include <gtest/gtest.h>

namespace {

// The names are in tests/recordings: requests.in, reload.in and those of each co-processor.
TEST(CpTypeTest, ValuesThatAreNoCpAreTakenForTheLatestModem) {
    for (int value : {-1, 8}) {
        const CpType type = static_cast<CpType>(value);
        EXPECT_STREQ(cp_type_to_name(type), "(unknown)");
        EXPECT_STREQ(cp_mem_path(type), "/proc/cptl/mem");
        EXPECT_STREQ(cp_image_prop_suffix(type), "l.nvp");
    }
}

}  // namespace
