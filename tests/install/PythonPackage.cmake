# Uses the Python package that stands in ZMC_PREFIX, which finds its libraries and the module by its own place.
cmake_minimum_required(VERSION 3.25)
foreach(variable ZMCRASTER_MODULE GDAL_DRIVER_PATH LD_LIBRARY_PATH)
    unset(ENV{${variable}})
endforeach()
set(ENV{PYTHONPATH} ${ZMC_PREFIX}/${ZMC_PYTHONDIR})
set(ENV{PYTHONDONTWRITEBYTECODE} 1)
file(REMOVE_RECURSE ${ZMC_SCRATCH})
file(MAKE_DIRECTORY ${ZMC_SCRATCH})
execute_process(COMMAND ${ZMC_PYTHON} ${ZMC_USES} ${ZMC_PREFIX} WORKING_DIRECTORY ${ZMC_SCRATCH}
    RESULT_VARIABLE result OUTPUT_VARIABLE output ERROR_VARIABLE output)
if(NOT result EQUAL 0)
    message(FATAL_ERROR "the installed package ended with ${result}:\n${output}")
endif()
