// What a program asks of its own streams and of those who want it to end.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <stdlib.h>
#include <sys/ioctl.h>
#include <sys/resource.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <cstdio>
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

// Each in a process of its own, whose streams these are.
TEST(Terminal, StreamsThatAreMissingAreHeldAndStillFail) {
    for (const int closed : {STDIN_FILENO, STDOUT_FILENO, STDERR_FILENO})
        EXPECT_EXIT(
            {
                close(closed);
                const bool held = HoldStandardStreams();
                const int next = open("/dev/null", O_RDWR);
                char byte = 0;
                const bool fails = closed == STDIN_FILENO ? read(closed, &byte, 1) == -1
                                                          : write(closed, &byte, 1) == -1;
                _exit(held && next > STDERR_FILENO && fails ? 7 : 1);
            },
            testing::ExitedWithCode(7), "");
    EXPECT_EXIT(
        {
            for (const int number : {STDIN_FILENO, STDOUT_FILENO, STDERR_FILENO}) close(number);
            const bool held = HoldStandardStreams();
            _exit(held && open("/dev/null", O_RDWR) > STDERR_FILENO ? 7 : 1);
        },
        testing::ExitedWithCode(7), "");
}

TEST(Terminal, StreamsThatAreThereStayAsTheyAre) {
    int ends[2];
    ASSERT_EQ(pipe(ends), 0);
    EXPECT_EXIT(
        {
            dup2(ends[1], STDOUT_FILENO);
            const bool held = HoldStandardStreams();
            _exit(held && write(STDOUT_FILENO, "x", 1) == 1 ? 7 : 1);
        },
        testing::ExitedWithCode(7), "");
    char byte = 0;
    EXPECT_EQ(read(ends[0], &byte, 1), 1);
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

TEST(Interrupts, AFileThatGrowsTooLargeFailsItsWrite) {
    EXPECT_EXIT(
        {
            std::signal(SIGXFSZ, SIG_DFL);
            CatchInterrupts();
            rlimit limit{};
            limit.rlim_cur = limit.rlim_max = 4;
            setrlimit(RLIMIT_FSIZE, &limit);
            std::FILE* const file = std::tmpfile();
            const bool first = write(fileno(file), "text", 4) == 4;
            const bool second = write(fileno(file), "more", 4) == -1 && errno == EFBIG;
            _exit(first && second && !IsInterrupted() ? 7 : 1);
        },
        testing::ExitedWithCode(7), "");
}

}  // namespace
}  // namespace platform
