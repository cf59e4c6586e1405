#include <dlfcn.h>
#include <fcntl.h>
#include <poll.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <ctime>
#include <filesystem>

#include "io/os.h"

namespace zolt {
namespace {

constexpr int kPollMilliseconds = 100;

std::optional<FileStatus> file_status(int result, const struct stat& status) {
    if (result != 0) {
        return std::nullopt;
    }
    return FileStatus{S_ISREG(status.st_mode), status.st_dev, status.st_ino,
                      status.st_mode & 07777};
}

}  // namespace

void os_prepare_streams() {
    for (const int stream : {kStandardInput, kStandardOutput, kStandardError}) {
        if (fcntl(stream, F_GETFD) == -1) {
            const int mode = stream == kStandardInput ? O_WRONLY : O_RDONLY;
            if (open("/dev/null", mode) != stream) {
                std::exit(EXIT_FAILURE);
            }
        }
    }
    std::signal(SIGPIPE, SIG_IGN);
}

const char* const* os_command_line(int*, const char* const* argv) {
    return argv;
}

bool os_has_terminal() {
    return isatty(kStandardError) == 1;
}

std::optional<FileStatus> os_status(const std::string& name) {
    struct stat status;
    return file_status(stat(name.c_str(), &status), status);
}

std::optional<FileStatus> os_status(int descriptor) {
    struct stat status;
    return file_status(fstat(descriptor, &status), status);
}

std::string os_resolved_name(const std::string& name) {
    std::error_code error;
    const std::filesystem::path path = std::filesystem::weakly_canonical(name, error);
    if (error) {
        errno = error.value();
        return "";
    }
    return path.string();
}

bool os_is_same_name(const std::string& resolved, const std::string& other) {
    return resolved == other;
}

int os_open_input(const std::string& name) {
    return open(name.c_str(), O_RDONLY | O_CLOEXEC);
}

int os_open_output(const std::string& name) {
    return open(name.c_str(), O_WRONLY | O_CLOEXEC);
}

int os_create(const std::string& name, const std::optional<FileStatus>& like) {
    const int descriptor = open(name.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0666);
    if (descriptor >= 0 && like) {
        fchmod(descriptor, like->permissions);
    }
    return descriptor;
}

int os_duplicate_output() {
    return fcntl(kStandardOutput, F_DUPFD_CLOEXEC, kStandardError + 1);
}

bool os_may_write(const std::string& name) {
    return access(name.c_str(), W_OK) == 0;
}

bool os_close(int descriptor) {
    return close(descriptor) == 0;
}

std::ptrdiff_t os_read(int descriptor, void* data, std::size_t size) {
    pollfd input = {descriptor, POLLIN, 0};
    const int ready = poll(&input, 1, kPollMilliseconds);
    if (ready <= 0) {
        errno = ready == 0 ? EINTR : errno;
        return -1;
    }
    return read(descriptor, data, size);
}

std::ptrdiff_t os_write(int descriptor, const void* data, std::size_t size) {
    return write(descriptor, data, size);
}

bool os_seek(int descriptor, std::int64_t position) {
    return lseek(descriptor, position, SEEK_SET) == position;
}

void os_sleep(std::int64_t microseconds) {
    constexpr std::int64_t kPerSecond = 1000000;
    const timespec time = {static_cast<time_t>(microseconds / kPerSecond),
                           static_cast<long>(microseconds % kPerSecond * 1000)};
    nanosleep(&time, nullptr);
}

int os_stream_error() {
    return errno;
}

std::optional<std::int64_t> os_bytes_left(int descriptor) {
    struct stat status;
    if (fstat(descriptor, &status) != 0 || !S_ISREG(status.st_mode)) {
        return std::nullopt;
    }
    const off_t position = lseek(descriptor, 0, SEEK_CUR);
    if (position < 0) {
        return std::nullopt;
    }
    return status.st_size - position;
}

bool os_replace(const std::string& from, const std::string& to) {
    return std::rename(from.c_str(), to.c_str()) == 0;
}

void os_remove(const std::string& name) {
    unlink(name.c_str());
}

std::string os_program_directory() {
    const std::filesystem::path program = std::filesystem::read_symlink("/proc/self/exe");
    return program.parent_path().string() + "/";
}

void* os_loaded_library(const std::string& name) {
    return dlopen(name.c_str(), RTLD_NOW | RTLD_NOLOAD);
}

void os_divert_output(bool to_standard_error) {
    if (to_standard_error) {
        dup2(kStandardError, kStandardOutput);
        return;
    }
    const int nowhere = open("/dev/null", O_WRONLY);
    if (nowhere >= 0) {
        dup2(nowhere, kStandardOutput);
        close(nowhere);
    }
}

}  // namespace zolt
