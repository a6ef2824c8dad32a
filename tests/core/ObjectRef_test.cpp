#include "core/ObjectRef.h"

#include <gtest/gtest.h>

#include <memory>
#include <vector>

namespace {

struct Target : RefTarget {
    using RefTarget::clear_refs;
};

typedef ObjectRef<Target> Ref;

}  // namespace

TEST(ObjectRef, BecomesNullWithItsTargetOnly) {
    std::unique_ptr<Target> first(new Target);
    Target second;
    Ref a(first.get());
    Ref b(a);
    Ref c(&second);
    first.reset();
    EXPECT_FALSE(a);
    EXPECT_EQ(b.get(), nullptr);
    EXPECT_EQ(c.get(), &second);
    a = c;  // a reference that was cleared can be used again
    EXPECT_EQ(a.get(), &second);
    second.clear_refs();
    EXPECT_FALSE(a);
    EXPECT_FALSE(c);
    b = &second;
    EXPECT_TRUE(b);
}

TEST(ObjectRef, AssignmentMovesTheReference) {
    std::unique_ptr<Target> first(new Target);
    Target second;
    Ref a(first.get());
    Ref& same = a;
    a = same;
    EXPECT_EQ(a.get(), first.get());
    a = &second;
    first.reset();  // must not clear a reference that left it
    EXPECT_EQ(a.get(), &second);
    a = static_cast<Target*>(nullptr);
    EXPECT_FALSE(a);
}

TEST(ObjectRef, ReferencesEndInAnyOrder) {
    for (size_t ended : {0u, 1u, 2u}) {
        std::unique_ptr<Target> target(new Target);
        std::vector<std::unique_ptr<Ref>> refs;
        for (int i = 0; i < 3; ++i) {
            refs.emplace_back(new Ref(target.get()));
        }
        refs[ended].reset();
        target.reset();
        for (const auto& ref : refs) {
            EXPECT_TRUE(!ref || !*ref);
        }
    }
}
