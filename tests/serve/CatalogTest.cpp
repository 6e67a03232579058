// Which names reach which files, and that no name reaches another.
#include "serve/Catalog.h"

#include <sys/stat.h>
#include <unistd.h>

#include "tests/serve/ServeFixture.h"
#include "tests/support/FailureOf.h"

namespace zmcserve {
namespace {

namespace fs = std::filesystem;
using zmctest::BuildNoise;
using zmctest::FailureOf;
using Names = std::vector<std::string>;

class CatalogTest : public zmctest::ServeTest {
protected:
    CatalogTest() {
        fs::create_directories(inside + "/sub/deep");
        fs::create_directories(outside);
        BuildNoise<unsigned char>(inside + "/a.pyr", 40, 30, 1);
        BuildNoise<unsigned char>(inside + "/sub/deep/b.pyr", 40, 30, 1, 2);
        BuildNoise<unsigned char>(outside + "/secret.pyr", 40, 30, 1, 3);
        std::ofstream(inside + "/text.txt") << "no pyramid";
        named = {inside};
    }
    const std::string inside = folder / "inside";
    const std::string outside = folder / "outside";
};

TEST_F(CatalogTest, AFolderIsListedAnewAndHoldsPyramidsAlone) {
    EXPECT_EQ(Serve().catalog.List().names, (Names{"a.pyr", "sub/deep/b.pyr"}));
    fs::copy_file(inside + "/a.pyr", inside + "/sub/c.pyr");
    fs::remove(inside + "/a.pyr");
    EXPECT_EQ(service->catalog.List().names, (Names{"sub/c.pyr", "sub/deep/b.pyr"}));
}

TEST_F(CatalogTest, NamesAreLookedUpAtEachRequest) {
    EXPECT_EQ(Status("/files/sub/deep/b.pyr"), 200);
    EXPECT_EQ(Status("/files/sub%2Fdeep%2Fb.pyr"), 200);
    fs::rename(inside + "/sub/deep", inside + "/sub/other");
    EXPECT_EQ(Status("/files/sub/deep/b.pyr"), 404);
    EXPECT_EQ(Status("/files/sub/other/b.pyr"), 200);
    EXPECT_EQ(Status("/files/text.txt"), 404);
    EXPECT_EQ(Status("/files/sub"), 404);
}

TEST_F(CatalogTest, NoEncodingOfTheFolderAboveLeavesTheFolder) {
    for (const char* const name :
         {"../outside/secret.pyr", "%2e%2e/outside/secret.pyr", "..%2foutside%2fsecret.pyr",
          "sub/../../outside/secret.pyr", "sub%2f..%2f..%2foutside/secret.pyr", "./a.pyr", "",
          "/a.pyr", "a.pyr/", "sub//deep/b.pyr", ".%2e/outside/secret.pyr", "a.pyr%00", "..", "%00",
          ".hidden"})
        EXPECT_EQ(Status(std::string("/files/") + name), 400) << name;
    for (const char* const name :
         {"%252e%252e/outside/secret.pyr", "..%c0%af..%c0%afoutside/secret.pyr"}) {
        const int status = Status(std::string("/files/") + name);
        EXPECT_TRUE(status == 404 || status == 400) << name;
    }
    EXPECT_EQ(Status("/files/sub%5c..%5c..%5csecret.pyr"), 404);
    EXPECT_EQ(Status("/files" + outside + "/secret.pyr"), 404);
    EXPECT_EQ(Status("/files/" + outside + "/secret.pyr"), 400);
}

TEST_F(CatalogTest, LinksThatLeaveTheFolderAreRefusedUnlessTheyAreToBeFollowed) {
    fs::create_symlink(outside + "/secret.pyr", inside + "/absolute.pyr");
    fs::create_symlink("../outside/secret.pyr", inside + "/relative.pyr");
    fs::create_directory_symlink("../outside", inside + "/linked");
    fs::create_symlink("sub/deep/b.pyr", inside + "/within.pyr");
    for (const char* const name : {"absolute.pyr", "relative.pyr", "linked/secret.pyr"})
        EXPECT_EQ(Status(std::string("/files/") + name), 403) << name;
    EXPECT_EQ(Status("/files/within.pyr"), 200);
    EXPECT_EQ(service->catalog.List().names, (Names{"a.pyr", "sub/deep/b.pyr", "within.pyr"}));
    Serve(true);
    for (const char* const name : {"absolute.pyr", "relative.pyr", "linked/secret.pyr"})
        EXPECT_EQ(Status(std::string("/files/") + name), 200) << name;
}

TEST_F(CatalogTest, ALinkThatASidecarIsIsNotFollowedOutOfTheFolder) {
    std::ofstream(outside + "/other.xml")
        << "<PAMDataset><GeoTransform>7,1,0,9,0,-1</GeoTransform></PAMDataset>";
    fs::create_symlink("../outside/other.xml", inside + "/a.pyr.aux.xml");
    EXPECT_EQ(Ask("/info/a.pyr").Text().find("\"geoTransform\":[7.0"), std::string::npos);
    Serve(true);
    EXPECT_NE(Ask("/info/a.pyr").Text().find("\"geoTransform\":[7.0"), std::string::npos);
}

TEST_F(CatalogTest, ASidecarIsHandedOutWithItsRasterAlone) {
    EXPECT_EQ(Status("/files/a.pyr.aux.xml"), 204);
    const std::string text = "<PAMDataset/>";
    for (const char* const name : {"a.pyr.aux.xml", "note.txt.aux.xml", "none.pyr.aux.xml"})
        std::ofstream(inside + '/' + name) << text;
    std::ofstream(inside + "/note.txt") << "no pyramid";
    zmctest::MakeOld(inside + "/a.pyr.aux.xml");
    const Answer sidecar = Ask("/files/a.pyr.aux.xml");
    EXPECT_EQ(sidecar.status, 200);
    EXPECT_EQ(sidecar.type, "application/xml");
    EXPECT_EQ(sidecar.Text(), text);
    EXPECT_EQ(
        Status("/files/a.pyr.aux.xml", {{"If-None-Match", std::string(sidecar.Header("ETag"))}}),
        304);
    EXPECT_EQ(Status("/files/note.txt.aux.xml"), 404);
    EXPECT_EQ(Status("/files/none.pyr.aux.xml"), 404);
    EXPECT_EQ(Status("/files/.aux.xml"), 400);
    fs::remove(inside + "/a.pyr.aux.xml");
    std::ofstream(outside + "/other.xml") << text;
    fs::create_symlink("../outside/other.xml", inside + "/a.pyr.aux.xml");
    EXPECT_EQ(Status("/files/a.pyr.aux.xml"), 204);
}

TEST_F(CatalogTest, FilesThatAreNamedAreServedByTheirOwnNames) {
    fs::create_symlink(outside + "/secret.pyr", folder / "link.pyr");
    named = {inside + "/sub/deep/b.pyr", folder / "link.pyr"};
    EXPECT_EQ(Serve().catalog.List().names, (Names{"b.pyr", "link.pyr"}));
    EXPECT_EQ(Status("/files/b.pyr"), 200);
    EXPECT_EQ(Status("/files/link.pyr"), 200);
    EXPECT_EQ(Status("/files/a.pyr"), 404);
}

TEST_F(CatalogTest, NamesOfOtherKindsOfSourcesAreNeverServed) {
    for (const char* const name :
         {"/vsimem/a.pyr", "/vsicurl/http://127.0.0.1:1/a.pyr", "MEM:::DATAPOINTER=1", "nothing"}) {
        named = {name};
        EXPECT_NE(FailureOf([&] { Serve(); }), "no failure") << name;
    }
    named = {inside};
    Serve();
    for (const char* const name :
         {"vsimem/a.pyr", "http:%2f%2f127.0.0.1:1%2fa.pyr", "MEM:::DATAPOINTER=140000000000",
          "PIXELDATA=0x1000;SAMPLES=1;LINES=1;BANDS=1"}) {
        const int status = Status(std::string("/info/") + name);
        EXPECT_TRUE(status == 404 || status == 400) << name;
    }
}

TEST_F(CatalogTest, TwoFilesOfOneNameAreRefusedWhenItStarts) {
    named = {inside + "/a.pyr", inside + "/sub/../a.pyr"};
    EXPECT_NE(FailureOf([&] { Serve(); }).find("another file of that name"), std::string::npos);
}

TEST_F(CatalogTest, WhatIsNoRegularFileIsNothing) {
    ASSERT_EQ(mkfifo((inside + "/pipe.pyr").c_str(), 0600), 0);
    EXPECT_EQ(Status("/files/pipe.pyr"), 404);
    EXPECT_EQ(Serve().catalog.List().names, (Names{"a.pyr", "sub/deep/b.pyr"}));
}

TEST_F(CatalogTest, AFileThatIsReplacedIsAnotherRaster) {
    Serve();
    const ServedRasterPtr before = service->catalog.Raster("a.pyr");
    EXPECT_EQ(service->catalog.Raster("a.pyr"), before);
    EXPECT_EQ(service->catalog.RasterIfOpen("a.pyr"), before);
    BuildNoise<unsigned char>(inside + "/a.pyr", 50, 30, 1, 9);
    EXPECT_EQ(service->catalog.RasterIfOpen("a.pyr"), nullptr);
    const ServedRasterPtr after = service->catalog.Raster("a.pyr");
    EXPECT_NE(after, before);
    EXPECT_EQ(after->Header().width, 50u);
    EXPECT_NE(after->ETag(), before->ETag());
    // What is under way goes on with the file that it began with.
    unsigned char pixel = 0;
    before->Borrow({})->Pixels().Read(0, {39, 0, 1, 1}, std::vector<std::uint32_t>{0}, &pixel);
    before->File().CheckUnchanged();
}

TEST_F(CatalogTest, AChangedSidecarIsAnotherRaster) {
    const std::string tag(Ask("/info/a.pyr").Header("ETag"));
    std::ofstream(inside + "/a.pyr.aux.xml")
        << "<PAMDataset><GeoTransform>7,1,0,9,0,-1</GeoTransform></PAMDataset>";
    const Answer after = Ask("/info/a.pyr");
    EXPECT_NE(after.Header("ETag"), tag);
    EXPECT_NE(after.Text().find("\"geoTransform\":[7.0"), std::string::npos);
}

TEST_F(CatalogTest, RastersThatAreKeptOpenAreBounded) {
    for (std::size_t i = 0; i < Catalog::kMostHeld + 5; ++i)
        fs::copy_file(inside + "/a.pyr", inside + "/c" + std::to_string(i) + ".pyr");
    for (std::size_t i = 0; i < Catalog::kMostHeld + 5; ++i)
        zmctest::MakeOld(inside + "/c" + std::to_string(i) + ".pyr");
    Serve();
    for (std::size_t i = 0; i < Catalog::kMostHeld + 5; ++i)
        service->catalog.Raster("c" + std::to_string(i) + ".pyr");
    EXPECT_EQ(service->catalog.RasterIfOpen("c4.pyr"), nullptr);
    EXPECT_NE(service->catalog.RasterIfOpen("c5.pyr"), nullptr);
}

TEST_F(CatalogTest, AFileOfAMomentAgoHasNoTagAndIsKeptByNobody) {
    fs::copy_file(inside + "/a.pyr", inside + "/new.pyr");
    fs::last_write_time(inside + "/new.pyr", fs::file_time_type::clock::now());
    const Answer answer = Ask("/files/new.pyr");
    EXPECT_EQ(answer.status, 200);
    EXPECT_EQ(answer.Header("ETag"), "");
    EXPECT_EQ(answer.Header("Cache-Control"), "no-store");
}

TEST_F(CatalogTest, AFileThatIsWrittenToWhileItIsReadIsAnswered503) {
    Serve();
    const ServedFilePtr file = service->catalog.File("a.pyr");
    std::ofstream(inside + "/a.pyr", std::ios::app | std::ios::binary) << "more";
    EXPECT_THROW(file->CheckUnchanged(), Refusal);
}

}  // namespace
}  // namespace zmcserve
