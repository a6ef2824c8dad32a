#include "core/ObjectRef.h"

#include <gtest/gtest.h>

#include <memory>
#include <vector>

namespace {

struct Target : RefTarget {
    explicit Target(int v = 0) : value(v) {}
    using RefTarget::clear_refs;
    int value;
};

typedef ObjectRef<Target> Ref;

}  // namespace

TEST(ObjectRef, BecomesNullWithItsTargetOnly) {
    std::unique_ptr<Target> first(new Target(1));
    Target second(2);
    Ref a(first.get());
    Ref b(a);
    Ref c(&second);
    EXPECT_EQ(1, b->value);
    EXPECT_EQ(2, (*c).value);
    first.reset();
    EXPECT_FALSE(a);
    EXPECT_EQ(nullptr, b.get());
    EXPECT_EQ(&second, c.get());
    a = c;  // a reference that was cleared can be used again
    EXPECT_EQ(&second, a.get());
    second.clear_refs();
    EXPECT_FALSE(a);
    EXPECT_FALSE(c);
    b = &second;
    EXPECT_TRUE(b);
}

TEST(ObjectRef, AssignmentMovesTheReference) {
    std::unique_ptr<Target> first(new Target(1));
    std::unique_ptr<Target> second(new Target(2));
    Ref a(first.get());
    Ref b(second.get());
    Ref& same = a;
    a = same;
    a = a.get();
    EXPECT_EQ(first.get(), a.get());
    a = b;
    first.reset();  // must not clear a reference that left it
    EXPECT_EQ(second.get(), a.get());
    b = static_cast<Target*>(nullptr);
    a = Ref();
    second.reset();
    EXPECT_FALSE(a);
    EXPECT_FALSE(b);
}

TEST(ObjectRef, ReferencesEndInAnyOrder) {
    const size_t NUM = 5;
    for (size_t start = 0; start < NUM; ++start) {
        for (size_t step = 1; step < NUM; ++step) {
            std::unique_ptr<Target> target(new Target);
            std::vector<std::unique_ptr<Ref>> refs;
            for (size_t i = 0; i < NUM; ++i) {
                refs.emplace_back(new Ref(target.get()));
            }
            for (size_t i = 0; i < NUM - 2; ++i) {  // each order; two are left
                refs[(start + i * step) % NUM].reset();
            }
            for (const auto& ref : refs) {
                EXPECT_TRUE(!ref || ref->get() == target.get());
            }
            target.reset();
            for (const auto& ref : refs) {
                EXPECT_TRUE(!ref || !*ref);
            }
        }
    }
}
