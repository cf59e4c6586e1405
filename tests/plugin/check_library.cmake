# Checks what the shared library exports and what it needs at run time.
#   cmake -DLIBRARY=file -DNM=nm -DLDD=ldd -DSANITIZERS=list -P check_library.cmake
cmake_minimum_required(VERSION 3.22)

execute_process(COMMAND ${NM} -D --defined-only ${LIBRARY}
    OUTPUT_VARIABLE symbols COMMAND_ERROR_IS_FATAL ANY)
string(REGEX REPLACE "[0-9a-f]+ T ([^\n]*)\n" "\\1 " symbols "${symbols}")
if(NOT symbols STREQUAL "GetEncoderName GetEncoderType GetNewEncoder ")
    message(SEND_ERROR "The library exports: ${symbols}")
endif()

set(runtimes "linux-vdso|linux-gate|ld-linux[^.]*|libc|libm|libdl|librt|libpthread|libgcc_s|libstdc\\+\\+")
if(SANITIZERS)
    string(APPEND runtimes "|lib[alu]san|libubsan|libtsan")
endif()
execute_process(COMMAND ${LDD} ${LIBRARY} OUTPUT_VARIABLE needed COMMAND_ERROR_IS_FATAL ANY)
string(REPLACE "\n" ";" needed "${needed}")
if(NOT needed MATCHES "libstdc\\+\\+")
    message(SEND_ERROR "No list of libraries: ${needed}")
endif()
foreach(line IN LISTS needed)
    if(line AND NOT line MATCHES "^[ \t]*([^ \t]*/)?(${runtimes})\\.so")
        message(SEND_ERROR "The library needs ${line}")
    endif()
endforeach()
