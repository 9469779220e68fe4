# A new .cpp file needs no edit anywhere: these look into the folders again at each build.

# kfs_sources(<out> <folder>...): the .cpp files directly in the folders, relative to the root.
function(kfs_sources out)
    set(found)
    foreach(folder IN LISTS ARGN)
        file(GLOB files CONFIGURE_DEPENDS "${PROJECT_SOURCE_DIR}/${folder}/*.cpp")
        list(APPEND found ${files})
    endforeach()
    set(${out} ${found} PARENT_SCOPE)
endfunction()

# kfs_subfolders(<out> <folder>): the names of the sub-folders that hold .cpp files.
function(kfs_subfolders out folder)
    file(GLOB files CONFIGURE_DEPENDS RELATIVE "${PROJECT_SOURCE_DIR}/${folder}" "${PROJECT_SOURCE_DIR}/${folder}/*/*.cpp")
    set(names)
    foreach(file IN LISTS files)
        get_filename_component(name "${file}" DIRECTORY)
        list(APPEND names "${name}")
    endforeach()
    list(REMOVE_DUPLICATES names)
    set(${out} ${names} PARENT_SCOPE)
endfunction()
