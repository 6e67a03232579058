// What the example hosts share: the module as a host loads it, the geoid grid as GDAL reads it, and
// a picture of heights.
#ifndef ZMC_EXAMPLES_EXAMPLES_H
#define ZMC_EXAMPLES_EXAMPLES_H

#include <cstdint>
#include <string>
#include <vector>

#include "connection/DataConnectionFactory.h"
#include "connection/RasterDataConnection.h"

namespace examples {

// The loaded module and a factory for one kind of connection. Ends the process with a message when
// the module cannot be loaded or serves no such kind; the module stays loaded to the end.
class Host {
public:
    Host(const char* modulePath, const char* kind);
    ~Host();
    Host(const Host&) = delete;
    Host& operator=(const Host&) = delete;
    zelm::DataConnectionFactory& Factory() { return *factory; }

private:
    zelm::DataConnectionFactory* factory = nullptr;
    void (*deleteFactory)(zelm::DataConnectionFactory*) = nullptr;
};

// Prints the text on the standard error stream and ends the process with status 1.
[[noreturn]] void Fail(const std::string& text);

// Heights in metres, rows from the north, columns from the west.
struct Heights {
    std::uint32_t width = 0;
    std::uint32_t height = 0;
    double noData = 0;
    std::vector<float> values;
};

// Reads the first band of a raster file through GDAL.
Heights ReadHeights(const std::string& file);

// The colour of a height: blues below zero, greens to browns and white above.
struct Rgb {
    unsigned char red, green, blue;
};
Rgb HeightColour(double height, double lowest, double highest);

// Writes heights as a shaded PNG, lit from the north-west.
void WriteShadedPicture(const std::string& file, const Heights& heights);

// A band list of the numbers given.
class BandList : public zelm::Array<int> {
public:
    explicit BandList(std::initializer_list<int> bands);
};

}  // namespace examples

#endif
