# examples/<name>.cpp makes example_<name>, and a test that runs it with the folder of the samples as its argument, in
# the build tree, so that what it writes lands there.

kfs_sources(exampleSources examples)
foreach(source IN LISTS exampleSources)
    get_filename_component(name "${source}" NAME_WE)
    add_executable(example_${name} "${source}")
    if(TARGET kfs_host)
        target_link_libraries(example_${name} PRIVATE kfs_host)
    endif()
    target_link_libraries(example_${name} PRIVATE kfs)
    add_test(NAME example.${name} COMMAND example_${name} "${PROJECT_SOURCE_DIR}/examples/samples"
        WORKING_DIRECTORY "${CMAKE_BINARY_DIR}")
    set_tests_properties(example.${name} PROPERTIES LABELS examples TIMEOUT 120)
endforeach()
