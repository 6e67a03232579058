# Uses what stands in ZMC_PREFIX as its users do: the command line with its man page and completion,
# and the plug-in through GDAL. ZMC_SANITIZED tells of a build whose libraries GDAL's own programs
# cannot load.
cmake_minimum_required(VERSION 3.25)
set(command ${ZMC_PREFIX}/${ZMC_BINDIR}/zmcraster)
set(plugins ${ZMC_PREFIX}/${ZMC_LIBDIR}/gdalplugins)
set(man ${ZMC_PREFIX}/${ZMC_MANDIR}/man1/zmcraster.1)
set(completion ${ZMC_PREFIX}/${ZMC_DATADIR}/bash-completion/completions/zmcraster)
foreach(file ${command} ${plugins}/gdal_ZMCPyramid.so ${man} ${completion})
    if(NOT EXISTS ${file})
        message(FATAL_ERROR "not installed: ${file}")
    endif()
endforeach()
# Nothing but the prefix leads to the module and the plug-in.
foreach(variable ZMCRASTER_MODULE GDAL_DRIVER_PATH LD_LIBRARY_PATH)
    unset(ENV{${variable}})
endforeach()

# expect(pattern command...): the command succeeds and says that.
function(expect pattern)
    execute_process(COMMAND ${ARGN} RESULT_VARIABLE result OUTPUT_VARIABLE output
        ERROR_VARIABLE output)
    if(NOT result EQUAL 0 OR NOT output MATCHES "${pattern}")
        message(FATAL_ERROR "${ARGN} ended with ${result}, and not with ${pattern}:\n${output}")
    endif()
endfunction()

find_program(bash bash REQUIRED)
expect("zmcraster" ${bash} -c ". '${completion}' && complete -p zmcraster")
file(STRINGS ${man} title REGEX "^\\.TH ZMCRASTER 1" LIMIT_COUNT 1)
if(NOT title)
    message(FATAL_ERROR "no man page: ${man}")
endif()
find_program(man_reader man)
if(man_reader)
    expect("zmcraster" ${man_reader} -l -P cat ${man})
endif()

set(image ${ZMC_PREFIX}/image.asc)
set(pyramid ${ZMC_PREFIX}/image.pyr)
file(WRITE ${image} "ncols 3\nnrows 2\nxllcorner 0\nyllcorner 0\ncellsize 1\n1 2 3\n4 5 6\n")
file(REMOVE ${pyramid})
expect("" ${command} build ${image} ${pyramid})
expect("3 x 2" ${command} info ${pyramid})

find_program(gdalinfo gdalinfo)
if(gdalinfo AND NOT ZMC_SANITIZED)
    set(ENV{GDAL_DRIVER_PATH} ${plugins})
    expect("Driver: ZMCPyramid/.*Size is 3, 2.*Maximum=6.000" ${gdalinfo} -stats ${pyramid})
endif()
