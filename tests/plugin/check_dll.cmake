# Checks what the DLL exports, what it needs at run time, and that its code can stand the system's stack.
#   cmake -DLIBRARY=file -DOBJDUMP=objdump -DWIDTH=32|64 -P check_dll.cmake
cmake_minimum_required(VERSION 3.22)

execute_process(COMMAND ${OBJDUMP} -p ${LIBRARY}
    OUTPUT_VARIABLE headers COMMAND_ERROR_IS_FATAL ANY)

set(formats_32 pei-i386)
set(formats_64 pei-x86-64)
if(NOT headers MATCHES "file format ${formats_${WIDTH}}\n")
    message(SEND_ERROR "Not a library of ${WIDTH} bits")
endif()

string(REGEX MATCH "Name Pointer\\] Table[^\n]*\n([^\n]+\n)*" names "${headers}")
string(REGEX MATCHALL "\\[ *[0-9]+\\] [^\n]+" names "${names}")
list(TRANSFORM names REPLACE "\\[ *[0-9]+\\] " "")
if(NOT names STREQUAL "GetEncoderName;GetEncoderType;GetNewEncoder")
    message(SEND_ERROR "The library exports: ${names}")
endif()
# Functions without a name would be here too.
string(REGEX MATCHALL "\\+base\\[ *[0-9]+\\] [0-9a-f]+ Export RVA" exports "${headers}")
list(LENGTH exports count)
if(NOT count EQUAL 3)
    message(SEND_ERROR "The library exports ${count} addresses")
endif()

string(REGEX MATCHALL "DLL Name: [^\n]+" needed "${headers}")
list(TRANSFORM needed REPLACE "DLL Name: " "")
if(NOT needed STREQUAL "KERNEL32.dll;msvcrt.dll")
    message(SEND_ERROR "The library needs: ${needed}")
endif()

# The stack is aligned to 16 bytes at most, and g++ for 64-bit Windows takes for granted that it is
# aligned to the size of any vector that it keeps there.
execute_process(COMMAND ${OBJDUMP} -d --no-show-raw-insn ${LIBRARY}
    OUTPUT_VARIABLE code COMMAND_ERROR_IS_FATAL ANY)
if(NOT code MATCHES "%ymm")
    message(SEND_ERROR "No code for AVX2")
endif()
if(WIDTH EQUAL 64)
    string(REGEX MATCHALL "vmov(aps|apd|dqa|dqa32|dqa64|ntdq) [^\n]*%[yz]mm[^\n]*" moves "${code}")
    list(FILTER moves INCLUDE REGEX "%rsp|%rbp")
    if(moves)
        message(SEND_ERROR "Aligned moves of large vectors on the stack: ${moves}")
    endif()
endif()
