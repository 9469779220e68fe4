# tests/<folder>/*.cpp make test_<folder>, whose tests carry the folder's name as their ctest label. They link the
# library's objects, so hidden functions can be tested. Only test_services links the services alone, since they know
# nothing of the library. What a host sees of libkfs itself is tested by tests/consumer.

find_package(GTest REQUIRED)
find_package(rapidcheck REQUIRED)
include(GoogleTest)

add_library(kfs_test_base STATIC tests/support/places.cpp)
# For that file alone: precompiled headers that were made with a definition are refused without it.
set(placeDefinitions "KFS_TEST_DATA=\"${KFS_TEST_DATA}\"" "KFS_TEST_SOURCE=\"${PROJECT_SOURCE_DIR}\"")
if(TARGET kfs_cli)
    list(APPEND placeDefinitions "KFS_TEST_COMMAND=\"$<TARGET_FILE:kfs_cli>\"")
endif()
set_source_files_properties(tests/support/places.cpp PROPERTIES COMPILE_DEFINITIONS "${placeDefinitions}")
target_compile_features(kfs_test_base PUBLIC cxx_std_20)
target_compile_options(kfs_test_base PUBLIC ${KFS_LIGHT_OPTIONS})
# All tests take its precompiled headers, so it is compiled as they are, which are programs.
set_target_properties(kfs_test_base PROPERTIES POSITION_INDEPENDENT_CODE OFF)
target_compile_options(kfs_test_base PRIVATE -fPIE)
kfs_precompile(kfs_test_base <gtest/gtest.h> <cmath> <random>)
function(kfs_precompile_test target)
    if(KFS_PRECOMPILE)
        target_precompile_headers(${target} REUSE_FROM kfs_test_base)
    endif()
endfunction()
target_include_directories(kfs_test_base PUBLIC "${PROJECT_SOURCE_DIR}")
target_link_libraries(kfs_test_base PUBLIC GTest::gtest_main GTest::gtest rapidcheck)

# The targets with label `threads`, for builds that need nothing else.
add_custom_target(thread_tests)

function(kfs_add_test_folder name)
    kfs_sources(sources "tests/${name}")
    set(target "test_${name}")
    add_executable(${target} ${sources})
    target_link_libraries(${target} PRIVATE kfs_test_base)
    kfs_precompile_test(${target})
    if(NOT name STREQUAL "services" AND TARGET kfs_host)
        target_link_libraries(${target} PRIVATE kfs_host)
    endif()
    if(name STREQUAL "services")
        target_link_libraries(${target} PRIVATE kfs_services)
    else()
        target_link_libraries(${target} PRIVATE kfs_objects kfs_services Boost::thread Threads::Threads)
    endif()
    if(name STREQUAL "cli" AND TARGET kfs_cli)
        add_dependencies(${target} kfs_cli)
    endif()
    if(name STREQUAL "threads")
        add_dependencies(thread_tests ${target})
    endif()
    # Discovered when ctest runs, not when it links: a test that dies on start then fails alone, as a test.
    gtest_discover_tests(${target} DISCOVERY_MODE PRE_TEST DISCOVERY_TIMEOUT 120 TEST_PREFIX "${name}."
        PROPERTIES LABELS "${name}" TIMEOUT 600)
endfunction()

kfs_subfolders(testFolders tests)
list(REMOVE_ITEM testFolders support install consumer foreign)
foreach(name IN LISTS testFolders)
    kfs_add_test_folder(${name})
endforeach()

# The library with KFS_FOREIGN_SERVICES. Only the files that ask whether there are shortcuts are compiled once more.
set(shortcutSources tree/birth.cpp keystore/batchreads.cpp keystore/cache.cpp keystore/evaluate.cpp keystore/keylist.cpp keystore/plainkeys.cpp
    curves/derivatives.cpp curves/interpolate.cpp curves/spatial.cpp curves/splinelanes.cpp persist/keyrecords.cpp)
add_library(kfs_foreign_objects OBJECT ${shortcutSources})
kfs_library_code(kfs_foreign_objects)
target_compile_definitions(kfs_foreign_objects PRIVATE KFS_FOREIGN_SERVICES)
target_link_libraries(kfs_foreign_objects PUBLIC kfs_services Boost::headers PRIVATE Boost::thread Threads::Threads)
list(JOIN shortcutSources "|" shortcutObjects)
add_executable(test_foreign tests/foreign/list.cpp tests/foreign/services_test.cpp
    "$<FILTER:$<TARGET_OBJECTS:kfs_objects>,EXCLUDE,/(${shortcutObjects})\\.o>" $<TARGET_OBJECTS:kfs_foreign_objects>)
target_link_libraries(test_foreign PRIVATE kfs_test_base kfs_host kfs_services Boost::thread Threads::Threads ${CMAKE_DL_LIBS})
kfs_precompile_test(test_foreign)
gtest_discover_tests(test_foreign DISCOVERY_MODE PRE_TEST DISCOVERY_TIMEOUT 120 TEST_PREFIX "foreign."
    PROPERTIES LABELS foreign TIMEOUT 600)

# Fifty digits are slow enough without a debug build or a sanitizer around them.
set(museum "${PROJECT_SOURCE_DIR}/tests/services/museum")
add_library(kfs_curve_truth STATIC "${museum}/truth.cpp")
target_include_directories(kfs_curve_truth PRIVATE "${PROJECT_SOURCE_DIR}")
target_compile_options(kfs_curve_truth PRIVATE -O2 -fno-sanitize=all)
target_link_libraries(test_services PRIVATE kfs_curve_truth)
target_link_libraries(test_curves PRIVATE kfs_curve_truth)
add_executable(draw_museum EXCLUDE_FROM_ALL "${museum}/draw.cpp")
target_link_libraries(draw_museum PRIVATE kfs_services)

include(KfsInstallTests)
