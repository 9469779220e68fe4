# libkfs_services, libkfs, and the objects that libkfs shares with the unit tests.

find_package(Boost 1.74 REQUIRED COMPONENTS thread)
find_package(PkgConfig REQUIRED)
pkg_check_modules(KFS_XXHASH REQUIRED IMPORTED_TARGET libxxhash)
find_package(Threads REQUIRED)
find_package(nlohmann_json REQUIRED)

# What every shared library here has in common. Calls inside a library don't go through the PLT and can be inlined, and
# a thread-local is one load: hence the last four. Whatever is thread-local takes static TLS by that, of which a process that
# loads libkfs late has little left (install.load): pointers are fine, buffers belong on the heap.
function(kfs_shared_library target)
    set_target_properties(${target} PROPERTIES VERSION ${PROJECT_VERSION} SOVERSION ${PROJECT_VERSION_MAJOR})
    target_link_options(${target} PRIVATE -Wl,-Bsymbolic-functions)
    if(NOT KFS_SANITIZE)
        target_link_options(${target} PRIVATE -Wl,--no-undefined)
    endif()
endfunction()
function(kfs_library_code target)
    target_compile_features(${target} PUBLIC cxx_std_20)
    target_compile_options(${target} PRIVATE -fno-semantic-interposition -fno-plt -ftls-model=initial-exec)
endfunction()

kfs_subfolders(serviceFolders services)
list(TRANSFORM serviceFolders PREPEND services/)
kfs_sources(serviceSources ${serviceFolders})
add_library(kfs_services SHARED ${serviceSources})
add_library(kfs::services ALIAS kfs_services)
set_target_properties(kfs_services PROPERTIES EXPORT_NAME services)
kfs_shared_library(kfs_services)
kfs_library_code(kfs_services)
kfs_precompile(kfs_services)
target_include_directories(kfs_services PUBLIC
    $<BUILD_INTERFACE:${PROJECT_SOURCE_DIR}> $<INSTALL_INTERFACE:${CMAKE_INSTALL_INCLUDEDIR}/kfs>)
target_link_libraries(kfs_services
    PUBLIC Boost::headers
    PRIVATE PkgConfig::KFS_XXHASH nlohmann_json::nlohmann_json Threads::Threads)

set(KFS_LIBRARY_FOLDERS frame tree keystore curves persist overrides identity)
kfs_sources(librarySources ${KFS_LIBRARY_FOLDERS})
# Nobody looks at floating-point exceptions, and without them in mind the compiler can make vectors of lanes.
set_source_files_properties("${PROJECT_SOURCE_DIR}/curves/splinelanes.cpp" PROPERTIES COMPILE_OPTIONS -fno-trapping-math)
add_library(kfs_objects OBJECT ${librarySources})
kfs_library_code(kfs_objects)
kfs_precompile(kfs_objects)
if(KFS_FOREIGN_SERVICES)
    target_compile_definitions(kfs_objects PRIVATE KFS_FOREIGN_SERVICES)
endif()
target_link_libraries(kfs_objects PUBLIC kfs_services Boost::headers PRIVATE Boost::thread Threads::Threads)

add_library(kfs SHARED $<TARGET_OBJECTS:kfs_objects>)
add_library(kfs::kfs ALIAS kfs)
kfs_shared_library(kfs)
target_compile_features(kfs PUBLIC cxx_std_20)
set_target_properties(kfs PROPERTIES LINKER_LANGUAGE CXX)
target_include_directories(kfs PUBLIC
    $<BUILD_INTERFACE:${PROJECT_SOURCE_DIR}> $<INSTALL_INTERFACE:${CMAKE_INSTALL_INCLUDEDIR}/kfs>)
target_link_libraries(kfs PUBLIC kfs_services PRIVATE Boost::thread Threads::Threads)

# Templates of the standard library have default visibility whatever the compiler is told; this keeps them inside.
set(kfsExportMap "${PROJECT_SOURCE_DIR}/cmake/kfs.map")
target_link_options(kfs PRIVATE "-Wl,--version-script=${kfsExportMap}")
set_property(TARGET kfs APPEND PROPERTY LINK_DEPENDS "${kfsExportMap}")
