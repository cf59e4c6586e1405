#include "common/Encoding.h"

#include <algorithm>
#include <cstddef>

#include "common/Decoder.h"

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
    std::vector<std::uint8_t> picture(static_cast<std::size_t>(engine_.g_num_mbs) * 384);
    engine_.copy_reconstruction(picture.data());
    return picture;
}

std::vector<std::uint8_t> Encoding::take_nal_unit() {
    std::vector<std::uint8_t> nal(static_cast<std::size_t>(engine_.get_nal_size()));
    engine_.copy_nal_unit(nal.data(), engine_.get_nal_size());
    engine_.reset_nal_buffer();
    return nal;
}

std::string check_stream(const Sequence& sequence, const Settings& settings, const Hooks& hooks) {
    Encoding encoding(sequence.width, sequence.height, settings);
    CEncoder& engine = encoding.engine();
    Decoder decoder(engine.g_width16, engine.g_height16);
    for (const auto* set :
         {&encoding.sequence_parameter_set(), &encoding.picture_parameter_set()}) {
        decoder.send_parameter_set(set->data(), static_cast<int>(set->size()));
    }
    std::vector<std::uint8_t> source(sequence.picture_size());
    for (int n = 0; n < sequence.pictures; ++n) {
        sequence.draw(n, source.data());
        if (hooks.before) {
            hooks.before(engine, n);
        }
        const std::vector<std::uint8_t> nal = encoding.encode(source.data());
        std::vector<std::uint8_t> reconstruction = encoding.reconstruction();
        if (hooks.after) {
            hooks.after(engine, n, source, nal, reconstruction);
        }
        decoder.send_picture(nal.data(), static_cast<int>(nal.size()), std::move(reconstruction));
    }
    return decoder.finish();
}

}  // namespace zolt_test
