# Where ccache is installed, every compilation goes through it: what was compiled before, in this clone or in another one,
# is not compiled again. Ninja alone, which compiles everything from the top of the build folder.

set(CLIPFILE_COMPILER_CACHE OFF)
if(CMAKE_GENERATOR MATCHES "Ninja" AND NOT CMAKE_CXX_COMPILER_LAUNCHER)
    find_program(CLIPFILE_CCACHE ccache)
    if(CLIPFILE_CCACHE)
        set(CLIPFILE_COMPILER_CACHE ON)
        # Paths below the base folder count as relative ones, and neither the time stamps nor the macros of precompiled
        # headers count at all: their contents do.
        set(CMAKE_CXX_COMPILER_LAUNCHER
            "${CMAKE_COMMAND}" -E env
            "CCACHE_BASEDIR=${PROJECT_SOURCE_DIR}" CCACHE_NOHASHDIR=1
            CCACHE_SLOPPINESS=pch_defines,time_macros,include_file_mtime,include_file_ctime
            "${CLIPFILE_CCACHE}")
    endif()
endif()
