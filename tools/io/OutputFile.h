#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>

#include "io/os.h"

namespace zolt {

// A file that appears under its name only when it is whole: it is written beside its place and
// renamed by `commit`; without it nothing is left and a file of that name is as it was. Standard
// output ("-") and everything that is not a regular file (a pipe, a device) is written directly.
// Failures are ToolErrors that name the file.
class OutputFile {
public:
    explicit OutputFile(const std::string& file_name);
    ~OutputFile();
    OutputFile(const OutputFile&) = delete;
    OutputFile& operator=(const OutputFile&) = delete;

    // What to call the output in a message.
    const std::string& name() const { return name_; }

    // Whether there is nothing to replace: bytes are out as soon as they are written.
    bool is_written_directly() const { return place_.empty(); }

    // Whether `commit` would replace the file `input` ("-": standard input), or what `other`
    // writes.
    bool would_replace(const std::string& input) const;
    bool would_replace(const OutputFile& other) const;

    // Where the bytes are until `commit`; empty where they go straight to their place, and there is
    // no way back to them.
    const std::string& temporary_name() const { return temporary_; }

    void write(const void* data, std::size_t size);

    // Moves the place of the next write, from the start of the file; only where there is a
    // temporary name.
    void seek(std::int64_t position);

    // Ends the file and gives it its name.
    void commit();

private:
    void open_beside(const std::optional<FileStatus>& like);
    [[noreturn]] void fail(const std::string& what) const;
    void discard();

    std::string name_;
    std::string place_;      // where the file belongs; empty when it is written directly
    std::string temporary_;  // where it is written until then
    int descriptor_ = -1;
};

}  // namespace zolt
