# zolt_folder(NAME FOLDER SOURCES... SEES TARGETS...)
#
# One static target per folder of src/. The target publishes an include root that holds nothing but
# its own folder, so that a file can include a header of another folder only when its target lists
# that folder's target under SEES: an include against the arrows does not compile.
function(zolt_folder name folder)
    cmake_parse_arguments(arg "" "" "SOURCES;SEES" ${ARGN})
    set(root ${CMAKE_BINARY_DIR}/arrows/${name})
    get_filename_component(parent ${root}/${folder} DIRECTORY)
    file(MAKE_DIRECTORY ${parent})
    if(NOT EXISTS ${root}/${folder})
        file(CREATE_LINK ${CMAKE_SOURCE_DIR}/src/${folder} ${root}/${folder} SYMBOLIC)
    endif()
    add_library(${name} STATIC ${arg_SOURCES})
    target_include_directories(${name} PUBLIC ${root})
    target_link_libraries(${name} PUBLIC ${arg_SEES})
endfunction()

# zolt_test(NAME LABEL SOURCES... LINKS TARGETS...)
#
# A GoogleTest program whose cases are ctest tests of the given label; the target LABEL_tests builds all
# programs of a label. Built for another system, it is one test, run by the emulator: starting that for
# every case would take longer than the cases. Without an emulator it is built only.
function(zolt_test name label)
    cmake_parse_arguments(arg "" "" "SOURCES;LINKS" ${ARGN})
    add_executable(${name} ${arg_SOURCES})
    target_link_libraries(${name} PRIVATE ${arg_LINKS} GTest::gtest_main)
    if(NOT TARGET ${label}_tests)
        add_custom_target(${label}_tests)
    endif()
    add_dependencies(${label}_tests ${name})
    if(NOT CMAKE_CROSSCOMPILING)
        gtest_discover_tests(${name} PROPERTIES LABELS ${label} DISCOVERY_TIMEOUT 60)
    elseif(CMAKE_CROSSCOMPILING_EMULATOR)
        add_test(NAME ${name} COMMAND ${name})
        set_tests_properties(${name} PROPERTIES LABELS ${label})
    endif()
endfunction()
