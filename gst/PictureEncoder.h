#pragma once

#include <cstdint>
#include <optional>
#include <vector>

#include "InputDescription.h"
#include "SessionClock.h"
#include "UnitConsumer.h"
#include "io/PicturePacker.h"
#include "session/EncoderSession.h"
#include "stream_format.h"

namespace zolt {

// The encoder behind an element: brings pictures to the encoder's layout, codes them, and makes the
// parameter sets that players want. Failures are ToolErrors. Used by one thread at a time.
class PictureEncoder {
public:
    // How pictures whose sides are no multiples of 16 are coded: extended, and the stream tells
    // what is to be shown; or their middle alone.
    enum class Fit { pad, crop };

    struct Settings {
        int bit_rate_kbs = 1000;      // 0: no rate control
        int key_frame_interval = 30;  // frames, from 1
        int threads = 0;              // to code a picture on; 0: as many as help
        Fit fit = Fit::pad;
    };

    // Begins a stream of such pictures. `library` and `host` are the caller's and outlive this
    // object.
    PictureEncoder(const EncoderLibrary& library, const HostServices& host,
                   const InputDescription& input, const Settings& settings);

    // Take effect with the next picture, which they do not make an IDR picture. A bit rate that
    // needs a higher level is told by the parameter sets of the next IDR picture that comes.
    void set_bit_rate(int kbs);
    void set_key_frame_interval(int frames);

    // Begins the same stream anew with the next picture, which is an IDR picture then.
    void restart() { restarts_ = true; }

    // The next picture does not follow the last one in time.
    void interrupt() { clock_.interrupt(); }

    const PictureFormat& picture_format() const { return input_.picture; }
    const ColourDescription& coded_colour() const { return input_.traits.colour; }

    // What is shown of the pictures, luma samples.
    int shown_width() const { return shown_width_; }
    int shown_height() const { return shown_height_; }

    // The parameter sets of the pictures from the last IDR picture on.
    const ParameterSetUnits& sets() const { return sets_; }

    // The picture coded last, a bare NAL unit.
    const std::vector<unsigned char>& nal() const { return consumer_.nal(); }

    struct Picture {
        bool is_key;
        bool has_new_sets;
        std::int64_t end;  // of the pictures so far, microseconds from the start of the first one
    };
    // Codes a picture of the input; its time, if it has any, is in nanoseconds.
    Picture encode(const std::vector<PicturePacker::Rows>& rows, std::optional<std::uint64_t> time);

    // The reader has the picture coded last. Without this call the stream begins anew with the next
    // one, which could not refer to it.
    void mark_taken() { is_taken_ = true; }

    // No more pictures come in this stream.
    void end() { session_.end(); }

private:
    FrameRate session_rate() const { return input_.frame_rate.value_or(FrameRate{}); }
    ParameterSetUnits player_sets() const;

    const EncoderLibrary& library_;
    const InputDescription input_;
    const Fit fit_;
    const PictureFormat sample_format_;  // of what the encoder is given
    const PicturePacker packer_;
    std::vector<unsigned char> sample_;
    SessionClock clock_;
    int bit_rate_kbs_;
    int key_frame_interval_;
    int level_kbs_;  // the largest bit rate since the stream began
    bool restarts_ = false;
    bool is_taken_ = true;
    UnitConsumer consumer_;
    EncoderSession session_;
    ParameterSetUnits sets_;
    int shown_width_;
    int shown_height_;
};

}  // namespace zolt
