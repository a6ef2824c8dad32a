// SPDX-License-Identifier: Apache-2.0
// What kestlog follow tells when the tree was read before the changes that led to it are known.
#include <gtest/gtest.h>

#include <filesystem>

#include "kestlog/LiveTree.h"
#include "support/TestRoot.h"

TEST(LiveTreeTest, NothingIsToldTwice) {
    const std::string dir = "modem_log/2016-03-01-09-15-00/cp_wcn";
    const std::string part = ".2-cp.part";
    const std::string two = "2-cp_wcn-2016-03-01_09-00-00.log";
    const std::string three = "3-cp_wcn-2016-03-01_09-00-00.log";
    const volatile sig_atomic_t stop = 0;
    for (const std::string& seen : {two, three}) {
        TestRoot root;
        std::vector<std::string> told;
        const auto tell = [&](const LiveEvent& event) {
            told.push_back(event.json["event"].get<std::string>() + " " +
                           event.json["size"].dump());
        };
        LiveTree live(tell, &stop);
        const auto take = [&] {
            LogTree tree;
            tree.add(root.path("modem_log"));
            tree.finish();
            live.take(tree, {root.path("modem_log")});
        };
        root.write_file(dir + "/cp_wcn.version", "v");
        take();
        root.write_file(dir + "/" + seen, "x");
        take();
        std::filesystem::rename(root.path(dir + "/" + seen), root.path(dir + "/" + three));
        LiveTree::Dir* const known = live.dir(root.path(dir));
        ASSERT_TRUE(known);
        live.created(*known, part);
        live.moved(*known, part, two);
        live.moved(*known, two, three);
        live.settle();
        std::filesystem::remove(root.path(dir + "/" + three));
        live.removed(*known, three);
        live.settle();
        EXPECT_EQ(told, (std::vector<std::string>{"file 1", "deleted 1"})) << seen;
    }
}
