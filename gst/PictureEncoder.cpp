#include "PictureEncoder.h"

#include <algorithm>

#include "io/ToolError.h"
#include "session/player_headers.h"

namespace zolt {
namespace {

// Pictures without rate control take what they take.
int largest_bit_rate(int kbs) {
    return kbs > 0 ? kbs : EncoderSession::kMaxBitRateKbs;
}

// Cropping counts pairs of samples, clause 7.4.2.1.1.
int rounded_up_to_pairs(int side) {
    return (side + 1) / 2 * 2;
}

}  // namespace

void PictureEncoder::begin(const InputDescription& input, const Settings& settings) {
    const PictureFormat sample_format =
        settings.fit == Fit::pad ? input.picture.padded() : input.picture;
    const std::string error = PictureFormat::size_error(sample_format.width, sample_format.height);
    if (!error.empty()) {
        throw ToolError("padded to multiples of 16, the " + error + "; fit=crop takes this size");
    }
    session_.reset();
    consumer_.emplace();
    input_ = input;
    fit_ = settings.fit;
    sample_format_ = sample_format;
    packer_.emplace(input.picture, sample_format);
    sample_.clear();
    bit_rate_kbs_ = settings.bit_rate_kbs;
    key_frame_interval_ = settings.key_frame_interval;
    level_kbs_ = largest_bit_rate(bit_rate_kbs_);
    restarts_ = false;
    clock_.set_frame_rate(input.frame_rate.value_or(FrameRate{}));

    const int threads = settings.threads > 0 ? settings.threads
                                             : EncoderSession::useful_threads(sample_format.height);
    session_ = std::make_unique<EncoderSession>(
        library_, host_, EncoderSession::Settings{bit_rate_kbs_, key_frame_interval_, threads},
        *consumer_);
    session_->begin(sample_format_, input.frame_rate.value_or(FrameRate{}));

    const bool pads = fit_ == Fit::pad;
    shown_width_ = pads ? rounded_up_to_pairs(input.picture.width) : consumer_->width();
    shown_height_ = pads ? rounded_up_to_pairs(input.picture.height) : consumer_->height();
    sets_ = player_sets();
}

void PictureEncoder::set_bit_rate(int kbs) {
    if (kbs != bit_rate_kbs_) {
        bit_rate_kbs_ = kbs;
        level_kbs_ = std::max(level_kbs_, largest_bit_rate(kbs));
        session_->set_bit_rate(kbs);
    }
}

void PictureEncoder::set_key_frame_interval(int frames) {
    if (frames != key_frame_interval_) {
        key_frame_interval_ = frames;
        session_->set_key_frame_interval(frames);
    }
}

PictureEncoder::Picture PictureEncoder::encode(const std::vector<PicturePacker::Rows>& rows,
                                               std::optional<std::uint64_t> time) {
    if (restarts_) {
        session_->begin(sample_format_, input_.frame_rate.value_or(FrameRate{}));
        restarts_ = false;
    }
    const unsigned char* sample = rows.front().first;
    if (!packer_->is_packed(rows)) {
        sample_.resize(sample_format_.sample_bytes());
        packer_->pack(rows, sample_.data());
        sample = sample_.data();
    }
    session_->encode(sample, sample_format_.sample_bytes(), clock_.next(time));

    bool has_new_sets = false;
    if (consumer_->is_key()) {
        ParameterSetUnits sets = player_sets();
        has_new_sets = sets != sets_;
        sets_ = std::move(sets);
    }
    return {consumer_->nal(), consumer_->is_key(), has_new_sets, clock_.end()};
}

ParameterSetUnits PictureEncoder::player_sets() const {
    StreamDescription stream;
    stream.seq_par_set = consumer_->sets().seq_par_set;
    stream.frame_rate = input_.frame_rate.value_or(FrameRate{0, 0});
    stream.traits = input_.traits;
    stream.bit_rate_kbs = level_kbs_;
    if (fit_ == Fit::pad) {
        stream.traits.shown_width = input_.picture.width;
        stream.traits.shown_height = input_.picture.height;
    }
    ParameterSetUnits sets = {player_seq_par_set(stream), consumer_->sets().pic_par_set};
    if (sets.seq_par_set.empty()) {
        throw ToolError(library_.file_name() +
                        ": gives a sequence parameter set that cannot be read");
    }
    return sets;
}

}  // namespace zolt
