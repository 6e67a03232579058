// Processes that share a queue.
#include "platform/ChildProcesses.h"

#include <gtest/gtest.h>

#include <chrono>

#include "platform/FileSystem.h"

namespace platform {
namespace {

// What all of them have written and how they ended, once none runs any more.
ChildProcesses::News WaitForAll(ChildProcesses& children) {
    ChildProcesses::News all;
    for (bool running = true; running;) {
        running = children.Running() != 0;
        const ChildProcesses::News news = children.Wait(100);
        all.output += news.output;
        all.errors += news.errors;
        all.ended.insert(all.ended.end(), news.ended.begin(), news.ended.end());
    }
    return all;
}

TEST(ChildProcesses, EachPieceReachesOneOfThem) {
    ChildProcesses children;
    ASSERT_TRUE(children.Start("/bin/sh", {"-c", "dd bs=9 2>/dev/null; echo done >&2"}, 3));
    EXPECT_EQ(children.Running(), 3u);
    std::string expected;
    for (int i = 0; i < 100; ++i) {
        expected += "12345678\n";
        EXPECT_TRUE(children.Feed("12345678\n"));
    }
    children.EndQueue();
    const ChildProcesses::News news = WaitForAll(children);
    EXPECT_EQ(news.output, expected);
    EXPECT_EQ(news.errors, "done\ndone\ndone\n");
    ASSERT_EQ(news.ended.size(), 3u);
    for (const ChildProcesses::End& end : news.ended) {
        EXPECT_EQ(end.status, 0);
        EXPECT_EQ(end.signal, 0);
    }
}

TEST(ChildProcesses, FullQueueTakesNothing) {
    ChildProcesses children;
    ASSERT_TRUE(children.Start("/bin/sleep", {"60"}, 1));
    int fed = 0;
    while (fed < 1000000 && children.Feed("12345678\n")) ++fed;
    EXPECT_GT(fed, 100);
    EXPECT_LT(fed, 1000000);
}

TEST(ChildProcesses, HowTheyEndedIsTold) {
    ChildProcesses children;
    ASSERT_TRUE(children.Start("/bin/sh", {"-c", "exit 7"}, 1));
    const auto failed = WaitForAll(children).ended;
    ASSERT_EQ(failed.size(), 1u);
    EXPECT_EQ(failed[0].status, 7);
    ChildProcesses others;
    ASSERT_TRUE(others.Start("/bin/sh", {"-c", "kill -9 $$"}, 1));
    const auto killed = WaitForAll(others).ended;
    ASSERT_EQ(killed.size(), 1u);
    EXPECT_EQ(killed[0].signal, 9);
}

TEST(ChildProcesses, TheyEndWhenTheyAreAskedTo) {
    const auto start = std::chrono::steady_clock::now();
    {
        ChildProcesses children;
        ASSERT_TRUE(children.Start("/bin/sleep", {"60"}, 2));
        children.EndAll();
        EXPECT_EQ(children.Running(), 0u);
        ChildProcesses others;
        ASSERT_TRUE(others.Start("/bin/sleep", {"60"}, 2));
    }
    EXPECT_LT(std::chrono::steady_clock::now() - start, std::chrono::seconds(20));
}

TEST(ChildProcesses, ProgramThatIsNotThereIsTold) {
    ChildProcesses children;
    EXPECT_FALSE(children.Start("/nonexistent/program", {}, 2));
    EXPECT_EQ(LastErrorText(), "No such file or directory");
    EXPECT_EQ(children.Running(), 0u);
}

}  // namespace
}  // namespace platform
