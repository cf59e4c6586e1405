#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>

// What the tools ask of the operating system. File names are UTF-8, files are bytes and nothing
// else. Where an operation fails, errno says why.
namespace zolt {

// The standard streams' descriptors.
constexpr int kStandardInput = 0;
constexpr int kStandardOutput = 1;
constexpr int kStandardError = 2;

// To be called first. The standard streams then hold bytes as they are; one that the caller closed
// is replaced by one on which reading, resp. writing, fails, so that no file takes its descriptor.
// A closed pipe is an error of the write. Ends the process when that cannot be had.
void os_prepare_streams();

// The command line in UTF-8: `argv`, or what the system has in its place, with its count in `argc`.
const char* const* os_command_line(int* argc, const char* const* argv);

// Whether standard error is a terminal that wipes a line when it is told to.
bool os_has_terminal();

// What a name or a descriptor stands for.
struct FileStatus {
    bool is_regular;
    // Together the same for every name of a file; 0 where the system does not tell.
    std::uint64_t volume;
    std::uint64_t number;
    unsigned permissions;  // as os_create takes them

    bool is_same_file(const FileStatus& other) const {
        return number != 0 && number == other.number && volume == other.volume;
    }
};
std::optional<FileStatus> os_status(const std::string& name);
std::optional<FileStatus> os_status(int descriptor);

// The absolute name of a file that need not be there, links followed; empty on failure.
std::string os_resolved_name(const std::string& name);
bool os_is_same_name(const std::string& resolved, const std::string& other);

// Descriptors, -1 on failure, that programs started later do not get: of a file to be read, of one
// that is there to be written, of a new one (EEXIST where there is one; nothing for `like`: the
// usual permissions), of standard output once more.
int os_open_input(const std::string& name);
int os_open_output(const std::string& name);
int os_create(const std::string& name, const std::optional<FileStatus>& like);
int os_duplicate_output();

bool os_may_write(const std::string& name);
bool os_close(int descriptor);

// How many of the bytes were read or written, -1 on failure; EINTR: a stop signal came first, or
// nothing to read for a moment, so that the caller can look whether it still wants it.
std::ptrdiff_t os_read(int descriptor, void* data, std::size_t size);
std::ptrdiff_t os_write(int descriptor, const void* data, std::size_t size);

// Moves the position, from the start of the file; false on failure.
bool os_seek(int descriptor, std::int64_t position);

// Waits; a stop signal may end it early.
void os_sleep(std::int64_t microseconds);

// The value of errno for the C library's last failed write to a stream: EPIPE for a closed pipe.
int os_stream_error();

// Bytes from the descriptor's position to the end of its file; nothing where that is not known.
std::optional<std::int64_t> os_bytes_left(int descriptor);

// Gives a file the name of another one, which is gone then. Neither is open.
bool os_replace(const std::string& from, const std::string& to);
// An open file is gone once it is closed.
void os_remove(const std::string& name);

// The directory of this program, its separator included.
std::string os_program_directory();

// The handle for dlsym and dlclose of a library that is loaded already; null otherwise.
void* os_loaded_library(const std::string& name);

// From here on what is printed on standard output goes to standard error, or nowhere.
void os_divert_output(bool to_standard_error);

}  // namespace zolt
