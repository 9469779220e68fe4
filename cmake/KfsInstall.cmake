# The installed tree: include/kfs/<folder>/*.h, the libraries, the command, and the package that find_package(kfs) reads.

include(CMakePackageConfigHelpers)

install(TARGETS kfs kfs_services EXPORT kfsTargets
    LIBRARY DESTINATION ${CMAKE_INSTALL_LIBDIR}
    ARCHIVE DESTINATION ${CMAKE_INSTALL_LIBDIR}
    RUNTIME DESTINATION ${CMAKE_INSTALL_BINDIR})
set_target_properties(kfs PROPERTIES INSTALL_RPATH "$ORIGIN")

set(installedFolders ${KFS_LIBRARY_FOLDERS})
if(TARGET kfs_host)
    list(APPEND installedFolders host)
    install(TARGETS kfs_host EXPORT kfsHostTargets ARCHIVE DESTINATION ${CMAKE_INSTALL_LIBDIR})
endif()
if(TARGET kfs_cli)
    install(TARGETS kfs_cli RUNTIME DESTINATION ${CMAKE_INSTALL_BINDIR})
endif()

foreach(folder IN LISTS installedFolders)
    install(DIRECTORY "${PROJECT_SOURCE_DIR}/${folder}" DESTINATION ${CMAKE_INSTALL_INCLUDEDIR}/kfs
        FILES_MATCHING PATTERN "*.h" PATTERN "*_private.h" EXCLUDE)
endforeach()
file(GLOB topHeader CONFIGURE_DEPENDS "${PROJECT_SOURCE_DIR}/kfs.h")
install(FILES ${topHeader} DESTINATION ${CMAKE_INSTALL_INCLUDEDIR}/kfs)
# Headers that have moved keep their old names too.
install(DIRECTORY "${PROJECT_SOURCE_DIR}/cmake/forward/" DESTINATION ${CMAKE_INSTALL_INCLUDEDIR}/kfs)

set(packageFolder ${CMAKE_INSTALL_LIBDIR}/cmake/kfs)
install(EXPORT kfsTargets NAMESPACE kfs:: DESTINATION ${packageFolder})
if(TARGET kfs_host)
    install(EXPORT kfsHostTargets NAMESPACE kfs:: DESTINATION ${packageFolder})
endif()
configure_package_config_file("${PROJECT_SOURCE_DIR}/cmake/kfsConfig.cmake.in" "${PROJECT_BINARY_DIR}/kfsConfig.cmake"
    INSTALL_DESTINATION ${packageFolder})
write_basic_package_version_file("${PROJECT_BINARY_DIR}/kfsConfigVersion.cmake" COMPATIBILITY SameMinorVersion)
install(FILES "${PROJECT_BINARY_DIR}/kfsConfig.cmake" "${PROJECT_BINARY_DIR}/kfsConfigVersion.cmake"
    DESTINATION ${packageFolder})
