// The class words of the object model: the vocabulary under which modules draw type codes.
//
// A class draws its code at load time with GloballyUniqueObjectTypeCode and its word; a template
// draws one per instance, all under one word. The module registers the words of the classes that it
// builds, each beside its class; the rest is the vocabulary that other modules of the host share.
#ifndef ZMC_CORE_CLASSWORDS_H
#define ZMC_CORE_CLASSWORDS_H

#include <string_view>

namespace zelm::ClassWords {

inline constexpr std::string_view kOnceEach[] = {"Object",
                                                 "Metadata",
                                                 "LockableMap",
                                                 "Environment",
                                                 "LockedEnvironment",
                                                 "BasicTile",
                                                 "BasicRaster",
                                                 "BasicRasterIterator",
                                                 "RasterProps",
                                                 "Context",
                                                 "Geometry",
                                                 "GeometryPart",
                                                 "GeometryRecord",
                                                 "WritableGeometry",
                                                 "MemoryGeometry",
                                                 "MemoryGeometryPolygonWriter",
                                                 "PolygonWriter",
                                                 "Polygon2D",
                                                 "Stack",
                                                 "ROIDef",
                                                 "GroupROIDef",
                                                 "GeometryROIDef",
                                                 "PixelBasedROIDef",
                                                 "PixelAddressROIDef",
                                                 "ROIHitInfo",
                                                 "GeometryROIHitInfo",
                                                 "PixelAddressTile",
                                                 "ProjectedROI",
                                                 "ProjectedGeometry",
                                                 "ProjectedGeometryROI",
                                                 "ProjectedPixelAddressROI",
                                                 "ProjectedPixelAddressTile",
                                                 "ProjectedPixelBasedROI",
                                                 "ProjectedPixelBasedTile",
                                                 "RasterMask",
                                                 "RasterizedROI",
                                                 "RasterizedROIIterator",
                                                 "RasterizedGroupROI",
                                                 "RasterizedGeometry",
                                                 "RasterizedGeometryPart",
                                                 "RasterizedGeometryRecord",
                                                 "RasterizedGeometryROI",
                                                 "RasterizedPixelAddressROI",
                                                 "RasterizedPoints",
                                                 "RasterizedPolygon",
                                                 "RasterizedPolyline"};

// One code for each of the twelve element types.
inline constexpr std::string_view kOncePerPixelType[] = {"Tile",
                                                         "RasterHistogram",
                                                         "RasterIterator",
                                                         "RasterStats",
                                                         "ReaderRaster",
                                                         "LocalRaster",
                                                         "MemoryRaster",
                                                         "AutoMemoryRaster",
                                                         "TempRaster",
                                                         "VirtualRaster",
                                                         "RemoteRaster",
                                                         "PyramidRasterImpl",
                                                         "MaskedRaster",
                                                         "NoDataRaster",
                                                         "SkipRaster",
                                                         "ROIRaster",
                                                         "BandStackRaster",
                                                         "SpatialSubsetRaster",
                                                         "SpectralSubsetRaster"};

// One code for each of the ten real element types.
inline constexpr std::string_view kOncePerRealPixelType[] = {
    "ExtendedRasterStats",    "ProjectedRaster",    "ComplexRealRaster", "ComplexImagRaster",
    "ComplexMagnitudeRaster", "ComplexPhaseRaster", "ComplexPowerRaster"};

// One code for each instance that a module uses.
inline constexpr std::string_view kOncePerInstance[] = {
    "Raster", "ComplexRaster", "Array", "Map", "Deque", "List", "Set", "Scalar"};

}  // namespace zelm::ClassWords

#endif
