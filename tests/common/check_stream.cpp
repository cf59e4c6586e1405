#include <utility>

#include "common/Decoder.h"
#include "common/Encoding.h"

namespace zolt_test {

std::string check_stream(const Sequence& sequence, const Settings& settings, const Hooks& hooks) {
    Encoding encoding(sequence.width, sequence.height, settings);
    CEncoder& engine = encoding.engine();
    Decoder decoder(engine.picture.g_width16, engine.picture.g_height16);
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
