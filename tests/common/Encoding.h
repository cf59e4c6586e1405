#pragma once

#include <cstdint>
#include <functional>
#include <string>
#include <vector>

#include "common/Sequence.h"
#include "encoder/CEncoder.h"

namespace zolt_test {

struct Settings {
    int qp = 28;
    int bit_rate = 0;  // bit/s; 0: no rate control
    int intra_period = 30;
    double frame_rate = 30;

    // For instance "qp28_gop30", "200k_gop7".
    std::string name() const;
};

// One coding session: an engine with its settings.
class Encoding {
public:
    Encoding(int width, int height, const Settings& settings,
             const zolt::Kernels* kernels = nullptr);

    CEncoder& engine() { return engine_; }
    const std::vector<std::uint8_t>& sequence_parameter_set() const { return sps_; }
    const std::vector<std::uint8_t>& picture_parameter_set() const { return pps_; }
    // Codes a picture; returns its NAL unit.
    std::vector<std::uint8_t> encode(const std::uint8_t* picture);
    // The reconstruction of the last picture.
    std::vector<std::uint8_t> reconstruction() const;

private:
    std::vector<std::uint8_t> take_nal_unit();

    CEncoder engine_;
    std::vector<std::uint8_t> sps_, pps_;
};

// Called around every picture of check_stream, with the picture's number.
struct Hooks {
    std::function<void(CEncoder& engine, int n)> before;
    std::function<void(CEncoder& engine, int n, const std::vector<std::uint8_t>& source,
                       const std::vector<std::uint8_t>& nal,
                       const std::vector<std::uint8_t>& reconstruction)>
        after;
};

// Codes a sequence and has the stream decoded: every decoded picture has to equal the engine's
// reconstruction. Returns what is wrong, or nothing (Decoder::finish).
std::string check_stream(const Sequence& sequence, const Settings& settings,
                         const Hooks& hooks = {});

}  // namespace zolt_test
