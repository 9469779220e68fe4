# bench/<name>.cpp makes bench_<name>. It links libkfs as a host does; one named <name>_private.cpp links the objects,
# because it measures functions that aren't exported.

find_package(benchmark REQUIRED)

kfs_sources(benchSources bench)
set(benchTargets)
foreach(source IN LISTS benchSources)
    get_filename_component(name "${source}" NAME_WE)
    add_executable(bench_${name} "${source}")
    if(TARGET kfs_host)
        target_link_libraries(bench_${name} PRIVATE kfs_host)
    endif()
    if(name MATCHES "_private$")
        target_link_libraries(bench_${name} PRIVATE kfs_objects Boost::thread Threads::Threads)
    else()
        target_link_libraries(bench_${name} PRIVATE kfs)
    endif()
    target_compile_definitions(bench_${name} PRIVATE
        "KFS_TEST_DATA=\"${KFS_TEST_DATA}\"" "KFS_TEST_SAMPLES=\"${PROJECT_SOURCE_DIR}/examples/samples\"")
    target_link_libraries(bench_${name} PRIVATE kfs_services benchmark::benchmark_main benchmark::benchmark)
    list(APPEND benchTargets bench_${name})
endforeach()
if(TARGET bench_expressions)  # beside the language that expressions are in
    target_link_libraries(bench_expressions PRIVATE PkgConfig::KFS_LUA)
endif()
add_custom_target(benchmarks DEPENDS ${benchTargets})
