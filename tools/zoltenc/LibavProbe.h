#pragma once

#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "color/ColorConverter.h"
#include "io/PictureFormat.h"
#include "io/VideoTraits.h"
#include "libav/StreamDecoder.h"
#include "libav/Thumbnail.h"
#include "zoltenc/PictureProbe.h"

namespace zolt {

// Decodes with libavcodec. The source is taken as the engine sees it: converted and cropped.
class LibavProbe : public PictureProbe {
public:
    LibavProbe(const PictureFormat& format, const VideoTraits& traits, bool keep_pictures);

    void begin(const std::vector<unsigned char>& seq_par_set,
               const std::vector<unsigned char>& pic_par_set) override;
    void look(const unsigned char* source, const CodedPicture& picture,
              PictureRecord& record) override;
    std::vector<ReportPicture> pictures() override;

private:
    // A picture that the report may show.
    struct Kept {
        PictureRecord record;
        std::string reason;
        Thumbnail input;
        Thumbnail output;
        MacroblockMap map;
    };

    void keep(const PictureRecord& record, const AVFrame& decoded);
    Kept kept(const PictureRecord& record, const AVFrame& decoded, const char* reason) const;

    ColourDescription colour_;
    std::unique_ptr<ColorConverter> converter_;
    LibavPtr<AVFrame> source_;  // its samples are the converter's
    StreamDecoder decoder_;
    bool keep_pictures_;
    std::optional<Kept> first_, worst_, largest_;
    std::vector<Kept> spread_;      // every spread_step_th picture
    std::int64_t spread_step_ = 1;  // grows, so that there are never more than a few
};

}  // namespace zolt
