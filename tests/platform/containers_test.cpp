#include <gtest/gtest.h>
#include <utils/List.h>
#include <utils/String8.h>
#include <utils/Vector.h>

#include <vector>

using android::List;
using android::String8;
using android::Vector;

namespace {

TEST(String8, TextAndItsOwnParts) {
    const String8 empty, null(nullptr), none("abc", 0);
    for (const String8* s : {&empty, &null, &none}) {
        EXPECT_TRUE(s->isEmpty() && s->length() == 0 && *s == static_cast<const char*>(nullptr));
        EXPECT_STREQ(s->string(), "");
    }
    String8 a("abcdef", 3);
    String8 b = a;
    b += "d";
    EXPECT_TRUE(a == "abc" && b == "abcd" && "abcd" == b && a != b && a != "ab" && a < b);
    b.setTo(b.string() + 1, 2);  // a part of itself
    EXPECT_EQ(b, String8("bc"));
    EXPECT_GT(String8("\x80").compare("a"), 0);  // bytes are unsigned
    String8 s("/a");
    s.append("/bcd", 2).append(String8("/e")).append(nullptr);
    s.append(s.string());
    s.append(s);
    EXPECT_STREQ(s.string(), "/a/b/e/a/b/e/a/b/e/a/b/e");
    EXPECT_EQ(s.appendFormat("[%s]%d", s.string(), -7), 0);  // its own text as argument
    EXPECT_STREQ(s.string(), "/a/b/e/a/b/e/a/b/e/a/b/e[/a/b/e/a/b/e/a/b/e/a/b/e]-7");
    EXPECT_EQ(String8::format("%5000d|", 1).size(), 5001u);
    EXPECT_STREQ((a + "-" + String8("r")).string(), "abc-r");
}

template <typename Container>
std::vector<int> values(const Container& container) {
    return std::vector<int>(container.begin(), container.end());
}

TEST(List, KeepsOrderThroughInsertAndErase) {
    List<int> list;
    EXPECT_TRUE(list.empty() && list.begin() == list.end());
    list.push_back(3);
    list.push_front(1);
    EXPECT_EQ(*list.insert(--list.end(), 2), 2);
    EXPECT_EQ(*list.insert(list.end(), 4), 4);
    EXPECT_EQ(values(list), (std::vector<int>{1, 2, 3, 4}));
    const List<int> copy = list;
    for (List<int>::iterator it = list.begin(); it != list.end();) {
        it = *it % 2 ? list.erase(it) : ++it;
    }
    EXPECT_EQ(values(list), (std::vector<int>{2, 4}));
    EXPECT_EQ(list.size(), 2u);
    EXPECT_EQ(values(copy), (std::vector<int>{1, 2, 3, 4}));
}

TEST(Vector, IndexesAndEdits) {
    Vector<int> v;
    EXPECT_EQ(v.add(10), 0);
    EXPECT_EQ(v.add(30), 1);
    EXPECT_EQ(v.insertAt(20, 1), 1);
    v.push(50);
    v.editItemAt(0) += 1;
    EXPECT_EQ(v.removeAt(2), 2);
    EXPECT_EQ(values(v), (std::vector<int>{11, 20, 50}));
    EXPECT_DEATH(v.removeAt(3), "");
}

}  // namespace
