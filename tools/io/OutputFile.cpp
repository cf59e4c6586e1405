#include "io/OutputFile.h"

#include <cerrno>
#include <cstring>
#include <set>

#include "io/ToolError.h"
#include "io/os.h"
#include "support/dl.h"
#include "support/os.h"

namespace zolt {
namespace {

// Removes what is unfinished when the process ends by exit(), which runs no destructor of a local
// object: an encoder may end the process in mid-stream.
class UnfinishedFiles {
public:
    ~UnfinishedFiles() {
        for (const std::string& file : names) {
            os_remove(file);
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
    const std::optional<FileStatus> there = file_name == "-" ? std::nullopt : os_status(file_name);
    if (file_name == "-" || (there && !there->is_regular)) {
        descriptor_ = file_name == "-" ? os_duplicate_output() : os_open_output(file_name);
        if (descriptor_ < 0) {
            fail(std::strerror(errno));
        }
        return;
    }
    if (there && !os_may_write(file_name)) {
        fail(std::strerror(errno));
    }
    // A link stays a link: what it points to is replaced.
    place_ = os_resolved_name(file_name);
    if (place_.empty()) {
        fail(std::strerror(errno));
    }
    open_beside(there);
}

OutputFile::~OutputFile() {
    discard();
}

bool OutputFile::would_replace(const std::string& input) const {
    const std::optional<FileStatus> theirs =
        input == "-" ? os_status(kStandardInput) : os_status(input);
    const std::optional<FileStatus> ours = place_.empty() ? std::nullopt : os_status(place_);
    return ours && theirs && ours->is_same_file(*theirs);
}

bool OutputFile::would_replace(const OutputFile& other) const {
    return !place_.empty() && os_is_same_name(place_, other.place_);
}

void OutputFile::write(const void* data, std::size_t size) {
    const auto* bytes = static_cast<const unsigned char*>(data);
    while (size > 0) {
        const std::ptrdiff_t written = os_write(descriptor_, bytes, size);
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

void OutputFile::seek(std::int64_t position) {
    if (!os_seek(descriptor_, position)) {
        fail(std::strerror(errno));
    }
}

void OutputFile::commit() {
    const int descriptor = descriptor_;
    descriptor_ = -1;
    // Some file systems report a failed write only here.
    if (!os_close(descriptor)) {
        fail(std::strerror(errno));
    }
    if (place_.empty()) {
        return;
    }
    if (!os_replace(temporary_, place_)) {
        fail(std::strerror(errno));
    }
    unfinished_files().names.erase(temporary_);
    temporary_.clear();
}

void OutputFile::open_beside(const std::optional<FileStatus>& like) {
    const std::string folder = place_.substr(0, place_.rfind(kDirSeparator) + 1);
    for (int attempt = 0; descriptor_ < 0; ++attempt) {
        temporary_ = folder + ".zolt-" + std::to_string(os_process_id()) + "-" +
                     std::to_string(attempt) + ".part";
        descriptor_ = os_create(temporary_, like);
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
        os_close(descriptor_);
    }
    if (!temporary_.empty()) {
        os_remove(temporary_);
        unfinished_files().names.erase(temporary_);
    }
}

}  // namespace zolt
