#include <cerrno>
#include <cstdio>
#include <cstring>
#include <exception>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "avc/VideoAvcParser.h"
#include "avcdump/Options.h"
#include "avcdump/RowFormat.h"
#include "avcdump/UnitLister.h"
#include "io/ByteReader.h"
#include "io/ToolError.h"
#include "io/os.h"

namespace {

constexpr int kFailure = 1;
constexpr int kWrongUsage = 2;

// Nobody reads the output any more.
struct PipeClosed {};

[[noreturn]] void throw_output_error() {
    const int error = zolt::os_stream_error();
    if (error == EPIPE) {
        throw PipeClosed();
    }
    throw zolt::ToolError(std::string("standard output: cannot be written: ") +
                          std::strerror(error));
}

void write_output(const std::string& text) {
    // The parser writes its lines to the same stream, which remembers a failure.
    if (std::fputs(text.c_str(), stdout) < 0 || std::ferror(stdout) != 0) {
        throw_output_error();
    }
}

// A byte stream begins with a start code, which any number of zeros may precede (clause B.1.1).
void check_beginning(zolt::ByteReader& reader) {
    constexpr std::size_t kMaxBytes = 64;
    const std::string_view bytes = reader.peek(kMaxBytes);
    if (bytes.empty()) {
        throw zolt::ToolError(reader.name() +
                              ": is empty: expected an H.264 byte stream (Annex B)");
    }
    const std::size_t zeros = bytes.find_first_not_of('\0');
    if (zeros == std::string_view::npos || zeros < 2 || bytes[zeros] != 1) {
        throw zolt::ToolError(reader.name() +
                              ": does not begin with a start code (00 00 01): expected an H.264 "
                              "byte stream (Annex B), not a container file");
    }
}

std::unique_ptr<zolt::RowFormat> make_format(zolt::Options::Format format) {
    switch (format) {
        case zolt::Options::Format::json:
            return zolt::RowFormat::json();
        case zolt::Options::Format::csv:
            return zolt::RowFormat::csv();
        default:
            return zolt::RowFormat::table();
    }
}

void dump(const zolt::Options& options) {
    zolt::ByteReader reader(options.input);
    check_beginning(reader);

    const std::unique_ptr<zolt::RowFormat> format = make_format(options.format);
    zolt::UnitLister lister(options.frame_rate);
    VideoAvcParser parser(nullptr, options.frame_rate.per_second());
    parser.SetDiagnosticOutput(options.verbose ? stdout : nullptr);
    parser.SetUnitListener([&](const unsigned char* unit, int size) {
        write_output(format->row(lister.add(unit, size)));
    });

    write_output(format->head());
    std::vector<unsigned char> bytes(zolt::ByteReader::kBufferSize);
    while (const std::size_t size = reader.read(bytes.data(), bytes.size())) {
        parser.PutNextAvcData(bytes.data(), static_cast<int>(size));
    }
    parser.Flush();
    write_output(format->tail(lister.summary()));
    if (std::fflush(stdout) != 0) {
        throw_output_error();
    }
}

int report(const std::exception& error, int status) {
    std::fprintf(stderr, "avcdump: %s\n", error.what());
    return status;
}

}  // namespace

int main(int argc, char** argv) {
    zolt::os_prepare_streams();
    try {
        const char* const* const arguments = zolt::os_command_line(&argc, argv);
        const std::optional<zolt::Options> options = zolt::Options::parse(argc, arguments);
        if (options) {
            dump(*options);
        }
        return 0;
    } catch (const PipeClosed&) {
        return kFailure;
    } catch (const zolt::UsageError& error) {
        return report(error, kWrongUsage);
    } catch (const std::exception& error) {
        return report(error, kFailure);
    }
}
