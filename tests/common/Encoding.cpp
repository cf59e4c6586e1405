#include "common/Encoding.h"

#include <algorithm>
#include <cstddef>

namespace zolt_test {

std::string Settings::name() const {
    const std::string rate =
        bit_rate > 0 ? std::to_string(bit_rate / 1000) + "k" : "qp" + std::to_string(qp);
    return rate + "_gop" + std::to_string(intra_period);
}

Encoding::Encoding(int width, int height, const Settings& settings, const zolt::Kernels* kernels)
    : engine_(width, height, kernels) {
    engine_.set_qp(settings.qp);
    engine_.set_bit_rate(settings.bit_rate);
    engine_.set_frame_rate(settings.frame_rate);
    engine_.set_intra_period(settings.intra_period);
    engine_.set_inter_period(1);
    engine_.initialize_encoder();
    engine_.encode_sps();
    sps_ = take_nal_unit();
    engine_.encode_pps();
    pps_ = take_nal_unit();
}

std::vector<std::uint8_t> Encoding::encode(const std::uint8_t* picture) {
    engine_.encode_frame(picture);
    return take_nal_unit();
}

std::vector<std::uint8_t> Encoding::reconstruction() const {
    std::vector<std::uint8_t> picture(static_cast<std::size_t>(engine_.picture.g_num_mbs) * 384);
    engine_.copy_reconstruction(picture.data());
    return picture;
}

std::vector<std::uint8_t> Encoding::take_nal_unit() {
    std::vector<std::uint8_t> nal(static_cast<std::size_t>(engine_.get_nal_size()));
    engine_.copy_nal_unit(nal.data(), engine_.get_nal_size());
    engine_.reset_nal_buffer();
    return nal;
}

}  // namespace zolt_test
