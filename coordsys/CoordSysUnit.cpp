#include "coordsys/CoordSysUnit.h"

namespace zelm {

const CoordSysUnit kCoordSysUnits[] = {
    {"METER", "Meters", 1.0, 0, 9001},
    {"DEGREE", "Degrees", 1.0, 1, 9102},
    {"FOOT", "Feet", 0.3048, 0, 9002},
    {"FOOT (INTERNATIONAL)", "Feet", 0.3048, 0, 9002},
    {"FOOT_US", "US Survey Feet", 0.3048006096012192, 0, 9003},
    {"KILOMETER", "Km", 1000.0, 0, 9036},
    {"YARD", "Yards", 0.9144, 0, 109001},
    {"YARD_US", "Yards", 0.9144018288036576, 0, 109002},
    {"STATUTE_MILE", "Miles", 1609.344, 0, 9093},
    {"MILE_US", "Miles", 1609.347218694438, 0, 9035},
    {"NAUTICAL_MILE", "Nautical Miles", 1852.0, 0, 9030},
    {"NAUTICAL_MILE_US", "Nautical Miles", 1853.248, 0, 109012},
    {"NAUTICAL_MILE_UK", "Nautical Miles", 1853.184, 0, 109013},
    {"MINUTE", "Minutes", 0.0166666666666667, 1, 9103},
    {"SECOND", "Seconds", 0.0027777777777778, 1, 9104},
    {"RADIAN", "Radians", 57.29577951308232, 1, 9101},
    {"THE_END", "", 0.0, 1, -1},
};

}  // namespace zelm
