// SPDX-License-Identifier: Apache-2.0

#include <gtest/gtest.h>
#include <utils/String8.h>
#include <utils/Vector.h>

using android::String8;
using android::Vector;

namespace {

TEST(String8, TakesNullForEmptyAndItsOwnParts) {
    String8 s(nullptr);
    EXPECT_TRUE(s.isEmpty() && s == static_cast<const char*>(nullptr));
    s.append("/bcd", 2).append(nullptr);
    s.append(s.string());
    s.append(s);
    EXPECT_STREQ(s.string(), "/b/b/b/b");
    EXPECT_EQ(s.appendFormat("[%s]%d", s.string(), -7), 0);
    EXPECT_STREQ(s.string(), "/b/b/b/b[/b/b/b/b]-7");
    s.setTo(s.string() + 1, 3);
    EXPECT_STREQ(s.string(), "b/b");
    EXPECT_TRUE(s == "b/b" && s == String8("b/b") && s != "b" && s != String8("b") && s < "c");
    EXPECT_GT(String8("\x80").compare("a"), 0) << "bytes are unsigned";
    EXPECT_EQ(String8::format("%5000d|", 1).size(), 5001u);
}

TEST(Vector, IndexBeyondTheEndEndsTheProgram) {
    Vector<int> v;
    EXPECT_EQ(v.add(20), 0);
    EXPECT_EQ(v.insertAt(10, 0), 0);
    EXPECT_EQ(v[1], 20);
    EXPECT_EQ(v.removeAt(1), 1);
    EXPECT_DEATH(v.removeAt(1), "");
}

}  // namespace
