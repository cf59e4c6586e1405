#pragma once

#include <unistd.h>

#include <atomic>
#include <filesystem>
#include <string>

#include "support/dl.h"

// A directory of a test's own, removed with all that is in it at the end of the scope. Names are
// UTF-8.
class TempDir {
public:
    TempDir() {
        static std::atomic<int> count{0};
        do {  // until there is none of an earlier process of that number
            root = std::filesystem::temp_directory_path() /
                   ("zolt-support-" + std::to_string(getpid()) + "-" + std::to_string(count++));
        } while (!std::filesystem::create_directory(root));
    }
    ~TempDir() {
        std::error_code ignored;
        std::filesystem::remove_all(root, ignored);
    }
    TempDir(const TempDir&) = delete;
    TempDir& operator=(const TempDir&) = delete;

    std::string path() const { return root.u8string(); }
    std::string path(const std::string& name) const { return path() + zolt::kDirSeparator + name; }

private:
    std::filesystem::path root;
};
