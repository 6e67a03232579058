#include "coordsys/CoordSys.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <chrono>
#include <future>

#include "coordsys/CoordSysMutex.h"
#include "coordsys/CoordSysUnit.h"
#include "coordsys/Environment.h"
#include "coordsys/EnvironmentKeys.h"
#include "core/Lock.h"

namespace zelm {
namespace {

TEST(Environment, AnswersToItsOwnCodeAndToThatOfObject) {
    const Environment environment;
    EXPECT_TRUE(environment.IsKindOf(GloballyUniqueObjectTypeCode("Environment")));
    EXPECT_TRUE(environment.IsKindOf(GloballyUniqueObjectTypeCode("Object")));
    EXPECT_FALSE(environment.IsKindOf(GloballyUniqueObjectTypeCode("LockedEnvironment")));
    EXPECT_TRUE(environment.IsValid());
}

TEST(Environment, TextFormIsTheCommonOne) {
    const Environment environment;
    EXPECT_TRUE(environment.ToString() == MakeObjectUrl("Object", &environment));
}

TEST(Environment, UnknownKeyIsEmptyAndInTheTableAfterwards) {
    auto& settings = GetGlobalEnvironmentImpl().settings;
    EXPECT_EQ(settings.count("never set"), 0u);
    EXPECT_EQ(Environment().GetSetting("never set").length, 0u);
    EXPECT_EQ(settings.count("never set"), 1u);
}

TEST(Environment, KeysDifferByCase) {
    const Environment environment;
    environment.GetSetting("ZELM::Environment::PeDirectory") = "one";
    environment.GetSetting("ZELM::Environment::PEDIRECTORY") = "two";
    EXPECT_TRUE(environment.GetSetting(EnvironmentKeys::kPeDirectory) == "one");
    EXPECT_TRUE(environment.GetSetting("ZELM::Environment::PEDIRECTORY") == "two");
}

TEST(Environment, ValuesStayWhereTheyAre) {
    const Environment environment;
    String& value = environment.GetSetting("m");
    value = "kept";
    for (char key = 'a'; key <= 'z'; ++key)
        environment.GetSetting(String(std::string(1, key).c_str()));
    EXPECT_EQ(&environment.GetSetting("m"), &value);
    EXPECT_TRUE(value == "kept");
}

TEST(Environment, NullKeySortsFirst) {
    const Environment environment;
    environment.GetSetting("") = "empty";
    environment.GetSetting(String()) = "null";
    auto at = GetGlobalEnvironmentImpl().settings.begin();
    EXPECT_EQ(at->first.wide, nullptr);
    EXPECT_TRUE((++at)->second == "empty");
}

TEST(CoordSys, HasItsDefaults) {
    const CoordSys handle;
    EXPECT_EQ(handle.impl, nullptr);
    EXPECT_EQ(handle.info.firstText.length, 0u);
    EXPECT_EQ(handle.info.firstValue, 0);
    EXPECT_TRUE(handle.info.datumName == "D_Unknown");
    for (const CoordSysParameter& parameter : handle.info.parameters) {
        EXPECT_TRUE(parameter.text == "0.0");
        EXPECT_EQ(parameter.value, 0.0);
    }
    EXPECT_TRUE(handle.info.unitName == "Meter");
    EXPECT_EQ(handle.info.unitFactor, 1.0);
    EXPECT_EQ(handle.info.unitKind, 0u);
    EXPECT_EQ(handle.info.unitCode, 9001);
    EXPECT_TRUE(std::all_of(std::begin(handle.info.block), std::end(handle.info.block),
                            [](std::byte value) { return value == std::byte{0}; }));
    EXPECT_EQ(sizeof handle.info.block, 128u);
}

TEST(CoordSys, IdsCountUp) {
    const CoordSys first;
    const CoordSys second;
    EXPECT_GE(first.id, 1u);
    EXPECT_EQ(second.id, first.id + 1);
}

TEST(CoordSys, UnboundHandleDoesNotTouchTheFactory) {
    { const CoordSys handle; }
    EXPECT_EQ(gpCoordSysFactoryInstance, nullptr);
    EXPECT_EQ(gpCoordSysMutex, nullptr);
}

TEST(CoordSysMutex, IsMadeOnceAndCanBeEnteredAgain) {
    EnsureCoordSysSection();
    CRITICAL_SECTION* const section = CoordSysSection();
    ASSERT_NE(section, nullptr);
    EnsureCoordSysSection();
    EXPECT_EQ(CoordSysSection(), section);
    const auto outer = HoldLock(section);
    const auto inner = HoldLock(section);
    EXPECT_NE(inner, nullptr);
}

// The module has such a handle, and is unloaded while others may be at work on the engine.
TEST(CoordSysMutex, UnboundHandleDoesNotWaitForIt) {
    EnsureCoordSysSection();
    auto held = HoldLock(CoordSysSection());
    const auto gone = std::async(std::launch::async, [] { const CoordSys handle; });
    EXPECT_EQ(gone.wait_for(std::chrono::seconds(2)), std::future_status::ready);
    held.reset();
}

TEST(CoordSysUnit, TableHasSeventeenRowsAndAnEndMark) {
    for (int row = 0; row < 16; ++row) EXPECT_FALSE(kCoordSysUnits[row].name == "THE_END") << row;
    const CoordSysUnit& end = kCoordSysUnits[16];
    EXPECT_TRUE(end.name == "THE_END");
    EXPECT_TRUE(end.label == "");
    EXPECT_EQ(end.factor, 0.0);
    EXPECT_EQ(end.kind, 1u);
    EXPECT_EQ(end.code, -1);
    EXPECT_TRUE(kCoordSysUnits[4].label == "US Survey Feet");
    EXPECT_EQ(kCoordSysUnits[14].factor, 0.0027777777777778);
}

}  // namespace
}  // namespace zelm
