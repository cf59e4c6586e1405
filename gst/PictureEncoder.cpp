#include "PictureEncoder.h"

#include <algorithm>
#include <string>
#include <utility>

#include "io/ToolError.h"
#include "session/player_headers.h"

namespace zolt {
namespace {

// Pictures without rate control take what they take.
int largest_bit_rate(int kbs) {
    return kbs > 0 ? kbs : EncoderSession::kMaxBitRateKbs;
}

PictureFormat sample_format(const PictureFormat& picture, PictureEncoder::Fit fit) {
    if (fit == PictureEncoder::Fit::crop) {
        return picture;
    }
    const PictureFormat padded = picture.padded();
    const std::string error = PictureFormat::size_error(padded.width, padded.height);
    if (!error.empty()) {
        throw ToolError("padded to multiples of 16, the " + error + "; fit=crop takes this size");
    }
    return padded;
}

// Cropping counts pairs of samples, clause 7.4.2.1.1.
int rounded_up_to_pairs(int side) {
    return (side + 1) / 2 * 2;
}

}  // namespace

PictureEncoder::PictureEncoder(const EncoderLibrary& library, const HostServices& host,
                               const InputDescription& input, const Settings& settings)
    : library_(library),
      input_(input),
      fit_(settings.fit),
      sample_format_(sample_format(input.picture, settings.fit)),
      packer_(input.picture, sample_format_),
      bit_rate_kbs_(settings.bit_rate_kbs),
      key_frame_interval_(settings.key_frame_interval),
      level_kbs_(largest_bit_rate(settings.bit_rate_kbs)),
      session_(library, host,
               {settings.bit_rate_kbs, settings.key_frame_interval,
                settings.threads > 0 ? settings.threads
                                     : EncoderSession::useful_threads(sample_format_.height)},
               consumer_) {
    clock_.set_frame_rate(session_rate());
    session_.begin(sample_format_, session_rate());
    sets_ = player_sets();
    const bool pads = fit_ == Fit::pad;
    shown_width_ = pads ? rounded_up_to_pairs(input.picture.width) : consumer_.width();
    shown_height_ = pads ? rounded_up_to_pairs(input.picture.height) : consumer_.height();
}

void PictureEncoder::set_bit_rate(int kbs) {
    if (kbs != bit_rate_kbs_) {
        bit_rate_kbs_ = kbs;
        level_kbs_ = std::max(level_kbs_, largest_bit_rate(kbs));
        session_.set_bit_rate(kbs);
    }
}

void PictureEncoder::set_key_frame_interval(int frames) {
    if (frames != key_frame_interval_) {
        key_frame_interval_ = frames;
        session_.set_key_frame_interval(frames);
    }
}

PictureEncoder::Picture PictureEncoder::encode(const std::vector<PicturePacker::Rows>& rows,
                                               std::optional<std::uint64_t> time) {
    if (restarts_ || !is_taken_) {
        session_.begin(sample_format_, session_rate());
        restarts_ = false;
    }
    const unsigned char* sample = rows.front().first;
    if (!packer_.is_packed(rows)) {
        sample_.resize(sample_format_.sample_bytes());
        packer_.pack(rows, sample_.data());
        sample = sample_.data();
    }
    is_taken_ = false;
    session_.encode(sample, sample_format_.sample_bytes(), clock_.next(time));

    bool has_new_sets = false;
    if (consumer_.is_key()) {
        ParameterSetUnits sets = player_sets();
        has_new_sets = sets != sets_;
        sets_ = std::move(sets);
    }
    return {consumer_.is_key(), has_new_sets, clock_.end()};
}

ParameterSetUnits PictureEncoder::player_sets() const {
    StreamDescription stream;
    stream.seq_par_set = consumer_.sets().seq_par_set;
    stream.frame_rate = input_.frame_rate.value_or(FrameRate{0, 0});
    stream.traits = input_.traits;
    stream.bit_rate_kbs = level_kbs_;
    if (fit_ == Fit::pad) {
        stream.traits.shown_width = input_.picture.width;
        stream.traits.shown_height = input_.picture.height;
    }
    ParameterSetUnits sets = {player_seq_par_set(stream), consumer_.sets().pic_par_set};
    if (sets.seq_par_set.empty()) {
        throw ToolError(library_.file_name() +
                        ": gives a sequence parameter set that cannot be read");
    }
    return sets;
}

}  // namespace zolt
