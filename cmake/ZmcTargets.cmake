# What every target of this project has in common, told once.

option(ZMC_WARNINGS_AS_ERRORS "Treat warnings as errors in our own sources" ${PROJECT_IS_TOP_LEVEL})
set(ZMC_SANITIZE "" CACHE STRING "Sanitizers to build with, as for -fsanitize=")
option(ZMC_FUZZ "Build the fuzz targets as fuzzers, with clang" OFF)
option(ZMC_COVERAGE "Instrument for coverage, with clang" OFF)

set(ZMC_ROOT "${CMAKE_CURRENT_SOURCE_DIR}")

# Warnings are ours alone: they are private, so that nobody who builds on us inherits them. From 16 on
# g++ finds equal branches in what it makes itself of `new T[n]` in a template.
set(ZMC_WARNING_FLAGS -Wall -Wextra -Wpedantic -Wconversion -Wsign-conversion -Wshadow
    -Wnon-virtual-dtor -Woverloaded-virtual -Wold-style-cast -Wcast-qual -Wcast-align -Wformat=2
    -Wnull-dereference -Wimplicit-fallthrough -Wextra-semi -Wundef -Wvla
    $<$<CXX_COMPILER_ID:GNU>:-Wduplicated-cond>
    $<$<AND:$<CXX_COMPILER_ID:GNU>,$<VERSION_LESS:$<CXX_COMPILER_VERSION>,16>>:-Wduplicated-branches>
    $<$<CXX_COMPILER_ID:GNU>:-Wlogical-op> $<$<CXX_COMPILER_ID:Clang>:-Wthread-safety>)
# Where sources are compiled as one, g++ takes what stands in one of them for a header's.
if(CMAKE_UNITY_BUILD)
    list(APPEND ZMC_WARNING_FLAGS $<$<CXX_COMPILER_ID:GNU>:-Wno-subobject-linkage>)
endif()
if(ZMC_WARNINGS_AS_ERRORS)
    list(APPEND ZMC_WARNING_FLAGS -Werror)
endif()

set(ZMC_INSTRUMENT_FLAGS "")
if(ZMC_SANITIZE)
    list(APPEND ZMC_INSTRUMENT_FLAGS -fsanitize=${ZMC_SANITIZE} -fno-omit-frame-pointer
         -fno-sanitize-recover=all)
endif()
if(ZMC_FUZZ)
    list(APPEND ZMC_INSTRUMENT_FLAGS -fsanitize=fuzzer-no-link)
endif()
# Instrumented objects are large: this linker takes less than half of the time of the usual one.
set(ZMC_LINKER_FLAGS "")
if(ZMC_SANITIZE)
    find_program(ZMC_LLD ld.lld)
    if(ZMC_LLD)
        set(ZMC_LINKER_FLAGS -fuse-ld=lld)
    endif()
endif()
# Counted in the source, not in the machine code: a branch is a condition that somebody wrote, and
# not the way that an exception might take out of every call.
if(ZMC_COVERAGE)
    # One way of a branch is told from the counts of the other and of both: threads may lose none.
    list(APPEND ZMC_INSTRUMENT_FLAGS -fprofile-instr-generate -fcoverage-mapping
         -fprofile-update=atomic
         -fprofile-list=${CMAKE_CURRENT_LIST_DIR}/counted-sources.list)
endif()

# The module works inside somebody else's process on files from anywhere: what the compiler, the C
# library and the loader can check there at little cost is checked. Sanitizers bring checks of their
# own, which the fortified functions would hide.
option(ZMC_HARDENING "Build with the checks that compiler, library and loader offer" ON)
set(ZMC_HARDENING_FLAGS "")
set(ZMC_HARDENING_LINK_FLAGS "")
if(ZMC_HARDENING AND NOT ZMC_SANITIZE AND NOT ZMC_COVERAGE)
    set(ZMC_HARDENING_FLAGS -fstack-protector-strong -fstack-clash-protection
        $<$<NOT:$<CONFIG:Debug>>:-U_FORTIFY_SOURCE> $<$<NOT:$<CONFIG:Debug>>:-D_FORTIFY_SOURCE=3>
        -D_GLIBCXX_ASSERTIONS)
    if(CMAKE_SYSTEM_PROCESSOR MATCHES "x86_64|AMD64|i[3-6]86")
        list(APPEND ZMC_HARDENING_FLAGS -fcf-protection=full)
    endif()
    if(CMAKE_SYSTEM_NAME STREQUAL "Linux")
        set(ZMC_HARDENING_LINK_FLAGS LINKER:-z,relro LINKER:-z,now LINKER:-z,noexecstack)
    endif()
