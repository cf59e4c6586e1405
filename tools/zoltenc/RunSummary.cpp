#include "zoltenc/RunSummary.h"

#include <cstdio>

namespace zolt {

double RunSummary::deviation() const {
    return 100 * (tally.kilobits_per_second() / target_kbs - 1);
}

std::string RunSummary::text() const {
    char text[240];
    std::snprintf(text, sizeof text,
                  "%lld frames in %.2f s (%.1f frames/s, %.1fx), %lld bytes, %.1f kbit/s",
                  static_cast<long long>(tally.frames()), seconds, frames_per_second(), speed(),
                  static_cast<long long>(bytes), tally.kilobits_per_second());
    if (target_kbs == 0) {
        return text;
    }
    char target[80];
    std::snprintf(target, sizeof target, " of %d (%+.1f %%)", target_kbs, deviation());
    return std::string(text) + target;
}

std::string RunSummary::quality_text() const {
    const auto quality = tally.quality();
    if (!quality) {
        return "";
    }
    char text[160];
    std::snprintf(text, sizeof text, "PSNR Y %.2f U %.2f V %.2f, all %.2f dB; SSIM Y %.4f",
                  PictureQuality::psnr(quality->mse_y), PictureQuality::psnr(quality->mse_u),
                  PictureQuality::psnr(quality->mse_v), PictureQuality::psnr(quality->mse()),
                  quality->ssim_y);
    return text;
}

JsonObject RunSummary::json() const {
    JsonObject object;
    object.add("type", "summary")
        .add("exit", exit)
        .add("input", input)
        .add("output", output)
        .add("width", width)
        .add("height", height)
        .add("frame_rate", frame_rate.to_string())
        .add("frames", tally.frames())
        .add("key_frames", tally.key_frames())
        .add("stream_seconds", tally.stream_seconds())
        .add("seconds", seconds)
        .add("fps", frames_per_second())
        .add("speed", speed())
        .add("bytes", bytes)
        .add("kbps", tally.kilobits_per_second())
        .add("runs", runs);
    if (target_kbs != 0) {
        object.add("target_kbps", target_kbs).add("controller_kbps", controller_kbs);
    }
    if (const auto qp = tally.qp()) {
        object.add("qp",
                   JsonObject().add("min", qp->least).add("mean", qp->mean).add("max", qp->most));
    }
    if (const auto quality = tally.quality()) {
        object.add("psnr", JsonObject()
                               .add("y", PictureQuality::psnr(quality->mse_y))
                               .add("u", PictureQuality::psnr(quality->mse_u))
                               .add("v", PictureQuality::psnr(quality->mse_v))
                               .add("all", PictureQuality::psnr(quality->mse())));
        object.add("ssim_y", quality->ssim_y);
    }
    return object;
}

}  // namespace zolt
