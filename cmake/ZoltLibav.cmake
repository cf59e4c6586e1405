# ZOLT_LIBAV: whether FFmpeg's libraries are there for what is built, as the target PkgConfig::LIBAV.
# Of libavdevice the header is enough to build with; it is loaded when it is needed.
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
    libavformat>=59 libavcodec>=59 libswscale>=6 libavutil>=57)
pkg_check_modules(LIBAVDEVICE QUIET libavdevice>=59)
if(NOT LIBAV_FOUND OR NOT LIBAVDEVICE_FOUND)
    return()
endif()
# They may be there for the machine's own width only.
include(CheckCXXSourceCompiles)
set(CMAKE_REQUIRED_LIBRARIES PkgConfig::LIBAV)
check_cxx_source_compiles("
    extern \"C\" {
    #include <libavformat/avformat.h>
    }
    int main() { return avformat_version() == 0; }" ZOLT_LIBAV_LINKS)
unset(CMAKE_REQUIRED_LIBRARIES)
if(ZOLT_LIBAV_LINKS)
    set(ZOLT_LIBAV ON)
endif()
