# The headers installed in ZMC_PREFIX compile with ZMC_CXX, from the prefix alone, though folders of the
# same names as ours stand first in the search path: each by itself, or with ZMC_TOGETHER all of them,
# twice, in one source. Nothing but the list ZMC_HEADERS is installed; and what the headers include of
# others is what the package brings.
cmake_minimum_required(VERSION 3.25)
string(REPLACE "," ";" wanted "${ZMC_HEADERS}")
list(SORT wanted)
set(installed ${ZMC_PREFIX}/include/zmcraster)
file(GLOB_RECURSE headers LIST_DIRECTORIES false RELATIVE ${installed} ${installed}/*)
list(SORT headers)
if(NOT headers STREQUAL wanted)
    message(FATAL_ERROR "installed:\n${headers}\nand not the list:\n${wanted}")
endif()

# Of the libraries that the interface stands on, one has a type in it.
set(foreign "")
set(all "")
set(work ${ZMC_SCRATCH})
file(REMOVE_RECURSE ${work})
foreach(header IN LISTS headers)
    file(STRINGS ${installed}/${header} includes REGEX "^#include <[a-z_]+/")
    list(FILTER includes EXCLUDE REGEX "<zmcraster/")
    list(APPEND foreign ${includes})
    file(WRITE ${work}/own/${header} "#error this is a header of the host's own\n")
    string(MAKE_C_IDENTIFIER ${header} name)
    set(include "#include <zmcraster/${header}>\n")
    string(APPEND all "${include}")
    if(NOT ZMC_TOGETHER)
        file(WRITE ${work}/sources/${name}.cpp "${include}")
    endif()
endforeach()
if(ZMC_TOGETHER)
    file(WRITE ${work}/sources/all.cpp "${all}${all}")
endif()
list(REMOVE_DUPLICATES foreign)
if(NOT foreign STREQUAL "#include <oneapi/tbb/mutex.h>")
    message(FATAL_ERROR "installed headers include ${foreign}")
endif()

execute_process(COMMAND sh -c
    "ls ${work}/sources/*.cpp | xargs -P 2 -I SOURCE \"$@\" -c SOURCE -o SOURCE.o" sh
    ${ZMC_LAUNCHER} ${ZMC_CXX} -std=c++20 -fsigned-char -Wall -Wextra -Werror -I${work}/own
    -I${ZMC_PREFIX}/include
    RESULT_VARIABLE result ERROR_VARIABLE errors)
if(NOT result EQUAL 0)
    message(FATAL_ERROR "installed headers do not compile:\n${errors}")
endif()
