# fuzz/<name>.cpp defines LLVMFuzzerTestOneInput and makes fuzz_<name>: with libFuzzer in the `fuzz` preset, and with a
# plain main that runs the given files elsewhere. Files in fuzz/corpus/<name>/ are run as a test, so a find stays found.
# What fuzz/mutators holds tells libFuzzer how to change inputs of a kind.

set(chunkFileTargets leaf project tree)

kfs_sources(fuzzSources fuzz)
foreach(source IN LISTS fuzzSources)
    get_filename_component(name "${source}" NAME_WE)
    add_executable(fuzz_${name} "${source}")
    if(KFS_SANITIZE MATCHES "fuzzer")
        target_link_options(fuzz_${name} PRIVATE -fsanitize=fuzzer)
        if(name IN_LIST chunkFileTargets)
            target_sources(fuzz_${name} PRIVATE "${PROJECT_SOURCE_DIR}/fuzz/mutators/chunks.cpp")
        endif()
    else()
        target_sources(fuzz_${name} PRIVATE "${PROJECT_SOURCE_DIR}/cmake/plain_fuzz_main.cpp")
    endif()
    if(TARGET kfs_host)
        target_link_libraries(fuzz_${name} PRIVATE kfs_host)
    endif()
    target_link_libraries(fuzz_${name} PRIVATE kfs_objects kfs_services Boost::thread Threads::Threads)
    file(GLOB corpus CONFIGURE_DEPENDS "${PROJECT_SOURCE_DIR}/fuzz/corpus/${name}/*")
    if(corpus)
        add_test(NAME fuzz.${name} COMMAND fuzz_${name} ${corpus})
        set_tests_properties(fuzz.${name} PROPERTIES LABELS fuzz TIMEOUT 600)
    endif()
endforeach()
