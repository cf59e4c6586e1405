#include "library_files.h"

#include <dlfcn.h>

#include <array>
#include <filesystem>

#include "support/os.h"

namespace zolt {
namespace {

// With the separator at its end. An address of this library's tells the loader which file is meant.
std::string find_own_directory() {
    Dl_info info = {};
    if (dladdr(reinterpret_cast<const void*>(&element_services), &info) == 0) {
        return "./";
    }
    const std::filesystem::path file = std::filesystem::absolute(info.dli_fname).lexically_normal();
    return (file.parent_path() / "").string();
}

// Found once: the loader's name may be relative to a directory that the process leaves.
const std::string& element_directory() {
    static const std::string directory = find_own_directory();
    return directory;
}

std::string parent_of(const std::string& directory) {
    return (std::filesystem::path(directory).parent_path().parent_path() / "").string();
}

HostServices find_services() {
    const std::string& own = element_directory();
    const std::string parent = parent_of(own);
    for (const std::string& directory : std::array{own, parent}) {
        if (HostServices::are_in(directory)) {
            return HostServices(directory);
        }
    }
    return HostServices(parent + "zolt/");
}

}  // namespace

const HostServices& element_services() {
    static const HostServices services = find_services();
    return services;
}

std::unique_ptr<EncoderLibrary> open_encoder_library(const std::string& plugin_path) {
    if (!plugin_path.empty()) {
        return std::make_unique<EncoderLibrary>(plugin_path,
                                                "name the right one with the property plugin-path");
    }
    const std::string remedy =
        "install it beside the element or name it with the property plugin-path";
    const std::string& own = element_directory();
    for (const std::string& directory : std::array{own, parent_of(own)}) {
        const std::string name = directory + ZOLT_ENCODER_LIBRARY;
        if (os_is_regular_file(name.c_str())) {
            return std::make_unique<EncoderLibrary>(name, remedy);
        }
    }
    return std::make_unique<EncoderLibrary>(ZOLT_ENCODER_LIBRARY, remedy,
                                            EncoderLibrary::Place::kSystem);
}

}  // namespace zolt
