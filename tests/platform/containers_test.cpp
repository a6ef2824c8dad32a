#include <gtest/gtest.h>
#include <utils/List.h>
#include <utils/String8.h>
#include <utils/Vector.h>

#include <utility>
#include <vector>

#include "platform/alloc_count.h"

using android::List;
using android::String8;
using android::Vector;

namespace {

TEST(String8, ConstructionAndAssignment) {
    const size_t before = allocation_count();
    const String8 empty, null(nullptr), blank(""), none("abc", 0), copy_of_empty(empty);
    EXPECT_EQ(allocation_count(), before);
    for (const String8* s : {&empty, &null, &blank, &none, &copy_of_empty}) {
        EXPECT_TRUE(s->isEmpty() && s->length() == 0);
        EXPECT_STREQ(s->string(), "");
        EXPECT_TRUE(*s == static_cast<const char*>(nullptr));
    }
    String8 a("abcdef", 3);
    EXPECT_STREQ(a.string(), "abc");
    String8 b = a;
    b += "d";
    EXPECT_TRUE(a == "abc" && b == "abcd" && "abcd" == b && a != b && a != "ab" && a < b);
    String8 c(std::move(b));
    EXPECT_STREQ(c.c_str(), "abcd");
    c.setTo(c.string() + 1, 2);  // a part of itself
    EXPECT_EQ(c, String8("bc"));
    c.setTo(nullptr);
    EXPECT_TRUE(c.empty());
    c = "x";
    c.clear();
    EXPECT_EQ(c.bytes(), 0u);
    EXPECT_GT(String8("\x80").compare("a"), 0);  // bytes are unsigned
}

TEST(String8, AppendAndFormat) {
    String8 s("/a");
    s.append("/b").append("/cdef", 2).append(String8("/e")).append(nullptr);
    EXPECT_STREQ(s.string(), "/a/b/c/e");
    s.append(s.string());
    s.append(s);
    EXPECT_EQ(s.length(), 32u);
    EXPECT_EQ(s.appendFormat("[%s]%d", s.string(), -7), 0);  // its own text as argument
    EXPECT_EQ(s, String8::format("%s[%s]-7", "/a/b/c/e/a/b/c/e/a/b/c/e/a/b/c/e",
                                 "/a/b/c/e/a/b/c/e/a/b/c/e/a/b/c/e"));
    EXPECT_EQ(String8::format("%5000d|", 1).size(), 5001u);
    const String8 left("l");
    EXPECT_STREQ((left + "-" + String8("r")).string(), "l-r");
    EXPECT_STREQ(left.string(), "l");
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
    list.clear();
    EXPECT_EQ(list.size(), 0u);
    EXPECT_EQ(values(copy), (std::vector<int>{1, 2, 3, 4}));

    List<String8> texts;
    texts.push_back("abc");
    EXPECT_EQ(texts.begin()->length(), 3u);
}

TEST(Vector, IndexesAndEdits) {
    Vector<int> v;
    EXPECT_TRUE(v.isEmpty());
    EXPECT_EQ(v.add(10), 0);
    EXPECT_EQ(v.add(30), 1);
    EXPECT_EQ(v.insertAt(20, 1), 1);
    EXPECT_EQ(v.insertAt(40, 3), 3);
    v.push(50);
    v.editItemAt(0) += 1;
    EXPECT_EQ(v.removeAt(2), 2);
    EXPECT_EQ(values(v), (std::vector<int>{11, 20, 40, 50}));
    EXPECT_EQ(v[3] + v.itemAt(1), 70);
    EXPECT_EQ(v.size(), 4u);
    EXPECT_DEATH(v.removeAt(4), "");
    v.clear();
    EXPECT_DEATH(v.itemAt(0), "");
}

}  // namespace
