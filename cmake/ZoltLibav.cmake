# ZOLT_LIBAV: whether FFmpeg's libraries are there for what is built, as the target PkgConfig::LIBAV.
# Without them the tools are built all the same, with Y4M and raw pictures alone.
set(ZOLT_LIBAV OFF)
if(CMAKE_CROSSCOMPILING)
    return()
endif()
find_package(PkgConfig QUIET)
if(NOT PKG_CONFIG_FOUND)
    return()
endif()
pkg_check_modules(LIBAV QUIET IMPORTED_TARGET
    libavdevice>=59 libavformat>=59 libavcodec>=59 libswscale>=6 libavutil>=57)
if(NOT LIBAV_FOUND)
    return()
endif()
# They may be there for the machine's own width only.
include(CheckCXXSourceCompiles)
set(CMAKE_REQUIRED_LIBRARIES PkgConfig::LIBAV)
check_cxx_source_compiles("
    extern \"C\" {
    #include <libavdevice/avdevice.h>
    }
    int main() { avdevice_register_all(); }" ZOLT_LIBAV_LINKS)
unset(CMAKE_REQUIRED_LIBRARIES)
if(ZOLT_LIBAV_LINKS)
    set(ZOLT_LIBAV ON)
endif()
