#include "coordsys/CoordSysFactory.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <filesystem>
#include <sstream>

#include "tests/coordsys/ProbeRun.h"

namespace zelm {
namespace {

using testing::HasSubstr;
using testing::Not;
using zmctest::ChildResult;
using zmctest::ReadText;
using zmctest::ScratchDirectory;

const std::string kRule = ";" + std::string(77, '-');

class CoordSysFactoryRun : public testing::Test {
protected:
    CoordSysFactoryRun() { WriteControlLine(scratch, "0110,0000,0000,0000"); }

    std::string Pe() const { return scratch.String(); }
    // The messages of the log, without time and numbers, each in brackets.
    std::string Messages() const {
        std::istringstream log(ReadText(scratch / "logs/zmcpe_pe_1.log"));
        constexpr std::size_t kFrame = 24 + 2 + 5 + 2 + 5 + 2;
        std::string messages;
        for (std::string line; std::getline(log, line);)
            messages.append("[").append(line, kFrame, line.size() - kFrame - 1).append("]");
        return messages;
    }
    std::string Opening() const {
        return "[" + kRule + "][CoordSysFactory::Init - pedata directory (" + Pe() + ").]";
    }

    ScratchDirectory scratch;
};

TEST_F(CoordSysFactoryRun, WithoutSettingsTheFactoryStandsWithoutEngine) {
    const ChildResult result = RunProbe({"factory", "-", "-", "-"});
    EXPECT_EQ(result.err, "factory=1 module=0 pointers=0000 mutex=0 log=0\ninit=1\n");
}

TEST_F(CoordSysFactoryRun, WholeEngineIsLoadedAndInitialised) {
    const ChildResult result = RunProbe({"factory", StubDirectory(0), Pe(), "/gdal"});
    EXPECT_EQ(result.err, "Initialize(" + Pe() +
                              ",/gdal)\nfactory=1 module=1 pointers=1111 mutex=1 log=1\n"
                              "Initialize(" +
                              Pe() + ",/gdal)\ninit=1\n");
    const std::string once = Opening() + "[CoordSysFuncPtrs::LoadFuncPtrs - " + StubDirectory(0) +
                             "/libzmcpe.so loaded.]";
    EXPECT_EQ(Messages(), once + once);
}

TEST_F(CoordSysFactoryRun, MissingSettingsAreNotSet) {
    const ChildResult result = RunProbe({"factory", StubDirectory(0), "-", ""});
    EXPECT_THAT(result.err, HasSubstr("Initialize(Not Set,Not Set)"));
    EXPECT_THAT(result.err, HasSubstr("log=0"));
}

// Whoever starts the process has a folder of that name, with an engine and a log that is on.
TEST_F(CoordSysFactoryRun, WhatIsNotSetIsNoFolderBelowTheWorkingDirectory) {
    const std::filesystem::path trap = scratch / "Not Set";
    std::filesystem::create_directory(trap);
    std::filesystem::copy_file(StubDirectory(0) + "/libzmcpe.so", trap / "libzmcpe.so");
    zmctest::WriteText(trap / "pelog.txt", "# notes\n0110,0000,0000,0000\n");
    const ChildResult result =
        zmctest::RunChild({"sh", "-c", "cd \"$0\" && exec \"$@\"", scratch.String(),
                           ZMC_COORDSYS_PROBE, "factory", "-", "-", "-"});
    EXPECT_EQ(result.err, "factory=1 module=0 pointers=0000 mutex=0 log=0\ninit=1\n");
    EXPECT_FALSE(std::filesystem::exists(trap / "logs"));
}

TEST_F(CoordSysFactoryRun, MissingLibraryIsLogged) {
    const ChildResult result = RunProbe({"factory", "/nowhere", Pe(), "-"});
    EXPECT_THAT(result.err, HasSubstr("factory=1 module=0 pointers=0000 mutex=0 log=1\ninit=1"));
    const std::string once = Opening() + "[CoordSysFuncPtrs::LoadFuncPtrs - error invalid path.]";
    EXPECT_EQ(Messages(), once + once);
}

TEST_F(CoordSysFactoryRun, FileThatIsNoLibraryIsLogged) {
    zmctest::WriteText(scratch / "libzmcpe.so", "not a library");
    const ChildResult result = RunProbe({"factory", Pe(), Pe(), "-"});
    EXPECT_THAT(result.err, HasSubstr("factory=1 module=0 pointers=0000 mutex=0 log=1\ninit=1"));
    EXPECT_THAT(
        Messages(),
        HasSubstr(Opening() + "[CoordSysFuncPtrs::LoadFuncPtrs - error loading zmcpe dll.]"));
}

// The library stays, and so do the entry points in front of the missing one. A second Init finds
// the library loaded and fetches nothing.
TEST_F(CoordSysFactoryRun, EachMissingEntryPointInTurn) {
    const char* const pointers[] = {"", "0000", "1000", "1100", "1110"};
    for (int lacks = 1; lacks <= 4; ++lacks) {
        std::filesystem::remove_all(scratch / "logs");
        const ChildResult result = RunProbe({"factory", StubDirectory(lacks), Pe(), "-"});
        EXPECT_THAT(result.err, HasSubstr(std::string("factory=1 module=1 pointers=") +
                                          pointers[lacks] + " mutex=0 log=1"));
        EXPECT_THAT(result.err, HasSubstr("init=1"));
        EXPECT_EQ(result.err.find("Initialize(") != std::string::npos, lacks != 1);
        EXPECT_THAT(Messages(),
                    HasSubstr(Opening() +
                              "[CoordSysFuncPtrs::LoadFuncPtrs - error did not find zmcpe "
                              "function.]" +
                              Opening() + "[CoordSysFuncPtrs::LoadFuncPtrs - "));
        EXPECT_THAT(Messages(), HasSubstr("/libzmcpe.so loaded.]"));
    }
}

TEST_F(CoordSysFactoryRun, SecondLoadFetchesNothingAndLogsAgain) {
    const ChildResult result = RunProbe({"twice", StubDirectory(0), Pe()});
    EXPECT_EQ(result.err, "first=1 second=1 fetched=0\n");
    const std::string loaded =
        "[CoordSysFuncPtrs::LoadFuncPtrs - " + StubDirectory(0) + "/libzmcpe.so loaded.]";
    EXPECT_EQ(Messages(), loaded + loaded);
}

TEST_F(CoordSysFactoryRun, LastReferenceGoesBackToTheEngine) {
    EXPECT_THAT(RunProbe({"chain", StubDirectory(0), Pe(), "1", "1"}).err,
                HasSubstr(")\nhandle\nRelease\nfactory"));
}

TEST_F(CoordSysFactoryRun, EarlierReferencesKeepTheObject) {
    EXPECT_THAT(RunProbe({"chain", StubDirectory(0), Pe(), "3", "3"}).err,
                HasSubstr(")\nhandle\nhandle\nhandle\nRelease\nfactory"));
}

TEST_F(CoordSysFactoryRun, EngineMayDestroyACoordSysInsideARelease) {
    EXPECT_THAT(RunProbe({"chain", StubDirectory(0), Pe(), "99", "1"}).err,
                HasSubstr(")\nhandle\nRelease\nRelease\nfactory"));
}

// The lonely object of the probe keeps a reference in the eyes of the stand-in, which thus leaves
// it alone; what counts is that the engine was asked.
TEST_F(CoordSysFactoryRun, FirstReleaseLoadsTheEngine) {
    const ChildResult result = RunProbe({"first", StubDirectory(0), Pe()});
    EXPECT_EQ(result.err, "factory=0 module=0 pointers=0000 mutex=0 log=0\nInitialize(" + Pe() +
                              ",Not Set)\nRelease\n"
                              "factory=1 module=1 pointers=1111 mutex=1 log=1\n");
}

TEST_F(CoordSysFactoryRun, FirstReleaseWithoutAnEngineIsHarmless) {
    const ChildResult result = RunProbe({"first", "/nowhere", Pe()});
    EXPECT_EQ(result.err,
              "factory=0 module=0 pointers=0000 mutex=0 log=0\n"
              "factory=1 module=0 pointers=0000 mutex=0 log=1\n");
}

// They are the process's, and another loader may have set them.
TEST_F(CoordSysFactoryRun, DeletedFactoryLeavesTheEntryPoints) {
    EXPECT_THAT(RunProbe({"unload", StubDirectory(0), Pe()}).err,
                HasSubstr("factory=0 module=0 pointers=1111 mutex=1"));
}

TEST_F(CoordSysFactoryRun, SecondLoaderLeavesTheEngineOfTheFirstInUse) {
    EXPECT_THAT(RunProbe({"second", StubDirectory(0), Pe()}).err,
                HasSubstr("pointers=1111 mutex=1 log=1\nhandle\nRelease\n"));
}

// Nobody knows of that factory, so nobody may call into the library that went with it.
TEST_F(CoordSysFactoryRun, FactoryThatFailsToStartTakesItsEntryPointsAlong) {
    const ChildResult result = RunProbe({"retry", StubDirectory(5), Pe()});
    EXPECT_EQ(result.err,
              "Initialize throws\nfactory=0 module=0 pointers=0000 mutex=1 log=1\n"
              "factory=1 module=0 pointers=0000 mutex=1 log=1\n");
}

}  // namespace
}  // namespace zelm
