# The command line that is installed in ZMC_PREFIX, and the one that was built as ZMC_BUILT, load the
# module that belongs to them, however they are started and wherever the install has gone, and
# nothing that somebody put below the working directory: ZMC_PLANTED is a library that ends whatever
# loads it. ZMC_SCRATCH is a folder to work in.
cmake_minimum_required(VERSION 3.25)
foreach(variable ZMCRASTER_MODULE LD_LIBRARY_PATH)
    unset(ENV{${variable}})
endforeach()
set(path "$ENV{PATH}")
file(REMOVE_RECURSE ${ZMC_SCRATCH})

# A working directory with the planted library wherever a relative look-up might go.
set(work ${ZMC_SCRATCH}/elsewhere/work)
set(names libzmcraster.so libzmcg.so libzmcg.so.1 libzmcloader.so libzmcloader.so.1 libzmcfiles.so.1
    libxerces-c-3.2.so libtbb.so.12)
foreach(folder . zmcraster lib lib/zmcraster ${ZMC_LIBDIR}/zmcraster .. ../zmcraster ../lib
        ../lib/zmcraster)
    foreach(name ${names})
        configure_file(${ZMC_PLANTED} ${work}/${folder}/${name} COPYONLY)
    endforeach()
endforeach()
set(image ${ZMC_SCRATCH}/image.asc)
set(pyramid ${ZMC_SCRATCH}/image.pyr)
file(WRITE ${image} "ncols 3\nnrows 2\nxllcorner 0\nyllcorner 0\ncellsize 1\n1 2 3\n4 5 6\n")

# loads(module command): started so, the command works, and the module is that one.
function(loads module command)
    file(REMOVE ${pyramid})
    execute_process(COMMAND ${CMAKE_COMMAND} -E env LD_DEBUG=files
        ${command} build ${image} ${pyramid} WORKING_DIRECTORY ${work}
        RESULT_VARIABLE result OUTPUT_VARIABLE output ERROR_VARIABLE trace)
    string(REGEX MATCHALL "calling init: [^\n]*libzmcraster\\.so" loaded "${trace}")
    if(NOT result EQUAL 0 OR NOT EXISTS ${pyramid})
        string(REGEX REPLACE "[^\n]*[0-9]+:\t[^\n]*\n" "" trace "${trace}")
        message(FATAL_ERROR "${command} in ${work} ended with ${result}:\n${output}${trace}")
    endif()
    file(REAL_PATH ${module} real)
    if(NOT loaded STREQUAL "calling init: ${real}")
        message(FATAL_ERROR "${command} loaded ${loaded}, and not ${real}")
    endif()
endfunction()

# starts(command module): by its path, by name through PATH, relatively, and by links.
function(starts command module)
    get_filename_component(folder ${command} DIRECTORY)
    loads(${module} ${command})
    set(ENV{PATH} "${folder}:${path}")
    loads(${module} zmcraster)
    file(RELATIVE_PATH relative ${work} ${folder})
    set(ENV{PATH} "${relative}:${path}")
    loads(${module} zmcraster)
    set(links ${ZMC_SCRATCH}/links/bin)
    file(REMOVE_RECURSE ${links})
    file(MAKE_DIRECTORY ${links})
    file(CREATE_LINK ${command} ${links}/zmcraster SYMBOLIC)
    file(CREATE_LINK zmcraster ${links}/raster SYMBOLIC)
    set(ENV{PATH} "${path}")
    loads(${module} ${links}/raster)
    set(ENV{PATH} "${links}:${path}")
    loads(${module} zmcraster)
    set(ENV{PATH} "${path}")
endfunction()

set(module ${ZMC_LIBDIR}/zmcraster/libzmcraster.so)
starts(${ZMC_BUILT} ${ZMC_BUILT_MODULE})
starts(${ZMC_PREFIX}/${ZMC_BINDIR}/zmcraster ${ZMC_PREFIX}/${module})

# Another place, with blanks in its name.
set(moved "${ZMC_SCRATCH}/moved to another place")
file(COPY ${ZMC_PREFIX}/${ZMC_BINDIR} ${ZMC_PREFIX}/${ZMC_LIBDIR} DESTINATION "${moved}")
starts("${moved}/${ZMC_BINDIR}/zmcraster" "${moved}/${module}")
# A prefix that is reached through a link.
file(CREATE_LINK "${moved}" ${ZMC_SCRATCH}/opt SYMBOLIC)
starts(${ZMC_SCRATCH}/opt/${ZMC_BINDIR}/zmcraster ${ZMC_SCRATCH}/opt/${module})
