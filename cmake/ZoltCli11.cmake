# CLI11 as CLI11::CLI11. It is headers alone, so the machine's own serve whatever is built; a cross
# compiler must not see what else stands beside them.
if(CMAKE_CROSSCOMPILING)
    if(NOT TARGET CLI11::CLI11)
        find_path(ZOLT_CLI11 CLI/CLI.hpp REQUIRED NO_CMAKE_FIND_ROOT_PATH PATHS /usr/include)
        set(headers ${CMAKE_BINARY_DIR}/cli11)
        file(MAKE_DIRECTORY ${headers})
        file(CREATE_LINK ${ZOLT_CLI11}/CLI ${headers}/CLI SYMBOLIC)
        add_library(CLI11::CLI11 INTERFACE IMPORTED GLOBAL)
        target_include_directories(CLI11::CLI11 INTERFACE ${headers})
    endif()
else()
    find_package(CLI11 REQUIRED)
endif()
