# How everything here is compiled. Nothing of this reaches a project that uses the installed package.

include(CheckCXXCompilerFlag)

if(PROJECT_IS_TOP_LEVEL)
    set(CMAKE_CXX_STANDARD 20)
    set(CMAKE_CXX_STANDARD_REQUIRED ON)
    set(CMAKE_CXX_EXTENSIONS OFF)
    set(CMAKE_EXPORT_COMPILE_COMMANDS ON)
    set(CMAKE_RUNTIME_OUTPUT_DIRECTORY "${CMAKE_BINARY_DIR}/bin")
    set(CMAKE_LIBRARY_OUTPUT_DIRECTORY "${CMAKE_BINARY_DIR}/lib")
    set(CMAKE_ARCHIVE_OUTPUT_DIRECTORY "${CMAKE_BINARY_DIR}/lib")
    if(NOT CMAKE_BUILD_TYPE AND NOT CMAKE_CONFIGURATION_TYPES)
        set(CMAKE_BUILD_TYPE Release CACHE STRING "Release, Debug or RelWithDebInfo" FORCE)
    endif()
    find_program(KFS_CCACHE ccache)
    if(KFS_CCACHE AND NOT DEFINED CMAKE_CXX_COMPILER_LAUNCHER)
        set(CMAKE_CXX_COMPILER_LAUNCHER "${KFS_CCACHE}")
        if(KFS_PRECOMPILE)
            # Without this ccache keeps nothing that was compiled with a precompiled header.
            list(PREPEND CMAKE_CXX_COMPILER_LAUNCHER "${CMAKE_COMMAND}" -E env "CCACHE_SLOPPINESS=pch_defines,time_macros")
        endif()
    endif()
endif()

# Position independent everywhere: the same objects go into libkfs and into the unit tests.
set(CMAKE_POSITION_INDEPENDENT_CODE ON)
set(CMAKE_CXX_VISIBILITY_PRESET hidden)
set(CMAKE_VISIBILITY_INLINES_HIDDEN ON)

# No fused multiply-add and no fast-math: a value must have the same bits with every compiler and on every machine,
# since render identities are made of them.
add_compile_options(-ffp-contract=off)

string(TOLOWER "${CMAKE_SYSTEM_PROCESSOR}" kfsProcessor)
if(KFS_X86_V2 AND kfsProcessor MATCHES "^(x86_64|amd64)$")
    check_cxx_compiler_flag(-march=x86-64-v2 KFS_HAS_X86_64_V2)
    if(KFS_HAS_X86_64_V2)
        add_compile_options(-march=x86-64-v2)
    endif()
endif()

add_compile_options(-Wall -Wextra -Wpedantic -Wshadow -Wnon-virtual-dtor -Wcast-align -Wformat=2)
# gcc 12 has only the form of this warning that also complains about overloads hidden on purpose.
check_cxx_compiler_flag(-Woverloaded-virtual=1 KFS_HAS_OVERLOADED_VIRTUAL_1)
if(KFS_HAS_OVERLOADED_VIRTUAL_1)
    add_compile_options(-Woverloaded-virtual=1)
endif()
if(KFS_WERROR)
    add_compile_options(-Werror)
endif()

# For code that is slow to compile and isn't what the sanitizers are after: tests, and the command line with its parser. The
# checks that are left out are the many ones in front of each access; the address sanitizer sees a null pointer as well.
set(KFS_LIGHT_OPTIONS)
if(KFS_SANITIZE MATCHES "undefined")
    set(KFS_LIGHT_OPTIONS -O0 -fno-sanitize=null,alignment,object-size)
endif()

if(KFS_SANITIZE)
    # A destroyed stream is asked for its stamp on purpose: that it is no object any more is what the stamp tells.
    add_compile_options("-fsanitize=${KFS_SANITIZE}" -fno-sanitize=vptr -fno-sanitize-recover=all
        -fno-omit-frame-pointer)
    string(REPLACE "fuzzer-no-link," "" kfsLinkSanitizers "${KFS_SANITIZE}")
    add_link_options("-fsanitize=${kfsLinkSanitizers}")
    if(KFS_SANITIZE MATCHES "address")
        add_compile_definitions(_GLIBCXX_ASSERTIONS)
    endif()
endif()
