// A service over pyramids in a folder of the test's own, asked without a socket.
#ifndef ZMC_TESTS_SERVE_SERVEFIXTURE_H
#define ZMC_TESTS_SERVE_SERVEFIXTURE_H

#include <gtest/gtest.h>

#include <chrono>
#include <filesystem>
#include <fstream>
#include <iomanip>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "gdal/Driver.h"
#include "host/build/PyramidBuilder.h"
#include "serve/Answer.h"
#include "serve/Request.h"
#include "serve/Service.h"
#include "tests/support/MemorySource.h"
#include "tests/support/ScratchDirectory.h"

namespace zmctest {

// Settled long ago, so that answers have tags.
inline void MakeOld(const std::string& file) {
    namespace fs = std::filesystem;
    fs::last_write_time(file, fs::file_time_type::clock::now() - std::chrono::hours(1));
}

template <class T>
MemorySource<T> BuildNoise(const std::string& file, std::uint32_t width, std::uint32_t height,
                           std::uint32_t bands, unsigned seed = 1,
                           zmchost::Ordering ordering = zmchost::Ordering::Auto) {
    MemorySource<T> source(width, height, bands);
    source.FillWithNoise(seed);
    zmchost::BuildOptions options;
    options.overwrite = true;
    options.threads = 1;
    options.ordering = ordering;
    zmchost::PyramidBuilder(TestModule()).Build(source, file, options);
    MakeOld(file);
    return source;
}

// Tells GDAL, beside the file, where the raster lies; the pixels of its finest level start at the
// upper left corner and are that large.
inline void PlaceRaster(const std::string& file, const std::string& system, double west,
                        double north, double width, double height) {
    std::ofstream(file + ".aux.xml")
        << std::setprecision(17) << "<PAMDataset><SRS>" << zmcserve::Escaped(system)
        << "</SRS><GeoTransform>" << west << ',' << width << ",0," << north << ",0," << -height
        << "</GeoTransform></PAMDataset>";
    MakeOld(file + ".aux.xml");
}

class ServeTest : public testing::Test {
protected:
    ServeTest() { GDALRegister_ZMCPyramid(); }

    zmcserve::Service& Serve(bool followLinks = false) {
        service = std::make_unique<zmcserve::Service>(
            named.empty() ? std::vector<std::string>{folder.String()} : named, followLinks,
            TestModule(), limits);
        return *service;
    }

    zmcserve::Answer Ask(const std::string& target, const zmcserve::Headers& headers = {},
                         zmcserve::Method method = zmcserve::Method::Get) {
        if (!service) Serve();
        try {
            zmcserve::Request request = zmcserve::Request::Parse(method, target);
            request.headers = headers;
            request.baseUrl = "http://here";
            return service->Handle(request);
        } catch (const zmcserve::Refusal& refusal) {
            return zmcserve::ToAnswer(refusal);
        }
    }
    int Status(const std::string& target, const zmcserve::Headers& headers = {}) {
        return Ask(target, headers).status;
    }

    static std::string BytesOf(const std::string& file) {
        std::ifstream stream(file, std::ios::binary);
        return {std::istreambuf_iterator<char>(stream), {}};
    }

    const ScratchDirectory folder;
    std::vector<std::string> named;
    zmcserve::ServiceLimits limits;
    std::unique_ptr<zmcserve::Service> service;
};

}  // namespace zmctest

#endif
