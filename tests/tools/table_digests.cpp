// Codes a Y4M file with the engine alone, once for every table of kernels that the processor has,
// and prints a line with the table's name, the setting and a digest of the stream:
//
//     table_digests FILE SETTING...     SETTING: a QP as "qp28", kbit/s as "200k", or
//                                       "t3" for three workers in what follows

#include <cinttypes>
#include <cstdio>
#include <exception>
#include <string>
#include <vector>

#include "common/Encoding.h"
#include "common/Workers.h"
#include "io/ToolError.h"
#include "io/Y4mReader.h"
#include "io/numbers.h"
#include "io/os.h"
#include "kernels/Kernels.h"

namespace {

zolt_test::Settings parse(const std::string& text) {
    zolt_test::Settings settings;
    const bool is_qp = text.compare(0, 2, "qp") == 0;
    const auto number =
        zolt::parse_number(is_qp ? text.substr(2) : text.substr(0, text.size() - 1));
    if (!number || (!is_qp && text.back() != 'k')) {
        throw zolt::UsageError(text + ": is neither a QP such as qp28 nor a bit rate such as 200k");
    }
    (is_qp ? settings.qp : settings.bit_rate) = is_qp ? *number : *number * 1000;
    return settings;
}

// FNV-1a of what is added.
class Digest {
public:
    void add(const std::vector<std::uint8_t>& bytes) {
        for (const std::uint8_t byte : bytes) {
            value = (value ^ byte) * 1099511628211u;
        }
    }
    std::uint64_t value = 14695981039346656037u;
};

std::uint64_t code(const std::string& file, zolt_test::Settings settings,
                   const zolt::Kernels& kernels, int workers) {
    zolt::Y4mReader reader((zolt::ByteReader(file)));
    const zolt::PictureFormat format = reader.format();
    settings.frame_rate = reader.frame_rate().value_or(zolt::FrameRate{}).per_second();
    zolt_test::Encoding encoding(format.width, format.height, settings, &kernels);
    zolt_test::Workers pool(workers);
    encoding.engine().set_worker_pool(&pool);
    Digest digest;
    digest.add(encoding.sequence_parameter_set());
    digest.add(encoding.picture_parameter_set());
    std::vector<std::uint8_t> picture(format.sample_bytes());
    while (reader.read(picture)) {
        digest.add(encoding.encode(picture.data()));
    }
    return digest.value;
}

}  // namespace

int main(int argc, char** argv) {
    zolt::os_prepare_streams();
    const char* const* const arguments = zolt::os_command_line(&argc, argv);
    try {
        int workers = 1;
        for (int i = 2; i < argc; ++i) {
            const std::string argument = arguments[i];
            if (argument.front() == 't') {
                workers = zolt::parse_number(argument.substr(1)).value_or(1);
                continue;
            }
            for (const zolt::Kernels& kernels : zolt::kernel_tables()) {
                std::printf("%s %s %016" PRIx64 "\n", kernels.name, arguments[i],
                            code(arguments[1], parse(argument), kernels, workers));
            }
        }
    } catch (const std::exception& error) {
        std::fprintf(stderr, "table_digests: %s\n", error.what());
        return 1;
    }
    return 0;
}
