# zmc_embed_viewer(source): the C++ source that holds the files of the viewer, as serve/Pages.h has
# them. The build makes the viewer of web/ for it, with the tools that its lock file names: they are
# got from the npm registry once for a build folder, and nothing is looked for there as long as the
# lock file stays. Without the viewer the source holds none. The global property ZMC_HAS_VIEWER tells
# tests which it is, and ZMC_VIEWER_PAGES the folder that it came from.
#
# ZMC_BUILD_VIEWER decides: ON, OFF, or AUTO, which is ON where Node and npm are there and the build
# is not one that looks for faults in C++ alone. ZMC_VIEWER_FOLDER names a viewer that was made before,
# for builds that reach no registry.

set(ZMC_BUILD_VIEWER AUTO CACHE STRING
    "Put the viewer, which Node makes, into zmcraster serve: ON, OFF or AUTO")
set_property(CACHE ZMC_BUILD_VIEWER PROPERTY STRINGS AUTO ON OFF)
set(ZMC_VIEWER_FOLDER "" CACHE PATH "Folder of a viewer that was made before, instead of making it")

# Sets `problem` to why the viewer cannot be made, or to nothing.
function(zmc_find_node problem)
    set(${problem} "" PARENT_SCOPE)
    find_program(ZMC_NODE node)
    find_program(ZMC_NPM npm)
    if(NOT ZMC_NODE OR NOT ZMC_NPM)
        set(${problem} "there is no Node with npm" PARENT_SCOPE)
        return()
    endif()
    execute_process(COMMAND "${ZMC_NODE}" -e "process.exit(parseInt(process.versions.node) < 18 ? 1 : 0)"
        RESULT_VARIABLE old)
    if(old)
        set(${problem} "Node is older than 18" PARENT_SCOPE)
    endif()
endfunction()

# Sets `wanted`, and says in a line what has been decided and why.
function(zmc_decide_viewer wanted)
    set(${wanted} OFF PARENT_SCOPE)
    if(NOT ZMC_BUILD_VIEWER AND NOT ZMC_BUILD_VIEWER STREQUAL AUTO)
        message(STATUS "zmcraster serve: without the viewer, as ZMC_BUILD_VIEWER says")
        return()
    endif()
    zmc_find_node(problem)
    if(ZMC_BUILD_VIEWER STREQUAL AUTO AND (ZMC_SANITIZE OR ZMC_FUZZ OR ZMC_COVERAGE))
        set(problem "this build looks for faults in C++")
    elseif(problem AND NOT ZMC_BUILD_VIEWER STREQUAL AUTO)
        message(FATAL_ERROR "ZMC_BUILD_VIEWER: ${problem}")
    endif()
    if(problem)
        message(STATUS "zmcraster serve: without the viewer (${problem})")
        return()
    endif()
    message(STATUS "zmcraster serve: with the viewer")
    set(${wanted} ON PARENT_SCOPE)
endfunction()

function(zmc_embed_viewer source)
    set(web "${ZMC_ROOT}/web")
    set(tools "${CMAKE_BINARY_DIR}/web")
    set(page "${CMAKE_BINARY_DIR}/viewer")
    set(write "${CMAKE_COMMAND}" -DZMC_SOURCE=${source} -DZMC_TEMPLATE=${ZMC_ROOT}/serve/Pages.cpp.in)
    set(writer "${ZMC_ROOT}/cmake/WritePages.cmake" "${ZMC_ROOT}/serve/Pages.cpp.in")
    if(ZMC_VIEWER_FOLDER)
        message(STATUS "zmcraster serve: with the viewer of ${ZMC_VIEWER_FOLDER}")
        set_property(GLOBAL PROPERTY ZMC_HAS_VIEWER ON)
        set_property(GLOBAL PROPERTY ZMC_VIEWER_PAGES "${ZMC_VIEWER_FOLDER}")
        file(GLOB_RECURSE pages CONFIGURE_DEPENDS "${ZMC_VIEWER_FOLDER}/*")
        add_custom_command(OUTPUT "${source}"
            COMMAND ${write} "-DZMC_FOLDER=${ZMC_VIEWER_FOLDER}" -P "${ZMC_ROOT}/cmake/WritePages.cmake"
            DEPENDS ${pages} ${writer} VERBATIM COMMENT "Taking the viewer as it was made")
        return()
    endif()
    zmc_decide_viewer(wanted)
    set_property(GLOBAL PROPERTY ZMC_VIEWER_PAGES "${page}/viewer/served")
    set_property(GLOBAL PROPERTY ZMC_HAS_VIEWER ${wanted})
    if(NOT wanted)
        add_custom_command(OUTPUT "${source}" COMMAND ${write} -P "${ZMC_ROOT}/cmake/WritePages.cmake"
            DEPENDS ${writer} VERBATIM COMMENT "Leaving the viewer out")
        return()
    endif()
    add_custom_command(OUTPUT "${page}/tools.stamp"
        COMMAND "${web}/run-tests" install "${tools}"
        COMMAND "${CMAKE_COMMAND}" -E make_directory "${page}"
        COMMAND "${CMAKE_COMMAND}" -E touch "${page}/tools.stamp"
        DEPENDS "${web}/package.json" "${web}/package-lock.json"
        VERBATIM COMMENT "Getting the tools that make the viewer")
    file(GLOB_RECURSE sources CONFIGURE_DEPENDS "${web}/src/*.ts" "${web}/viewer/src/*.ts")
    add_custom_command(OUTPUT "${source}"
        COMMAND "${web}/run-tests" page "${tools}" "${page}"
        COMMAND ${write} "-DZMC_FOLDER=${page}/viewer/served" -P "${ZMC_ROOT}/cmake/WritePages.cmake"
        DEPENDS ${sources} ${writer} "${page}/tools.stamp" "${web}/run-tests"
                "${web}/viewer/build.mjs" "${web}/viewer/index.html" "${web}/viewer/style.css"
                "${ZMC_ROOT}/render/colormaps.txt"
        VERBATIM COMMENT "Making the viewer")
endfunction()
