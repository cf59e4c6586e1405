#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <exception>
#include <string>
#include <string_view>
#include <vector>

#include "common/Encoding.h"
#include "io/OutputFile.h"
#include "io/ToolError.h"
#include "io/Y4mReader.h"
#include "io/annex_b.h"
#include "io/numbers.h"
#include "io/os.h"
#include "kernels/Kernels.h"

// Codes a Y4M file with the engine alone: any quantiser, any table of kernels, one thread. Prints
// what the stream consists of; its time is for the caller to measure.

namespace {

constexpr char kUsage[] =
    "usage: bench_stream INPUT OUTPUT SETTING [KEYINT [TABLE]]\n"
    "  INPUT    a Y4M file\n"
    "  OUTPUT   the stream in Annex B format\n"
    "  SETTING  a QP as \"qp28\", or a bit rate in kbit/s as \"200k\"\n"
    "  KEYINT   key-frame interval in pictures (30)\n"
    "  TABLE    of kernels: scalar, sse2, avx2, avx512 (the fastest of this processor)\n";

zolt_test::Settings parse_setting(std::string_view text) {
    constexpr int kMaxQp = 51, kMaxKilobits = 4000;
    const bool is_qp = text.substr(0, 2) == "qp";
    const auto number =
        zolt::parse_number(is_qp ? text.substr(2) : text.substr(0, text.size() - 1));
    const bool is_rate = !is_qp && !text.empty() && text.back() == 'k';
    if (!number || (is_qp ? *number > kMaxQp : !is_rate || *number < 1 || *number > kMaxKilobits)) {
        throw zolt::UsageError(std::string(text) +
                               ": is neither a QP from qp0 to qp51 nor a bit rate from 1k to "
                               "4000k");
    }
    zolt_test::Settings settings;
    (is_qp ? settings.qp : settings.bit_rate) = is_qp ? *number : *number * 1000;
    return settings;
}

const zolt::Kernels& table_named(std::string_view name) {
    std::string names;
    for (const zolt::Kernels& kernels : zolt::kernel_tables()) {
        if (name == kernels.name) {
            return kernels;
        }
        names += (names.empty() ? "" : ", ") + std::string(kernels.name);
    }
    throw zolt::UsageError(std::string(name) + ": this processor has no such table; it has " +
                           names);
}

// Macroblocks by picture type.
struct Counts {
    long long macroblocks = 0;
    long long intra = 0;

    void add(const Picture& picture) {
        const std::uint8_t* const modes = picture.g_mb_mode;
        macroblocks += picture.g_num_mbs;
        intra += std::count_if(modes, modes + picture.g_num_mbs,
                               [](std::uint8_t mode) { return mode >= MB_INTRA4x4; });
    }
    double share() const {
        return macroblocks == 0 ? 0 : static_cast<double>(intra) / static_cast<double>(macroblocks);
    }
};

void write_unit(zolt::OutputFile& output, const std::vector<std::uint8_t>& unit) {
    output.write(zolt::kStartCode, sizeof zolt::kStartCode);
    output.write(unit.data(), unit.size());
}

void code(const char* input, const char* output_name, zolt_test::Settings settings,
          const zolt::Kernels& kernels) {
    zolt::Y4mReader reader{zolt::ByteReader(input)};
    zolt::OutputFile output(output_name);
    const zolt::PictureFormat format = reader.format();
    settings.frame_rate = reader.frame_rate().value_or(zolt::FrameRate{}).per_second();
    zolt_test::Encoding encoding(format.width, format.height, settings, &kernels);
    write_unit(output, encoding.sequence_parameter_set());
    write_unit(output, encoding.picture_parameter_set());
    std::vector<std::uint8_t> picture(format.sample_bytes());
    Counts all, inter_pictures;
    int pictures = 0;
    for (; reader.read(picture); ++pictures) {
        write_unit(output, encoding.encode(picture.data()));
        all.add(encoding.engine().picture);
        if (encoding.engine().g_pic_type == P_SLICE) {
            inter_pictures.add(encoding.engine().picture);
        }
    }
    output.commit();
    std::printf("pictures %d macroblocks %lld intra %.4f intra_of_p %.4f table %s\n", pictures,
                all.macroblocks, all.share(), inter_pictures.share(), kernels.name);
}

}  // namespace

int main(int argc, char** argv) {
    zolt::os_prepare_streams();
    if (argc < 4 || argc > 6) {
        std::fputs(kUsage, stderr);
        return 2;
    }
    try {
        zolt_test::Settings settings = parse_setting(argv[3]);
        if (argc > 4) {
            settings.intra_period = zolt::parse_number(argv[4]).value_or(0);
            if (settings.intra_period < 1) {
                throw zolt::UsageError(std::string(argv[4]) +
                                       ": is no key-frame interval; give a number from 1");
            }
        }
        code(argv[1], argv[2], settings, argc > 5 ? table_named(argv[5]) : zolt::best_kernels());
    } catch (const std::exception& error) {
        std::fprintf(stderr, "bench_stream: %s\n", error.what());
        return EXIT_FAILURE;
    }
    return EXIT_SUCCESS;
}
