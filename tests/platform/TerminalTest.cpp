// What a program asks of its own streams and of those who want it to end.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <stdlib.h>
#include <sys/ioctl.h>
#include <unistd.h>

#include <csignal>
#include <string>

#include "platform/Interrupts.h"
#include "platform/Terminal.h"

namespace platform {
namespace {

// Standard output and standard error are another file while it lives.
class Redirected {
public:
    explicit Redirected(int target) : output(dup(STDOUT_FILENO)), errors(dup(STDERR_FILENO)) {
        dup2(target, STDOUT_FILENO);
        dup2(target, STDERR_FILENO);
    }
    ~Redirected() {
        dup2(output, STDOUT_FILENO);
        dup2(errors, STDERR_FILENO);
        close(output);
        close(errors);
    }
    Redirected(const Redirected&) = delete;
    Redirected& operator=(const Redirected&) = delete;

private:
    int output;
    int errors;
};

TEST(Terminal, ToldFromOtherStreams) {
    const int master = posix_openpt(O_RDWR | O_NOCTTY);
    ASSERT_GE(master, 0);
    ASSERT_EQ(grantpt(master), 0);
    ASSERT_EQ(unlockpt(master), 0);
    const int slave = open(ptsname(master), O_RDWR | O_NOCTTY);
    ASSERT_GE(slave, 0);
    winsize size = {};
    size.ws_col = 133;
    ASSERT_EQ(ioctl(slave, TIOCSWINSZ, &size), 0);
    bool isTerminal = false;
    std::size_t columns = 0;
    {
        const Redirected here(slave);
        isTerminal = IsTerminal(StandardStream::Output) && IsTerminal(StandardStream::Errors);
        columns = TerminalColumns(StandardStream::Errors, 80);
    }
    close(slave);
    close(master);
    EXPECT_TRUE(isTerminal);
    EXPECT_EQ(columns, 133u);
}

TEST(Terminal, APipeIsNoneAndHasTheColumnsThatTheCallerNames) {
    int ends[2];
    ASSERT_EQ(pipe(ends), 0);
    bool isTerminal = true;
    std::size_t columns = 0;
    {
        const Redirected here(ends[1]);
        isTerminal = IsTerminal(StandardStream::Output) || IsTerminal(StandardStream::Errors);
        columns = TerminalColumns(StandardStream::Errors, 71);
    }
    close(ends[0]);
    close(ends[1]);
    EXPECT_FALSE(isTerminal);
    EXPECT_EQ(columns, 71u);
}

TEST(Terminal, TextsGoOutWhole) {
    int ends[2];
    ASSERT_EQ(pipe(ends), 0);
    {
        const Redirected here(ends[1]);
        WriteAtOnce(StandardStream::Errors, "one line\n");
        WriteAtOnce(StandardStream::Output, "another\n");
    }
    char text[64] = {};
    EXPECT_EQ(read(ends[0], text, sizeof text), 17);
    EXPECT_STREQ(text, "one line\nanother\n");
    close(ends[0]);
    close(ends[1]);
}

// Each in a process of its own, as the mark and the handlers are the process's.
TEST(Interrupts, TheFirstSetsAMarkAndTheSecondEndsTheProcess) {
    EXPECT_EXIT(
        {
            std::signal(SIGTERM, SIG_DFL);  // whoever runs the tests may ignore it
            CatchInterrupts();
            const bool before = IsInterrupted();
            std::raise(SIGTERM);
            std::_Exit(!before && IsInterrupted() ? 7 : 1);
        },
        testing::ExitedWithCode(7), "");
    EXPECT_EXIT(
        {
            std::signal(SIGINT, SIG_DFL);
            CatchInterrupts();
            std::raise(SIGINT);
            std::raise(SIGINT);
            std::_Exit(1);
        },
        testing::KilledBySignal(SIGINT), "");
}

TEST(Interrupts, WhatTheCallerIgnoresStaysIgnored) {
    EXPECT_EXIT(
        {
            std::signal(SIGHUP, SIG_IGN);
            CatchInterrupts();
            std::raise(SIGHUP);
            std::raise(SIGHUP);
            std::_Exit(IsInterrupted() ? 1 : 7);
        },
        testing::ExitedWithCode(7), "");
}

}  // namespace
}  // namespace platform
