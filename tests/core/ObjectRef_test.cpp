// SPDX-License-Identifier: Apache-2.0

#include "core/ObjectRef.h"

#include <gtest/gtest.h>

#include <memory>

namespace {

struct Target : RefTarget {};

typedef ObjectRef<Target> Ref;

}  // namespace

TEST(ObjectRef, AssignmentMovesTheReference) {
    std::unique_ptr<Target> first(new Target);
    Target second;
    Ref a(first.get());
    const Ref b(&second);
    Ref& same = a;
    a = same;
    EXPECT_EQ(a.get(), first.get());
    a = b;
    first.reset();  // must not clear a reference that left it
    EXPECT_EQ(a.get(), &second);
    a = static_cast<Target*>(nullptr);
    EXPECT_FALSE(a);
    EXPECT_EQ(b.get(), &second);
}
