#include "raster/RasterProps.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <iterator>
#include <stdexcept>
#include <utility>

#include "core/ObjectCodes.h"
#include "tests/support/CountingGeoRef.h"

namespace zelm {
namespace {

using zmctest::CountingGeoRef;

CountingGeoRef& GeoRefOf(const RasterProps& props) {
    return static_cast<CountingGeoRef&>(*props.geoRef);
}

RasterProps Filled() {
    RasterProps props;
    props.samples = 10;
    props.lines = 20;
    props.bands = 3;
    props.tileSamples = 256;
    props.tileLines = 128;
    for (std::uint32_t i = 0; i < 6; ++i) props.reserved[i] = 100 + i;
    props.interleave = 2;
    props.pixelType = 4;
    props.formatName = "Pyramid";
    props.noDataValues = {{0, -1.0}, {2, 5.5}};
    props.SetGeoRef(GeoRefPtr(new CountingGeoRef));
    return props;
}

TEST(RasterProps, DefaultsAreNeutralAndNotValid) {
    const RasterProps props;
    EXPECT_TRUE(props.noDataValues.empty());
    for (const std::uint32_t field :
         {props.samples, props.lines, props.bands, props.tileSamples, props.tileLines})
        EXPECT_EQ(field, 0u);
    for (const std::uint32_t field : props.reserved) EXPECT_EQ(field, 0u);
    EXPECT_EQ(props.interleave, -1);
    EXPECT_EQ(props.pixelType, 0u);
    EXPECT_TRUE(props.formatName == "Unknown");
    EXPECT_FALSE(props.geoRef);
    EXPECT_TRUE(props.metadata.impl);
    EXPECT_FALSE(props.IsValid());
}

TEST(RasterProps, ValidNeedsBothPixelTypeAndFormat) {
    RasterProps props;
    props.formatName = "Pyramid";
    EXPECT_FALSE(props.IsValid());
    props.formatName = "Unknown";
    props.pixelType = 1;
    EXPECT_FALSE(props.IsValid());
    props.formatName = "Pyramid";
    EXPECT_TRUE(props.IsValid());
    props.formatName = "";
    EXPECT_TRUE(props.IsValid());
}

TEST(RasterProps, TypeCodeIsThatOfItsWord) {
    EXPECT_EQ(RasterProps::typeCode, GloballyUniqueObjectTypeCode("RasterProps"));
}

TEST(RasterProps, BandsBeyondTheCountAreIgnored) {
    RasterProps props;
    props.bands = 3;
    props.SetNoDataFlag(5, true);
    props.SetNoDataFlag(3, true);
    props.SetNoDataValue(3, 1.0);
    EXPECT_TRUE(props.noDataValues.empty());
    props.noDataValues[7] = 1.0;
    EXPECT_FALSE(props.HasNoDataValue(7));
    props.SetNoDataFlag(7, false);
    EXPECT_EQ(props.noDataValues.count(7), 1u);
}

TEST(RasterProps, FlagKeepsAnExistingValue) {
    RasterProps props;
    props.bands = 3;
    props.SetNoDataValue(1, 7.0);
    props.SetNoDataFlag(1, true);
    EXPECT_EQ(props.GetNoDataValue(1), 7.0);
    props.SetNoDataFlag(2, true);
    EXPECT_TRUE(props.HasNoDataValue(2));
    EXPECT_EQ(props.GetNoDataValue(2), 0.0);
    props.SetNoDataFlag(1, false);
    EXPECT_FALSE(props.HasNoDataValue(1));
}

TEST(RasterProps, AskingForAnAbsentValueMakesIt) {
    RasterProps props;
    props.bands = 2;
    props.GetNoDataValue(1) = 4.0;
    EXPECT_TRUE(props.HasNoDataValue(1));
    EXPECT_EQ(props.GetNoDataValue(0), 0.0);
    EXPECT_TRUE(props.HasNoDataValue(0));
    const RasterProps constant(props);
    EXPECT_EQ(constant.GetNoDataValue(9), 0.0);
    EXPECT_EQ(constant.noDataValues.size(), 2u);
}

TEST(RasterProps, NoBandsMeansNoValues) {
    RasterProps props = Filled();
    props.SetBands(2);
    EXPECT_EQ(props.noDataValues.size(), 2u);
    props.SetBands(0);
    EXPECT_TRUE(props.noDataValues.empty());
}

TEST(RasterProps, TakesNoDataValuesBandByBand) {
    RasterProps props;
    props.bands = 3;
    props.noDataValues = {{0, 1.0}, {2, 3.0}};
    RasterProps source;
    source.bands = 2;
    source.noDataValues = {{1, 9.0}, {2, 8.0}};  // band 2 is not one of the source's
    props.TakeNoDataValues(source);
    EXPECT_EQ(props.noDataValues, (std::map<std::uint32_t, double>{{1, 9.0}}));
}

void ExpectSameFields(const RasterProps& a, const RasterProps& b) {
    EXPECT_EQ(a.noDataValues, b.noDataValues);
    EXPECT_EQ(a.samples, b.samples);
    EXPECT_EQ(a.lines, b.lines);
    EXPECT_EQ(a.bands, b.bands);
    EXPECT_EQ(a.tileSamples, b.tileSamples);
    EXPECT_EQ(a.tileLines, b.tileLines);
    EXPECT_TRUE(std::equal(std::begin(a.reserved), std::end(a.reserved), std::begin(b.reserved)));
    EXPECT_EQ(a.interleave, b.interleave);
    EXPECT_EQ(a.pixelType, b.pixelType);
    EXPECT_TRUE(a.formatName == b.formatName);
    EXPECT_EQ(a.metadata.impl.Get(), b.metadata.impl.Get());
}

TEST(RasterProps, CopyHasItsOwnGeoRefAndSharesTheTree) {
    {
        const RasterProps props = Filled();
        const RasterProps copy(props);
        ExpectSameFields(copy, props);
        ASSERT_TRUE(copy.geoRef);
        EXPECT_NE(copy.geoRef.Get(), props.geoRef.Get());
        EXPECT_EQ(GeoRefOf(copy).samples, 10u);
        EXPECT_EQ(GeoRefOf(copy).tellings, 1);  // cloned, not told again
        EXPECT_EQ(props.geoRef.record->count, 1u);
        EXPECT_EQ(CountingGeoRef::living, 2);
    }
    EXPECT_EQ(CountingGeoRef::living, 0);
}

TEST(RasterProps, AssignmentHasItsOwnGeoRefAndSharesTheTree) {
    {
        const RasterProps props = Filled();
        RasterProps target = Filled();
        target = props;
        ExpectSameFields(target, props);
        EXPECT_NE(target.geoRef.Get(), props.geoRef.Get());
        EXPECT_EQ(CountingGeoRef::living, 2);
        target = RasterProps();
        EXPECT_FALSE(target.geoRef);
        ASSERT_NE(target.geoRef.record, nullptr);
        EXPECT_EQ(CountingGeoRef::living, 1);
    }
    EXPECT_EQ(CountingGeoRef::living, 0);
}

TEST(RasterProps, AssignmentWhoseCloneThrowsChangesNothing) {
    {
        RasterProps source = Filled();
        source.samples = 77;
        source.noDataValues.clear();
        source.formatName = "MemoryRaster";
        RasterProps target = Filled();
        const RasterProps before(target);
        const GeoRef* const held = target.geoRef.Get();
        {
            const zmctest::ThrowingClones throwing;
            EXPECT_THROW(target = source, std::runtime_error);
            EXPECT_THROW(static_cast<void>(RasterProps(source)), std::runtime_error);
            EXPECT_THROW(target.SetGeoRef(source.geoRef), std::runtime_error);
        }
        ExpectSameFields(target, before);
        EXPECT_EQ(target.geoRef.Get(), held);
        EXPECT_EQ(source.geoRef.record->count, 1u) << "nobody shares it";
    }
    EXPECT_EQ(CountingGeoRef::living, 0);
}

TEST(RasterProps, AGeoRefThatRefusesItsSizeLeavesTheRecordAsItWas) {
    {
        RasterProps props = Filled();
        const GeoRef* const held = props.geoRef.Get();
        CountingGeoRef::sizeThrows = true;
        EXPECT_THROW(props.SetSamples(1), std::runtime_error);
        EXPECT_THROW(props.SetLines(1), std::runtime_error);
        EXPECT_THROW(props.SetGeoRef(props.geoRef), std::runtime_error);
        CountingGeoRef::sizeThrows = false;
        EXPECT_EQ(props.samples, 10u);
        EXPECT_EQ(props.lines, 20u);
        EXPECT_EQ(props.geoRef.Get(), held);
    }
    EXPECT_EQ(CountingGeoRef::living, 0);
}

TEST(RasterProps, MovingTakesTheGeoRefWithoutCloningIt) {
    RasterProps source = Filled();
    const GeoRef* const held = source.geoRef.Get();
    const zmctest::ThrowingClones throwing;
    RasterProps moved(std::move(source));
    EXPECT_EQ(moved.geoRef.Get(), held);
    EXPECT_EQ(moved.noDataValues.size(), 2u);
    RasterProps target;
    target = std::move(moved);
    EXPECT_EQ(target.geoRef.Get(), held);
    EXPECT_EQ(target.samples, 10u);
    EXPECT_TRUE(target.formatName == "Pyramid");
    EXPECT_EQ(held, target.geoRef.Get());
}

TEST(RasterProps, SelfAssignmentChangesNothing) {
    RasterProps props = Filled();
    const GeoRef* const geoRef = props.geoRef.Get();
    const RasterProps& same = props;
    props = same;
    EXPECT_EQ(props.geoRef.Get(), geoRef);
    EXPECT_TRUE(props.formatName == "Pyramid");
}

TEST(RasterProps, SetGeoRefTakesACloneAndTellsItTheSize) {
    RasterProps props;
    props.samples = 4;
    props.lines = 5;
    GeoRefPtr original(new CountingGeoRef);
    props.SetGeoRef(original);
    EXPECT_NE(props.geoRef.Get(), original.Get());
    EXPECT_EQ(original.record->count, 1u);
    EXPECT_EQ(GeoRefOf(props).samples, 4u);
    EXPECT_EQ(GeoRefOf(props).lines, 5u);
    EXPECT_EQ(static_cast<CountingGeoRef&>(*original).tellings, 0);
    props.SetGeoRef(GeoRefPtr());
    EXPECT_FALSE(props.geoRef);
    EXPECT_NE(props.geoRef.record, nullptr);
}

TEST(RasterProps, SetGeoRefFromItself) {
    RasterProps props = Filled();
    props.SetGeoRef(props.geoRef);
    ASSERT_TRUE(props.geoRef);
    EXPECT_EQ(CountingGeoRef::living, 1);
    EXPECT_EQ(GeoRefOf(props).tellings, 2);
}

TEST(RasterProps, EachChangeOfSizeIsToldOnce) {
    RasterProps props = Filled();
    props.SetSamples(30);
    EXPECT_EQ(GeoRefOf(props).tellings, 2);
    EXPECT_EQ(GeoRefOf(props).samples, 30u);
    EXPECT_EQ(GeoRefOf(props).lines, 20u);
    props.SetLines(40);
    EXPECT_EQ(GeoRefOf(props).tellings, 3);
    EXPECT_EQ(GeoRefOf(props).lines, 40u);
}

}  // namespace
}  // namespace zelm
