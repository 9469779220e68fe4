# The user's side: an installed tree, each of its headers alone, the exported symbols, and a host outside the tree.

if(NOT PROJECT_IS_TOP_LEVEL)
    return()
endif()

set(installTests "${PROJECT_SOURCE_DIR}/tests/install")
set(installPrefix "${CMAKE_BINARY_DIR}/installed")
set(sanitizerFlags)
if(KFS_SANITIZE)
    set(sanitizerFlags "-fsanitize=${kfsLinkSanitizers}")
endif()

add_test(NAME install.tree
    COMMAND "${CMAKE_COMMAND}" -DBUILD=${CMAKE_BINARY_DIR} -DPREFIX=${installPrefix} -P "${installTests}/install.cmake")
set_tests_properties(install.tree PROPERTIES FIXTURES_SETUP installed_tree)

add_test(NAME install.headers
    COMMAND bash "${installTests}/headers.sh" "${CMAKE_CXX_COMPILER}" "${installPrefix}/${CMAKE_INSTALL_INCLUDEDIR}/kfs")

add_test(NAME install.exports
    COMMAND bash "${installTests}/exports.sh" "${installPrefix}/${CMAKE_INSTALL_LIBDIR}/libkfs.so")
add_custom_target(update-exports
    COMMAND bash "${installTests}/exports.sh" "$<TARGET_FILE:kfs>" --update
    DEPENDS kfs
    COMMENT "Writing tests/install/exports.txt")

add_test(NAME install.virtuals
    COMMAND bash "${installTests}/virtuals.sh" "${CMAKE_CXX_COMPILER}" "${installPrefix}/${CMAKE_INSTALL_INCLUDEDIR}/kfs")
add_custom_target(update-virtuals
    COMMAND "${CMAKE_COMMAND}" -DBUILD=${CMAKE_BINARY_DIR} -DPREFIX=${installPrefix} -P "${installTests}/install.cmake"
    COMMAND bash "${installTests}/virtuals.sh" "${CMAKE_CXX_COMPILER}" "${installPrefix}/${CMAKE_INSTALL_INCLUDEDIR}/kfs"
        --update
    COMMENT "Writing tests/install/virtuals.txt")

# A host that loads the library late: what room others left, and whose services it meets.
add_library(static_tls_filler MODULE "${installTests}/filler.cpp")
foreach(name IN ITEMS load load_beside_others)
    add_executable(test_${name} "${installTests}/load.cpp")
    target_link_libraries(test_${name} PRIVATE ${CMAKE_DL_LIBS})
    add_dependencies(test_${name} kfs static_tls_filler)
endforeach()
add_test(NAME install.load COMMAND test_load "$<TARGET_FILE:kfs>" "$<TARGET_FILE:static_tls_filler>")
set(loadTests install.load)
if(NOT KFS_FOREIGN_SERVICES)
    target_compile_definitions(test_load_beside_others PRIVATE OTHER_SERVICES)
    set_target_properties(test_load_beside_others PROPERTIES ENABLE_EXPORTS ON)
    add_test(NAME install.load_beside_others COMMAND test_load_beside_others "$<TARGET_FILE:kfs>")
    # The stamp that it has of its own, in place of the services', is what it is about.
    set_tests_properties(install.load_beside_others PROPERTIES ENVIRONMENT "ASAN_OPTIONS=detect_odr_violation=0")
    list(APPEND loadTests install.load_beside_others)
endif()
set_tests_properties(${loadTests} PROPERTIES LABELS install TIMEOUT 120)

add_test(NAME install.consumer
    COMMAND "${CMAKE_CTEST_COMMAND}"
        --build-and-test "${PROJECT_SOURCE_DIR}/tests/consumer" "${CMAKE_BINARY_DIR}/consumer"
        --build-generator "${CMAKE_GENERATOR}"
        --build-options
            "-DCMAKE_PREFIX_PATH=${installPrefix}"
            "-DCMAKE_CXX_COMPILER=${CMAKE_CXX_COMPILER}"
            "-DCMAKE_CXX_FLAGS=${sanitizerFlags}"
            "-DCMAKE_BUILD_TYPE=${CMAKE_BUILD_TYPE}"
            "-DCMAKE_FIND_USE_PACKAGE_REGISTRY=OFF"
        --test-command consumer)
set_tests_properties(install.headers install.exports install.virtuals install.consumer PROPERTIES FIXTURES_REQUIRED installed_tree)
set_tests_properties(install.tree install.headers install.exports install.virtuals install.consumer PROPERTIES LABELS install TIMEOUT 600)
