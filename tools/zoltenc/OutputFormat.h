#pragma once

#include <string>

namespace zolt {

// A form in which coded pictures can be written.
struct OutputFormat {
    enum class Kind { annex_b, container, digest, null };

    const char* name;     // as --container takes it
    const char* endings;  // of files, with blanks between them; empty for none
    Kind kind;
    const char* muxer;        // libavformat's name of a container, otherwise empty
    bool needs_seeking;       // cannot go to a pipe or a live address
    const char* description;  // for people

    // The format that --container names. Throws a UsageError that lists the names.
    static const OutputFormat* named(const std::string& name);

    // The format that an output's name stands for: by its ending or its address; an elementary
    // stream for "-", a pipe and a device. Throws a UsageError that lists what there is.
    static const OutputFormat& of(const std::string& output);

    // Whether the output's name is a live address, such as "udp://127.0.0.1:5000".
    static bool is_address(const std::string& output);

    // Throws a UsageError when this format does not go to the output where that is a live address.
    void check_address(const std::string& output) const;

    // Where the format goes when no file is named; empty where it needs one.
    std::string output_without_name() const;

    // "h264 mp4 ..."
    static std::string names();

    // What --list-formats says of outputs, some lines.
    static std::string list();
};

}  // namespace zolt