endif()
include(CheckPIESupported)
check_pie_supported(LANGUAGES CXX)

# For folders of test programs: they work in the libraries, so that optimising them as well would
# take longer than it saves. The fortified functions of a release want optimised callers.
macro(zmc_compile_plainly)
    add_compile_options(-O0)
    list(FILTER ZMC_HARDENING_FLAGS EXCLUDE REGEX FORTIFY_SOURCE)
endmacro()

# Options that every binary of ours is compiled and linked with.
function(zmc_configure_target target)
    target_compile_options(${target} PRIVATE ${ZMC_WARNING_FLAGS} ${ZMC_HARDENING_FLAGS}
        ${ZMC_INSTRUMENT_FLAGS})
    target_link_options(${target} PRIVATE ${ZMC_HARDENING_LINK_FLAGS} ${ZMC_INSTRUMENT_FLAGS}
        ${ZMC_LINKER_FLAGS})
    set_target_properties(${target} PROPERTIES CXX_EXTENSIONS OFF POSITION_INDEPENDENT_CODE ON
        CXX_VISIBILITY_PRESET hidden VISIBILITY_INLINES_HIDDEN ON)
endfunction()

# zmc_add_library(name STATIC|SHARED|MODULE|OBJECT): a library whose sources the folders add.
# It carries what its users need: C++20, the include root, and a signed char everywhere, because
# the element type of code 99 is plain char.
function(zmc_add_library name kind)
    add_library(${name} ${kind})
    add_library(zmcraster::${name} ALIAS ${name})
    zmc_configure_target(${name})
    target_compile_features(${name} PUBLIC cxx_std_20)
    target_compile_options(${name} PUBLIC -fsigned-char)
    target_include_directories(${name} PUBLIC
        $<BUILD_INTERFACE:${ZMC_ROOT}> $<INSTALL_INTERFACE:${CMAKE_INSTALL_INCLUDEDIR}>
        $<INSTALL_INTERFACE:${CMAKE_INSTALL_INCLUDEDIR}/zmcraster>)
    # Programs that were linked with one major version refuse to start with another. What is loaded by its
    # path has a name alone.
    if(kind STREQUAL "SHARED")
        set_target_properties(${name} PROPERTIES VERSION ${PROJECT_VERSION}
            SOVERSION ${PROJECT_VERSION_MAJOR})
    endif()
    if(NOT ZMC_SANITIZE AND kind MATCHES "SHARED|MODULE" AND CMAKE_SYSTEM_NAME STREQUAL "Linux")
        target_link_options(${name} PRIVATE LINKER:-z,defs)
    endif()
endfunction()

function(zmc_add_executable name)
    add_executable(${name} ${ARGN})
    zmc_configure_target(${name})
endfunction()

# zmc_set_run_path(path targets...): where binaries that are installed look for ours, from their own
# place. One path serves the build and the install: CMake makes room for another by filling up the
# first with colons, and an empty element means the working directory. An install that shall have none,
# since its libraries are where the loader looks anyway, is told CMAKE_SKIP_INSTALL_RPATH.
function(zmc_set_run_path path)
    if(CMAKE_SKIP_INSTALL_RPATH)
        return()
    endif()
    set_target_properties(${ARGN} PROPERTIES INSTALL_RPATH "${path}"
        INSTALL_RPATH_USE_LINK_PATH ON BUILD_WITH_INSTALL_RPATH ON)
endfunction()
