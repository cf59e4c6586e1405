#include "zoltenc/report/PictureSection.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdlib>
#include <map>

#include "zoltenc/report/markup.h"

namespace zolt {
namespace {

struct TypeName {
    const char* style;
    const char* text;
};
// In the order of MacroblockMap::Type.
constexpr std::array<TypeName, MacroblockMap::kTypes> kTypeNames = {{
    {"skipped", "skipped"},
    {"inter_16x16", "inter 16x16"},
    {"inter_parts", "inter in parts"},
    {"intra_16x16", "intra 16x16"},
    {"intra_4x4", "intra 4x4"},
    {"pcm", "PCM"},
}};

// More macroblocks or motion vectors than these are drawn by a part of them, in both directions.
constexpr double kMostCells = 8200;
constexpr double kMostVectors = 3600;

int step_for(double count, double most) {
    return std::max(1, static_cast<int>(std::ceil(std::sqrt(count / most))));
}

}  // namespace

std::string PictureSection::html() const {
    std::string controls =
        control("radio", "input", "input", false) + control("radio", "output", "output", true);
    std::string layers;
    if (!picture_.map.types.empty()) {
        controls += control("checkbox", "types", "macroblock types", false);
        layers += types_layer();
    }
    if (!picture_.map.motion.empty()) {
        controls += control("checkbox", "motion", "motion", false);
        layers += motion_layer();
    }
    if (has_several_qps()) {
        controls += control("checkbox", "qp", "QP", false);
        layers += qp_layer();
    }
    const char* const small = picture_.width < kSmallWidth ? " small" : "";
    const auto image = [&](const char* kind, const std::vector<unsigned char>& file) {
        return std::string("<img class=\"") + kind + small + "\" alt=\"" + kind +
               formatted("\" width=\"%d\" height=\"%d\" src=\"", picture_.width, picture_.height) +
               data_address("image/jpeg", file) + "\">";
    };
    return "<article class=\"picture\">" + heading() + controls + "<div class=\"stage\">" +
           image("input", picture_.input) + image("output", picture_.output) + layers + "</div>" +
           type_counts() + "</article>\n";
}

std::string PictureSection::heading() const {
    const PictureRecord& record = picture_.record;
    std::string text = "<div><h3>Picture " + std::to_string(record.index) + ", " + picture_.reason +
                       "</h3><p class=\"soft\">";
    text += formatted("%.3f s, %s, ", record.start,
                      record.is_key        ? "key frame"
                      : record.type == 'I' ? "intra"
                                           : "predicted");
    text += std::to_string(record.bytes) + " bytes";
    if (record.qp) {
        text += formatted(", QP %d", *record.qp);
    }
    if (record.quality) {
        text += formatted(", PSNR-Y %.2f dB, SSIM-Y %.4f",
                          PictureQuality::psnr(record.quality->mse_y), record.quality->ssim_y);
    }
    return text + "</p></div>";
}

std::string PictureSection::control(const char* kind, const char* layer, const char* text,
                                    bool is_on) const {
    const std::string id = formatted("%s%d", layer, number_);
    return std::string("<input type=\"") + kind + "\" class=\"show-" + layer + "\" id=\"" + id +
           formatted("\" name=\"view%d%s\"", number_, std::string(kind) == "radio" ? "" : layer) +
           (is_on ? " checked" : "") + "><label for=\"" + id + "\">" + text + "</label>";
}

// One path for each value that occurs, of lines along runs of macroblocks; `attributes` gives what
// it looks like, or an empty text where there is nothing to draw.
template <class Value, class Attributes>
std::string PictureSection::map_layer(const char* layer, const std::vector<Value>& values,
                                      Attributes attributes) const {
    const MacroblockMap& map = picture_.map;
    const int step = step_for(static_cast<double>(values.size()), kMostCells);
    std::map<Value, std::string> paths;
    for (int y = 0; y < map.rows; y += step) {
        const Value* const row = &values[static_cast<std::size_t>(y) * map.columns];
        for (int x = 0; x < map.columns;) {
            const int begin = x;
            do {
                x += step;
            } while (x < map.columns && row[x] == row[begin]);
            paths[row[begin]] +=
                formatted("M%d %d.5h%d", begin / step, y / step, (x - begin) / step);
        }
    }
    std::string text =
        std::string("<svg class=\"") + layer +
        formatted("\" viewBox=\"0 0 %g %g\" preserveAspectRatio=\"none\">",
                  static_cast<double>(map.columns) / step, static_cast<double>(map.rows) / step);
    for (const auto& [value, path] : paths) {
        const std::string look = attributes(value);
        if (!look.empty()) {
            text.append("<path ").append(look).append(" d=\"").append(path).append("\"/>");
        }
    }
    return text + "</svg>";
}

std::string PictureSection::types_layer() const {
    return map_layer("types", picture_.map.types, [](MacroblockMap::Type type) {
        return type == MacroblockMap::Type::skipped
                   ? std::string()
                   : formatted("class=\"%s\"", kTypeNames[static_cast<std::size_t>(type)].style);
    });
}

// In quarters of a luma sample. Vectors of zero are not drawn.
std::string PictureSection::motion_layer() const {
    constexpr int kMacroblockSide = 16;
    const int step = step_for(static_cast<double>(picture_.map.motion.size()), kMostVectors);
    std::string lines;
    std::string ends;
    for (const MacroblockMap::Motion& motion : picture_.map.motion) {
        const bool is_drawn = motion.x / kMacroblockSide % step == 0 &&
                              motion.y / kMacroblockSide % step == 0 &&
                              (motion.dx != 0 || motion.dy != 0);
        if (is_drawn) {
            lines += formatted("M%d %dl%d %d", 4 * motion.x, 4 * motion.y, motion.dx, motion.dy);
            ends += formatted("M%d %dh0", 4 * motion.x, 4 * motion.y);
        }
    }
    return formatted("<svg class=\"motion\" viewBox=\"0 0 %d %d\" preserveAspectRatio=\"none\">",
                     4 * picture_.width, 4 * picture_.height) +
           formatted(
               "<use class=\"under\" href=\"#vectors%d\"/><path class=\"over\" id=\"vectors%d\" "
               "d=\"",
               number_, number_) +
           lines + "\"/><path class=\"from\" d=\"" + ends + "\"/></svg>";
}

// The higher the QP, the stronger the colour.
std::string PictureSection::qp_layer() const {
    const auto [least, most] = std::minmax_element(picture_.map.qp.begin(), picture_.map.qp.end());
    return map_layer("qp", picture_.map.qp, [low = *least, high = *most](int qp) {
        return formatted("opacity=\"%.2f\"", 0.8 * (qp - low) / (high - low));
    });
}

std::string PictureSection::type_counts() const {
    const std::vector<MacroblockMap::Type>& types = picture_.map.types;
    std::string text;
    for (std::size_t i = 0; i < kTypeNames.size(); ++i) {
        const auto count =
            std::count(types.begin(), types.end(), static_cast<MacroblockMap::Type>(i));
        if (count > 0) {
            const double share = static_cast<double>(count) / static_cast<double>(types.size());
            text +=
                formatted("<span><i class=\"%s\"></i>%s %d (%.1f %%)</span>", kTypeNames[i].style,
                          kTypeNames[i].text, static_cast<int>(count), 100 * share);
        }
    }
    const auto& qp = picture_.map.qp;
    if (has_several_qps()) {
        text += formatted("<span>QP of macroblocks %d to %d</span>",
                          *std::min_element(qp.begin(), qp.end()),
                          *std::max_element(qp.begin(), qp.end()));
    }
    return text.empty() ? "" : "<div class=\"counts\">" + text + "</div>";
}

bool PictureSection::has_several_qps() const {
    const std::vector<int>& qp = picture_.map.qp;
    return std::adjacent_find(qp.begin(), qp.end(), std::not_equal_to<>()) != qp.end();
}

}  // namespace zolt
