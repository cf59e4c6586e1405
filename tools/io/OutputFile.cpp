#include "io/OutputFile.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <filesystem>
#include <set>

#include "io/ToolError.h"

namespace zolt {
namespace {

// Removes what is unfinished when the process ends by exit(), which runs no destructor of a local
// object: an encoder may end the process in mid-stream.
class UnfinishedFiles {
public:
    ~UnfinishedFiles() {
        for (const std::string& file : names) {
            unlink(file.c_str());
        }
    }
    std::set<std::string> names;
};

UnfinishedFiles& unfinished_files() {
    static UnfinishedFiles files;
    return files;
}

}  // namespace

OutputFile::OutputFile(const std::string& file_name)
    : name_(file_name == "-" ? "standard output" : file_name) {
    if (file_name == "-") {
        descriptor_ = fcntl(STDOUT_FILENO, F_DUPFD_CLOEXEC, STDERR_FILENO + 1);
        if (descriptor_ < 0) {
            fail(std::strerror(errno));
        }
        return;
    }
    struct stat status;
    const bool exists = stat(file_name.c_str(), &status) == 0;
    if (exists && !S_ISREG(status.st_mode)) {
        descriptor_ = open(file_name.c_str(), O_WRONLY | O_CLOEXEC);
        if (descriptor_ < 0) {
            fail(std::strerror(errno));
        }
        return;
    }
    if (exists && access(file_name.c_str(), W_OK) != 0) {
        fail(std::strerror(errno));
    }
    // A link stays a link: what it points to is replaced.
    std::error_code error;
    place_ = std::filesystem::weakly_canonical(file_name, error).string();
    if (error) {
        fail(error.message());
    }
    open_beside();
    if (exists) {
        fchmod(descriptor_, status.st_mode & 07777);
    }
}

OutputFile::~OutputFile() {
    discard();
}

bool OutputFile::would_replace(const std::string& input) const {
    struct stat ours;
    struct stat theirs;
    const int found = input == "-" ? fstat(STDIN_FILENO, &theirs) : stat(input.c_str(), &theirs);
    return found == 0 && !place_.empty() && stat(place_.c_str(), &ours) == 0 &&
           ours.st_dev == theirs.st_dev && ours.st_ino == theirs.st_ino;
}

bool OutputFile::would_replace(const OutputFile& other) const {
    return !place_.empty() && place_ == other.place_;
}

void OutputFile::write(const void* data, std::size_t size) {
    const auto* bytes = static_cast<const unsigned char*>(data);
    while (size > 0) {
        const ssize_t written = ::write(descriptor_, bytes, size);
        if (written < 0) {
            if (errno == EINTR) {
                continue;
            }
            fail(errno == EPIPE ? "its reader has closed the pipe" : std::strerror(errno));
        }
        bytes += written;
        size -= static_cast<std::size_t>(written);
    }
}

void OutputFile::commit() {
    const int descriptor = descriptor_;
    descriptor_ = -1;
    // Some file systems report a failed write only here.
    if (close(descriptor) != 0) {
        fail(std::strerror(errno));
    }
    if (place_.empty()) {
        return;
    }
    if (std::rename(temporary_.c_str(), place_.c_str()) != 0) {
        fail(std::strerror(errno));
    }
    unfinished_files().names.erase(temporary_);
    temporary_.clear();
}

void OutputFile::open_beside() {
    const std::filesystem::path folder = std::filesystem::path(place_).parent_path();
    for (int attempt = 0; descriptor_ < 0; ++attempt) {
        temporary_ = (folder / (".zolt-" + std::to_string(getpid()) + "-" +
                                std::to_string(attempt) + ".part"))
                         .string();
        descriptor_ = open(temporary_.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0666);
        if (descriptor_ < 0 && errno != EEXIST) {
            temporary_.clear();
            fail(std::strerror(errno));
        }
    }
    unfinished_files().names.insert(temporary_);
}

void OutputFile::fail(const std::string& what) const {
    throw ToolError(name_ + ": cannot be written: " + what);
}

void OutputFile::discard() {
    if (descriptor_ >= 0) {
        close(descriptor_);
    }
    if (!temporary_.empty()) {
        unlink(temporary_.c_str());
        unfinished_files().names.erase(temporary_);
    }
}

}  // namespace zolt
