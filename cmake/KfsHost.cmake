# The small host (static) and the command line on top of it.

# A static library's own dependencies are its users' too, so the installed package asks for these for kfs::host.
find_package(TinyGLTF REQUIRED)
find_package(nlohmann_json REQUIRED)
find_package(fmt REQUIRED)
# Expressions. The build as C++, whose errors unwind the frames that they leave (host/expressionlua_private.h).
pkg_check_modules(KFS_LUA REQUIRED IMPORTED_TARGET lua5.4-c++)

kfs_sources(hostSources host)
if(hostSources)
    add_library(kfs_host STATIC ${hostSources})
    add_library(kfs::host ALIAS kfs_host)
    set_target_properties(kfs_host PROPERTIES EXPORT_NAME host)
    target_compile_features(kfs_host PUBLIC cxx_std_20)
    kfs_precompile(kfs_host)
    target_include_directories(kfs_host PUBLIC
        $<BUILD_INTERFACE:${PROJECT_SOURCE_DIR}> $<INSTALL_INTERFACE:${CMAKE_INSTALL_INCLUDEDIR}/kfs>)
    # In this build the host doesn't say where the library comes from: programs take libkfs, unit tests the objects.
    target_link_libraries(kfs_host
        PUBLIC kfs_services $<INSTALL_INTERFACE:kfs::kfs>
        PRIVATE TinyGLTF::TinyGLTF nlohmann_json::nlohmann_json fmt::fmt PkgConfig::KFS_LUA)
endif()

kfs_sources(cliSources cli)
if(cliSources)
    find_package(CLI11 REQUIRED)
    add_executable(kfs_cli ${cliSources})
    set_target_properties(kfs_cli PROPERTIES OUTPUT_NAME kfs INSTALL_RPATH "$ORIGIN/../${CMAKE_INSTALL_LIBDIR}")
    target_compile_definitions(kfs_cli PRIVATE "KFS_VERSION_TEXT=\"kfs ${PROJECT_VERSION}\"")
    target_compile_options(kfs_cli PRIVATE ${KFS_LIGHT_OPTIONS})
    kfs_precompile(kfs_cli <CLI/CLI.hpp>)
    target_link_libraries(kfs_cli PRIVATE kfs_host kfs CLI11::CLI11 nlohmann_json::nlohmann_json fmt::fmt)
endif()
