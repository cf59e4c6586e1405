#include "zoltenc/PictureStats.h"

#include <cstdio>

namespace zolt {

PictureStats::PictureStats(const std::string& file_name, bool with_quality) : file_(file_name) {
    write_row(std::string("index,time_us,type,bytes,qp") +
              (with_quality ? ",psnr_y,psnr_u,psnr_v,ssim_y" : ""));
}

void PictureStats::add(const PictureRecord& picture) {
    std::string row = std::to_string(picture.index) + "," + std::to_string(picture.time) + ",";
    if (picture.type != '\0') {
        row += picture.type;
    }
    row += "," + std::to_string(picture.bytes) + ",";
    if (picture.qp) {
        row += std::to_string(*picture.qp);
    }
    if (const auto& quality = picture.quality) {
        char text[160];
        std::snprintf(text, sizeof text, ",%.3f,%.3f,%.3f,%.5f",
                      PictureQuality::psnr(quality->mse_y), PictureQuality::psnr(quality->mse_u),
                      PictureQuality::psnr(quality->mse_v), quality->ssim_y);
        row += text;
    }
    write_row(row);
}

void PictureStats::write_row(const std::string& row) {
    const std::string line = row + "\n";
    file_.write(line.data(), line.size());
}

}  // namespace zolt
