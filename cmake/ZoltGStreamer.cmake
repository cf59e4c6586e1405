# ZOLT_GSTREAMER: whether GStreamer's libraries are there for what is built, as the target
# PkgConfig::GSTREAMER. Without them there is no element.
set(ZOLT_GSTREAMER OFF)
if(CMAKE_CROSSCOMPILING)
    return()
endif()
find_package(PkgConfig QUIET)
if(NOT PKG_CONFIG_FOUND)
    return()
endif()
pkg_check_modules(GSTREAMER QUIET IMPORTED_TARGET
    gstreamer-1.0>=1.20 gstreamer-video-1.0>=1.20 gstreamer-pbutils-1.0>=1.20)
if(NOT GSTREAMER_FOUND)
    return()
endif()
# They may be there for the machine's own width only.
include(CheckCXXSourceCompiles)
set(CMAKE_REQUIRED_LIBRARIES PkgConfig::GSTREAMER)
check_cxx_source_compiles("
    #include <gst/video/video.h>
    int main() { return gst_video_encoder_get_type() == 0; }" ZOLT_GSTREAMER_LINKS)
unset(CMAKE_REQUIRED_LIBRARIES)
if(ZOLT_GSTREAMER_LINKS)
    set(ZOLT_GSTREAMER ON)
endif()
