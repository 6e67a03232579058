# Installs the build at ZMC_BUILD into an empty ZMC_PREFIX and looks at what stands there.
cmake_minimum_required(VERSION 3.25)
file(REMOVE_RECURSE ${ZMC_PREFIX})
# Hosts that an earlier run configured remember what they found then.
get_filename_component(scratch ${ZMC_PREFIX} DIRECTORY)
foreach(consume package pkgconfig subdirectory)
    file(REMOVE ${scratch}/${consume}/CMakeCache.txt)
endforeach()
execute_process(COMMAND ${CMAKE_COMMAND} --install ${ZMC_BUILD} --prefix ${ZMC_PREFIX}
    COMMAND_ERROR_IS_FATAL ANY OUTPUT_QUIET)
foreach(file
        ${ZMC_LIBDIR}/zmcraster/libzmcraster.so
        ${ZMC_LIBDIR}/libzmcg.so
        ${ZMC_LIBDIR}/libzmcloader.so
        ${ZMC_LIBDIR}/libzmccore.a
        ${ZMC_LIBDIR}/pkgconfig/zmcraster.pc
        ${ZMC_LIBDIR}/cmake/zmcraster/zmcraster-config.cmake
        include/zmcraster/core/String.h
        include/zmcraster/connection/DataConnectionFactory.h)
    if(NOT EXISTS ${ZMC_PREFIX}/${file})
        message(FATAL_ERROR "not installed: ${file}")
    endif()
endforeach()
# The libraries of one install find one another wherever it is moved to.
file(GET_RUNTIME_DEPENDENCIES MODULES ${ZMC_PREFIX}/${ZMC_LIBDIR}/zmcraster/libzmcraster.so
    RESOLVED_DEPENDENCIES_VAR found UNRESOLVED_DEPENDENCIES_VAR missing)
get_filename_component(real ${ZMC_PREFIX}/${ZMC_LIBDIR}/libzmcg.so REALPATH)
set(reals "")
foreach(file ${found})
    get_filename_component(file ${file} REALPATH)
    list(APPEND reals ${file})
endforeach()
if(NOT real IN_LIST reals)
    message(FATAL_ERROR "the module does not find ${real}: ${found}; missing ${missing}")
endif()
