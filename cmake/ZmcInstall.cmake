# Installation: libraries, the command line, public headers, the CMake package `zmcraster` and zmcraster.pc.
#
# The module is a library that hosts load by path, so it has a folder of its own below the library
# directory; it finds zmcg one floor up, by its own place, as zmcloader finds it. Hosts link the rest.

option(ZMC_INSTALL "Make install rules" ${PROJECT_IS_TOP_LEVEL})
if(NOT ZMC_INSTALL)
    return()
endif()
include(CMakePackageConfigHelpers)

set(ZMC_INSTALL_CMAKEDIR "${CMAKE_INSTALL_LIBDIR}/cmake/zmcraster")
set(ZMC_INSTALL_MODULEDIR "${CMAKE_INSTALL_LIBDIR}/zmcraster")

# What hosts link, users before what they use, and the module itself.
set(linked zmchost zmcloader zmccoordsys zmcformat zmccore zmcfiles zmcplatform zmctext zmcg)
set(loaded zmcraster zmcpe)
zmc_set_run_path("$ORIGIN;$ORIGIN/.." ${loaded})
zmc_set_run_path("$ORIGIN" zmcloader zmcfiles)

install(TARGETS ${linked} EXPORT zmcrasterTargets
    ARCHIVE DESTINATION ${CMAKE_INSTALL_LIBDIR}
    LIBRARY DESTINATION ${CMAKE_INSTALL_LIBDIR}
    RUNTIME DESTINATION ${CMAKE_INSTALL_BINDIR})
install(TARGETS ${loaded} EXPORT zmcrasterTargets
    LIBRARY DESTINATION ${ZMC_INSTALL_MODULEDIR}
    RUNTIME DESTINATION ${ZMC_INSTALL_MODULEDIR})

# The command line with its man page and completion.
if(TARGET zmcraster_cli)
    install(TARGETS zmcraster_cli RUNTIME DESTINATION ${CMAKE_INSTALL_BINDIR})
    set(documents "${CMAKE_BINARY_DIR}/tools")
    install(FILES ${documents}/zmcraster.man
        DESTINATION ${CMAKE_INSTALL_MANDIR}/man1 RENAME zmcraster.1)
    install(FILES ${documents}/zmcraster.completion
        DESTINATION ${CMAKE_INSTALL_DATADIR}/bash-completion/completions RENAME zmcraster)

    # Many workers: the program for Dask with its module, and the scripts for other clusters. The program finds
    # the module by its own place, since Python itself looks below /usr alone.
    file(RELATIVE_PATH ZMC_PYTHON_FROM_BIN "/${CMAKE_INSTALL_BINDIR}" "/${ZMC_INSTALL_PYTHONDIR}")
    set(python ${PROJECT_SOURCE_DIR}/python)
    configure_file(${python}/zmcraster-dask ${CMAKE_BINARY_DIR}/python/zmcraster-dask @ONLY)
    install(PROGRAMS ${CMAKE_BINARY_DIR}/python/zmcraster-dask DESTINATION ${CMAKE_INSTALL_BINDIR})
    install(FILES ${python}/zmcraster_dask.py DESTINATION ${ZMC_INSTALL_PYTHONDIR})
    install(FILES ${python}/zmcraster-dask.1 DESTINATION ${CMAKE_INSTALL_MANDIR}/man1)
    install(PROGRAMS ${PROJECT_SOURCE_DIR}/examples/slurm-pyramid ${PROJECT_SOURCE_DIR}/examples/mpi-pyramid
        DESTINATION ${CMAKE_INSTALL_DOCDIR}/examples)
endif()

install(DIRECTORY ${ZMC_PUBLIC_INCLUDE}/zmcraster DESTINATION ${CMAKE_INSTALL_INCLUDEDIR})

# The CMake package.
install(EXPORT zmcrasterTargets NAMESPACE zmcraster:: DESTINATION ${ZMC_INSTALL_CMAKEDIR})
configure_package_config_file(
    ${CMAKE_CURRENT_LIST_DIR}/zmcraster-config.cmake.in
    ${CMAKE_CURRENT_BINARY_DIR}/zmcraster-config.cmake
    INSTALL_DESTINATION ${ZMC_INSTALL_CMAKEDIR}
    PATH_VARS ZMC_INSTALL_MODULEDIR)
write_basic_package_version_file(${CMAKE_CURRENT_BINARY_DIR}/zmcraster-config-version.cmake
    COMPATIBILITY SameMajorVersion)
install(FILES ${CMAKE_CURRENT_BINARY_DIR}/zmcraster-config.cmake
              ${CMAKE_CURRENT_BINARY_DIR}/zmcraster-config-version.cmake
    DESTINATION ${ZMC_INSTALL_CMAKEDIR})

# The pkg-config file finds its prefix from its own place, so that an install can be moved.
list(TRANSFORM linked PREPEND "-l" OUTPUT_VARIABLE ZMC_PC_LIBS)
list(JOIN ZMC_PC_LIBS " " ZMC_PC_LIBS)
set(ZMC_PC_DIR "${CMAKE_INSTALL_LIBDIR}/pkgconfig")
file(RELATIVE_PATH ZMC_PC_PREFIX "/${ZMC_PC_DIR}" "/")
string(REGEX REPLACE "/$" "" ZMC_PC_PREFIX "${ZMC_PC_PREFIX}")
configure_file(${CMAKE_CURRENT_LIST_DIR}/zmcraster.pc.in
    ${CMAKE_CURRENT_BINARY_DIR}/zmcraster.pc @ONLY)
install(FILES ${CMAKE_CURRENT_BINARY_DIR}/zmcraster.pc DESTINATION ${ZMC_PC_DIR})
