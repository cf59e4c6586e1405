#include "zoltenc/report/ReportPage.h"

#include <algorithm>
#include <utility>

#include "zoltenc/report/PictureSection.h"
#include "zoltenc/report/SvgPlot.h"
#include "zoltenc/report/markup.h"
#include "zoltenc/report/page_style.h"

namespace zolt {
namespace {

std::string tile(const std::string& number, const char* unit, const std::string& rest) {
    return "<li><b>" + number + " <small>" + unit + "</small></b><span>" + rest + "</span></li>";
}

std::string size_text(int width, int height) {
    return formatted("%dx%d", width, height);
}

// One point for each picture for which `value` gives a number.
template <class Value>
SvgPlot::Points points(const std::vector<PictureRecord>& records, Value value) {
    SvgPlot::Points result;
    for (const PictureRecord& record : records) {
        if (const std::optional<double> y = value(record)) {
            result.push_back({record.start, *y});
        }
    }
    return result;
}

// Only of key frames.
template <class Value>
auto of_key_frames(Value value) {
    return [value](const PictureRecord& record) {
        return record.is_key ? value(record) : std::optional<double>();
    };
}

std::optional<double> kilobits(const PictureRecord& record) {
    return static_cast<double>(record.bytes) * 8 / 1000;
}

std::optional<double> qp(const PictureRecord& record) {
    return record.qp ? std::optional<double>(*record.qp) : std::nullopt;
}

std::optional<double> luma_psnr(const PictureRecord& record) {
    return record.quality ? std::optional<double>(PictureQuality::psnr(record.quality->mse_y))
                          : std::nullopt;
}

constexpr const char kPictureNotes[] =
    "<p class=\"soft\">Input is what the encoder was given (after conversion, padding or "
    "cropping), output "
    "what a decoder makes of the stream; both are JPEG copies here, at most 960 samples wide. The "
    "layers are the decoder's own account. A line of motion runs from a block, its dot, to where "
    "its prediction comes from. Bits by macroblock are not shown: the decoder does not tell "
    "them.</p>\n";

}  // namespace

std::string ReportPage::html() const {
    return "<!DOCTYPE html>\n<html lang=\"en\"><head><meta charset=\"utf-8\">"
           "<meta name=\"viewport\" content=\"width=device-width, initial-scale=1\">"
           "<title>" +
           escaped(summary_.output) + "</title><style>" + kPageStyle +
           "</style></head><body>\n<header><h1>" + escaped(summary_.output) +
           "</h1><p>coded from " + escaped(summary_.input) + "</p></header>\n" + tiles() +
           settings() + plots() + pictures() +
           "<footer>Bit rates count the NAL units of the pictures over the time that the pictures "
           "are shown. PSNR is of 8-bit samples; over the stream it is that of the mean squared "
           "error. SSIM takes windows of 8x8 samples in steps of 4.</footer></body></html>\n";
}

std::string ReportPage::tiles() const {
    const StreamTally& tally = summary_.tally;
    std::string text =
        tile(formatted("%.1f", tally.kilobits_per_second()), "kbit/s",
             summary_.target_kbs == 0
                 ? std::string("no rate control")
                 : formatted("target %d, %+.1f %%", summary_.target_kbs, summary_.deviation()));
    if (const auto quality = tally.quality()) {
        text += tile(
            formatted("%.2f", PictureQuality::psnr(quality->mse_y)), "dB",
            formatted("PSNR-Y; U %.2f, V %.2f, all %.2f; SSIM-Y %.4f",
                      PictureQuality::psnr(quality->mse_u), PictureQuality::psnr(quality->mse_v),
                      PictureQuality::psnr(quality->mse()), quality->ssim_y));
    }
    if (const auto range = tally.qp()) {
        text += tile(formatted("%.1f", range->mean), "QP",
                     formatted("from %d to %d", range->least, range->most));
    }
    text += tile(std::to_string(tally.frames()), "pictures",
                 std::to_string(tally.key_frames()) +
                     formatted(" key frames, %.2f s", tally.stream_seconds()));
    text += tile(formatted("%.1f", static_cast<double>(summary_.bytes) / 1000), "kB",
                 std::to_string(summary_.bytes) + " bytes");
    text += tile(formatted("%.1f", summary_.frames_per_second()), "frames/s",
                 formatted("%.1f times real time", summary_.speed()));
    return "<ul class=\"tiles\">" + text + "</ul>\n";
}

std::string ReportPage::settings() const {
    const PictureFormat& input = summary_.input_format;
    std::vector<std::pair<const char*, std::string>> rows = {
        {"Encoder", summary_.encoder},
        {"Given to the encoder", size_text(input.width, input.height) + ", " + input.fourcc_text()},
        {"Coded", size_text(summary_.width, summary_.height)},
        {"Frame rate", summary_.frame_rate.to_string() + " frames/s"},
        {"Bit rate", summary_.target_kbs == 0 ? "none asked, QP 28"
                                              : formatted("%d kbit/s", summary_.target_kbs)},
        {"Key-frame interval", formatted("%d frames", summary_.key_frame_interval)},
    };
    if (summary_.controller_kbs != summary_.target_kbs) {
        rows.emplace_back("Asked of the encoder", formatted("%d kbit/s", summary_.controller_kbs));
    }
    if (summary_.runs > 1) {
        rows.emplace_back("Runs", formatted("%d, of which this is the nearest", summary_.runs));
    }
    if (summary_.exit != "end") {
        rows.emplace_back("Ended", summary_.exit);
    }
    std::string text;
    for (const auto& [name, value] : rows) {
        text += std::string("<div><dt>") + name + "</dt><dd>" + escaped(value) + "</dd></div>";
    }
    return "<h2>Settings</h2>\n<dl class=\"settings\">" + text + "</dl>\n";
}

std::string ReportPage::plots() const {
    const double begin = records_.empty() ? 0 : records_.front().start;
    const double end = begin + summary_.tally.stream_seconds();
    SvgPlot rate("Bit rate", "kbit/s over one second", begin, end, true);
    // Rates over less than a second say little.
    const double shortest = std::min(1.0, (end - begin) / 2);
    rate.add_line("achieved", points(records_, [=](const PictureRecord& record) {
                      const double covered = record.start + record.duration - begin;
                      return covered < shortest - 1e-6
                                 ? std::nullopt
                                 : std::optional<double>(record.last_second_kbs);
                  }));
    if (summary_.target_kbs != 0) {
        rate.add_level("target", summary_.target_kbs);
    }
    SvgPlot bits("Size of pictures", "kbit", begin, end, true);
    bits.add_line("picture", points(records_, kilobits));
    bits.add_marks("key frame", points(records_, of_key_frames(kilobits)));
    SvgPlot quantiser("Quantiser", "QP", begin, end, false);
    quantiser.add_line("picture", points(records_, qp));
    quantiser.add_marks("key frame", points(records_, of_key_frames(qp)));
    std::string text = rate.html() + bits.html() + quantiser.html();
    if (summary_.tally.quality()) {
        SvgPlot psnr("Quality", "PSNR-Y, dB", begin, end, false);
        psnr.add_line("picture", points(records_, luma_psnr));
        psnr.add_marks("key frame", points(records_, of_key_frames(luma_psnr)));
        text += psnr.html();
    }
    return "<h2>Over time</h2>\n<div class=\"plots\">" + text + "</div>\n";
}

std::string ReportPage::pictures() const {
    if (pictures_.empty()) {
        return "<h2>Pictures</h2>\n<p class=\"soft\">This zoltenc was built without libavcodec, "
               "which shows them.</p>\n";
    }
    const bool large = pictures_.front().width >= PictureSection::kSmallWidth;
    std::string text = std::string("<h2>Pictures</h2>\n") + kPictureNotes + "<div class=\"gallery" +
                       (large ? " large" : "") + "\">\n";
    int number = 0;
    for (const ReportPicture& picture : pictures_) {
        text += PictureSection(picture, number++).html();
    }
    return text + "</div>\n";
}

}  // namespace zolt
