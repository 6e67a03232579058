# What every target of this project has in common, told once.

option(ZMC_WARNINGS_AS_ERRORS "Treat warnings as errors in our own sources" ${PROJECT_IS_TOP_LEVEL})
set(ZMC_SANITIZE "" CACHE STRING "Sanitizers to build with, as for -fsanitize=")
option(ZMC_COVERAGE "Instrument for coverage" OFF)

set(ZMC_ROOT "${CMAKE_CURRENT_SOURCE_DIR}")

# Warnings are ours alone: they are private, so that nobody who builds on us inherits them.
set(ZMC_WARNING_FLAGS -Wall -Wextra -Wpedantic -Wconversion -Wsign-conversion -Wshadow
    -Wnon-virtual-dtor -Woverloaded-virtual -Wold-style-cast -Wcast-qual -Wformat=2)
if(ZMC_WARNINGS_AS_ERRORS)
    list(APPEND ZMC_WARNING_FLAGS -Werror)
endif()

set(ZMC_INSTRUMENT_FLAGS "")
if(ZMC_SANITIZE)
    list(APPEND ZMC_INSTRUMENT_FLAGS -fsanitize=${ZMC_SANITIZE} -fno-omit-frame-pointer
         -fno-sanitize-recover=all)
endif()
if(ZMC_COVERAGE)
    list(APPEND ZMC_INSTRUMENT_FLAGS --coverage)
endif()

# Options that every binary of ours is compiled and linked with.
function(zmc_configure_target target)
    target_compile_options(${target} PRIVATE ${ZMC_WARNING_FLAGS} ${ZMC_INSTRUMENT_FLAGS})
    target_link_options(${target} PRIVATE ${ZMC_INSTRUMENT_FLAGS})
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
        $<BUILD_INTERFACE:${ZMC_ROOT}> $<INSTALL_INTERFACE:${CMAKE_INSTALL_INCLUDEDIR}/zmcraster>)
    if(NOT ZMC_SANITIZE AND kind MATCHES "SHARED|MODULE" AND CMAKE_SYSTEM_NAME STREQUAL "Linux")
        target_link_options(${name} PRIVATE LINKER:-z,defs)
    endif()
endfunction()

function(zmc_add_executable name)
    add_executable(${name} ${ARGN})
    zmc_configure_target(${name})
endfunction()
