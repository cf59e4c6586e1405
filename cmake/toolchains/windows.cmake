# Debian's MinGW-w64 cross compilers with the win32 thread model, and Wine to run what they build.
# Included with `triple` set to the prefix of the compilers, `wine` to the name of the program that runs
# what they build, and `wine_arch` to the kind of Windows that it plays.
set(CMAKE_SYSTEM_NAME Windows)
set(CMAKE_CXX_COMPILER ${triple}-g++-win32)
set(CMAKE_C_COMPILER ${triple}-gcc-win32)  # GoogleTest asks for one.
set(CMAKE_RC_COMPILER ${triple}-windres)
set(CMAKE_FIND_ROOT_PATH /usr/${triple})
set(CMAKE_FIND_ROOT_PATH_MODE_PROGRAM NEVER)
set(CMAKE_FIND_ROOT_PATH_MODE_LIBRARY ONLY)
set(CMAKE_FIND_ROOT_PATH_MODE_INCLUDE ONLY)
set(CMAKE_FIND_ROOT_PATH_MODE_PACKAGE ONLY)

# Runs what is built here with Wine, if the machine has Wine for this width: without a display, in a
# Windows of the build's own, quietly, and without the offers to install what nothing here uses.
find_program(ZOLT_WINE ${wine} PATHS /usr/lib/wine NO_DEFAULT_PATH)
if(ZOLT_WINE)
    set(CMAKE_CROSSCOMPILING_EMULATOR
        env WINEPREFIX=${CMAKE_BINARY_DIR}/wine WINEARCH=${wine_arch} WINEDEBUG=-all
        WINEDLLOVERRIDES=mscoree,mshtml= ${ZOLT_WINE})
endif()
