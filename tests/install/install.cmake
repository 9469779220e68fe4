# Installs the build tree BUILD into PREFIX, emptied first, so that a header that is no longer installed is missed.

file(REMOVE_RECURSE "${PREFIX}")
execute_process(COMMAND "${CMAKE_COMMAND}" --install "${BUILD}" --prefix "${PREFIX}" OUTPUT_QUIET RESULT_VARIABLE failed)
if(failed)
    message(FATAL_ERROR "installing failed")
endif()

file(GLOB_RECURSE private RELATIVE "${PREFIX}" "${PREFIX}/*_private.h")
if(private)
    message(FATAL_ERROR "private headers are installed: ${private}")
endif()
file(GLOB_RECURSE headers "${PREFIX}/*.h")
if(NOT headers)
    message(FATAL_ERROR "no header is installed")
endif()
