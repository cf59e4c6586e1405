#include "zoltenc/OutputFormat.h"

#include <algorithm>
#include <cctype>
#include <iterator>
#include <optional>
#include <sstream>
#include <string_view>

#include "io/ToolError.h"
#include "io/os.h"
#include "zoltenc/open_container.h"

namespace zolt {
namespace {

using Kind = OutputFormat::Kind;

constexpr OutputFormat kFormats[] = {
    {"h264", ".264 .h264", Kind::annex_b, "", false, "elementary stream, Annex B"},
    {"mp4", ".mp4", Kind::container, "mp4", true, "MP4, index at the front"},
    {"mov", ".mov", Kind::container, "mov", true, "QuickTime, index at the front"},
    {"mkv", ".mkv", Kind::container, "matroska", false, "Matroska"},
    {"flv", ".flv", Kind::container, "flv", false, "Flash video"},
    {"ts", ".ts", Kind::container, "mpegts", false, "MPEG transport stream"},
    {"md5", ".md5", Kind::digest, "", false, "MD5 digest of the elementary stream, as text"},
    {"null", "", Kind::null, "", false, "nothing, to see how fast coding is"},
};

struct Address {
    const char* scheme;
    const char* format;
};

constexpr Address kAddresses[] = {{"udp:", "ts"}, {"srt:", "ts"}, {"rtmp:", "flv"}};

const OutputFormat* find_format(std::string_view name) {
    const auto* const found =
        std::find_if(std::begin(kFormats), std::end(kFormats),
                     [name](const OutputFormat& format) { return name == format.name; });
    return found == std::end(kFormats) ? nullptr : found;
}

const Address* find_address(const std::string& output) {
    const auto* const found = std::find_if(
        std::begin(kAddresses), std::end(kAddresses), [&output](const Address& address) {
            return output.compare(0, std::string_view(address.scheme).size(), address.scheme) == 0;
        });
    return found == std::end(kAddresses) ? nullptr : found;
}

// The last dot of a file's name and what follows, in lower case; empty where there is none.
std::string ending_of(const std::string& file_name) {
    const std::size_t dot = file_name.rfind('.');
    const std::size_t separator = file_name.find_last_of("/\\");
    if (dot == std::string::npos || (separator != std::string::npos && dot < separator)) {
        return "";
    }
    std::string ending = file_name.substr(dot);
    std::transform(ending.begin(), ending.end(), ending.begin(),
                   [](unsigned char letter) { return static_cast<char>(std::tolower(letter)); });
    return ending;
}

bool has_ending(const OutputFormat& format, const std::string& ending) {
    std::istringstream endings(format.endings);
    return std::find(std::istream_iterator<std::string>(endings), {}, ending) !=
           std::istream_iterator<std::string>();
}

std::string all_endings() {
    std::string text;
    for (const OutputFormat& format : kFormats) {
        text +=
            *format.endings == '\0' ? "" : (text.empty() ? "" : " ") + std::string(format.endings);
    }
    return text;
}

}  // namespace

const OutputFormat* OutputFormat::named(const std::string& name) {
    const OutputFormat* const format = find_format(name);
    if (format == nullptr) {
        throw UsageError("--container: '" + name + "' is not one of " + names());
    }
    return format;
}

const OutputFormat& OutputFormat::of(const std::string& output) {
    if (const Address* const address = find_address(output)) {
        return *find_format(address->format);
    }
    if (output.find("://") != std::string::npos) {
        throw UsageError(output + ": is no address that is written to; those that are begin with " +
                         "udp: srt: rtmp:");
    }
    const std::string ending = output == "-" ? "" : ending_of(output);
    for (const OutputFormat& format : kFormats) {
        if (!ending.empty() && has_ending(format, ending)) {
            return format;
        }
    }
    const std::optional<FileStatus> there = output == "-" ? std::nullopt : os_status(output);
    if (output == "-" || (there && !there->is_regular)) {
        return *find_format("h264");
    }
    throw UsageError(
        output + ": " + (ending.empty() ? "has no ending" : "'" + ending + "' is no ending") +
        " that tells the format; known are " + all_endings() + "; --container NAME does without");
}

bool OutputFormat::is_address(const std::string& output) {
    return find_address(output) != nullptr;
}

void OutputFormat::check_address(const std::string& output) const {
    if (is_address(output) && (kind != Kind::container || needs_seeking)) {
        throw UsageError(output + ": cannot take " + name + "; live addresses take ts, flv or mkv");
    }
}

std::string OutputFormat::output_without_name() const {
    return kind == Kind::null ? "null" : kind == Kind::digest ? "-" : "";
}

std::string OutputFormat::names() {
    std::string text;
    for (const OutputFormat& format : kFormats) {
        text += (text.empty() ? "" : " ") + std::string(format.name);
    }
    return text;
}

std::string OutputFormat::list() {
    constexpr std::size_t kNameWidth = 6, kEndingsWidth = 12;
    const auto padded = [](std::string text, std::size_t width) {
        text.resize(std::max(width, text.size() + 1), ' ');
        return text;
    };
    std::string text = "Files, by their ending or by --container NAME:\n";
    for (const OutputFormat& format : kFormats) {
        text +=
            "  " + padded(format.name, kNameWidth) + padded(format.endings, kEndingsWidth) +
            format.description +
            (format.kind == Kind::container && !has_containers() ? " (not in this build)" : "") +
            "\n";
    }
    text += "Live addresses, with their container where --container names none:\n";
    for (const Address& address : kAddresses) {
        text += "  " + padded(address.scheme, kNameWidth) + address.format + "\n";
    }
    return text;
}

}  // namespace zolt
