# GoogleTest as GTest::gtest_main: the machine's own library, or its sources (Debian: googletest, which
# libgtest-dev brings) where the library is for another width or system than what is built.
find_package(GTest CONFIG QUIET)
if(NOT GTest_FOUND)
    set(ZOLT_GOOGLETEST_SOURCES /usr/src/googletest CACHE PATH "Sources of GoogleTest")
    set(INSTALL_GTEST OFF CACHE INTERNAL "")
    set(BUILD_GMOCK OFF CACHE INTERNAL "")
    # Optimised across files like everything here: MinGW's linker may find the inline functions of the C
    # library's headers twice when only some objects are.
    set(CMAKE_POLICY_DEFAULT_CMP0069 NEW)
    add_subdirectory(${ZOLT_GOOGLETEST_SOURCES} ${CMAKE_BINARY_DIR}/googletest EXCLUDE_FROM_ALL)
    if(NOT TARGET GTest::gtest_main)
        add_library(GTest::gtest_main ALIAS gtest_main)
    endif()
endif()
if(WIN32)
    set(support ${CMAKE_SOURCE_DIR}/tests/common/gtest_win32)
    target_sources(gtest PRIVATE ${support}.cpp)
    target_compile_options(gtest PUBLIC -include ${support}.h)
    # There is no visibility to declare.
    target_compile_definitions(gtest PUBLIC GTEST_API_=)
endif()
