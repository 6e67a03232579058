# What a host outside the tree includes. The list is written by hand: a header that is not in it is
# not installed, and one that is includes none that is not; tests/install holds both.
#
# An installed host writes #include <zmcraster/connection/DataConnection.h>. The copies that are
# installed include each other in this way too, so that no folder of a host's own, called `core` or
# `host` as ours are, comes between them. The spelling of this tree, "core/String.h", works as well.
set(ZMC_PUBLIC_HEADERS
    # Opening the module, and its interface.
    loader/OpenModule.h
    connection/DataConnection.h
    connection/DataConnectionFactory.h
    connection/RasterDataConnection.h
    dispatch/NoDataMask.h
    dispatch/NoDataRule.h
    dispatch/RasterReaderDispatch.h
    raster/BasicRasterReader.h
    raster/RasterBandHistogram.h
    raster/RasterBandStats.h
    raster/RasterProps.h
    raster/RasterReader.h
    # The object model.
    colour/Color.h
    colour/NamedColors.h
    colour/Palette.h
    core/Array.h
    core/ArrayShape.h
    core/Complex.h
    core/ElementTypes.h
    core/ErrorState.h
    core/GeoRef.h
    core/Object.h
    core/ObjectCodes.h
    core/PixelVocabulary.h
    core/Pointer.h
    core/String.h
    core/WideChar.h
    metadata/LockableMetadataImpl.h
    metadata/Metadata.h
    metadata/MetadataContainer.h
    metadata/MetadataObject.h
    metadata/MetadataParseLog.h
    metadata/MetadataUtils.h
    # Services of the process.
    coordsys/BindCoordSys.h
    coordsys/CoordSys.h
    coordsys/CoordSysFactory.h
    coordsys/CoordSysFuncPtrs.h
    coordsys/CoordSysInfo.h
    coordsys/CoordSysLog.h
    coordsys/CoordSysParameter.h
    coordsys/CoordSysUnit.h
    coordsys/Environment.h
    coordsys/EnvironmentKeys.h
    # The pyramid file: its front, the values of its header, the arithmetic of its levels.
    format/LevelGeometry.h
    format/PyramidFront.h
    format/PyramidHeaderRecord.h
    format/Rectangle.h
    # Where bytes come from, and how a host lends them.
    files/ByteSource.h
    files/FileSource.h
    files/FilesApi.h
    files/Lending.h
    files/MemorySource.h
    files/RecordingSource.h
    # The host's side: pyramids built, read with errors, looked into, and put in order.
    host/base/Error.h
    host/file/Limits.h
    host/build/BuildFile.h
    host/build/FullStatistics.h
    host/build/PartBuild.h
    host/build/PartFolder.h
    host/build/PartGrid.h
    host/build/PyramidBuilder.h
    host/file/PyramidFileInfo.h
    host/file/PyramidHeader.h
    host/file/SideFile.h
    host/journal/JournalRecord.h
    host/journal/MetadataJournal.h
    host/raster/Module.h
    host/raster/Raster.h
    host/raster/RasterSource.h
    host/reduce/Reduction.h
    # For those who put another library in the place of the sibling module or of the engine.
    zmcg/EnvironmentImpl.h
    zmcg/FormatRecord.h
    zmcg/zmcg.h
    zmcpe/CoordSysImpl.h
    zmcpe/EntryPoints.h
    # Members of what is above.
    platform/CriticalSection.h
    platform/FileLock.h
    platform/FileSystem.h
    platform/LoadableLibrary.h
    platform/Mutex.h)

# Below this folder they stand as they are installed.
set(ZMC_PUBLIC_INCLUDE "${PROJECT_BINARY_DIR}/include")
list(TRANSFORM ZMC_PUBLIC_HEADERS PREPEND "${PROJECT_SOURCE_DIR}/" OUTPUT_VARIABLE sources)
list(TRANSFORM ZMC_PUBLIC_HEADERS PREPEND "${ZMC_PUBLIC_INCLUDE}/zmcraster/" OUTPUT_VARIABLE staged)
list(JOIN ZMC_PUBLIC_HEADERS "," headers)
add_custom_command(OUTPUT ${staged}
    COMMAND ${CMAKE_COMMAND} -DFROM=${PROJECT_SOURCE_DIR} -DTO=${ZMC_PUBLIC_INCLUDE}/zmcraster
        -DHEADERS=${headers} -P ${CMAKE_CURRENT_LIST_DIR}/StageHeaders.cmake
    DEPENDS ${sources} ${CMAKE_CURRENT_LIST_DIR}/StageHeaders.cmake ${CMAKE_CURRENT_LIST_FILE}
    COMMENT "Staging the public headers" VERBATIM)
add_custom_target(zmc_public_headers ALL DEPENDS ${staged})

# A project around this one writes <zmcraster/...> as well; in our own sources one spelling is
# enough. Every library stands on zmctext, so this reaches them all.
if(NOT PROJECT_IS_TOP_LEVEL)
    target_include_directories(zmctext SYSTEM INTERFACE $<BUILD_INTERFACE:${ZMC_PUBLIC_INCLUDE}>)
    add_dependencies(zmctext zmc_public_headers)
endif()
