#include "ReferenceConverter.h"

#include <algorithm>
#include <cmath>
#include <map>
#include <string>

#include "media/fourcc.h"

using zolt::fourcc;

const std::vector<int> kAllFormats = {fourcc("BGRA"), fourcc("RGBA"), fourcc("ARGB"),
                                      fourcc("BGR "), fourcc("RGB "), fourcc("AYUV"),
                                      fourcc("YUY2"), fourcc("IYUV")};

namespace {

std::string name_of(int format) {
    std::string name;
    for (int shift = 24; shift >= 0; shift -= 8) {
        name += static_cast<char>(format >> shift & 255);
    }
    return name[3] == ' ' ? name.substr(0, 3) : name;
}

bool is_rgb(int format) {
    return name_of(format).find('B') != std::string::npos;
}
bool is_packed(int format) {
    return format != fourcc("YUY2") && format != fourcc("IYUV");
}

double clamped(double value) {
    return std::min(255.0, std::max(0.0, value));
}

// A channel's letter ('A', 'R', 'G', 'B', 'Y', 'U', 'V') and its value.
using Pixel = std::map<char, double>;

double luma_of(const Pixel& pixel) {
    return std::floor(0.3 * pixel.at('R') + 0.5) + std::floor(0.59 * pixel.at('G') + 0.5) +
           std::floor(0.11 * pixel.at('B') + 0.5);
}

Pixel read_pixel(const Picture& picture, Size size, int format, int x, int y) {
    Pixel pixel{{'A', 255.0}};
    if (is_packed(format)) {
        // The format's name is the pixel's layout.
        const std::string layout = name_of(format);
        for (size_t i = 0; i < layout.size(); ++i) {
            pixel[layout[i]] = picture.at((y * size.width + x) * layout.size() + i);
        }
        return pixel;
    }
    const int chroma_width = size.width / 2;
    const int chroma_x = std::min(x / 2, chroma_width - 1);
    pixel['U'] = pixel['V'] = 128.0;
    if (format == fourcc("YUY2")) {
        const int row = 2 * size.width * y;
        pixel['Y'] = picture.at(row + 2 * x);
        if (chroma_x >= 0) {
            pixel['U'] = picture.at(row + 4 * chroma_x + 1);
            pixel['V'] = picture.at(row + 4 * chroma_x + 3);
        }
        return pixel;
    }
    const int chroma_height = size.height / 2;
    const int chroma_y = std::min(y / 2, chroma_height - 1);
    pixel['Y'] = picture.at(y * size.width + x);
    if (chroma_x >= 0 && chroma_y >= 0) {
        const int u = size.width * size.height + chroma_y * chroma_width + chroma_x;
        pixel['U'] = picture.at(u);
        pixel['V'] = picture.at(u + chroma_width * chroma_height);
    }
    return pixel;
}

void add_rgb(Pixel* pixel) {
    const double y = pixel->at('Y');
    const double u = pixel->at('U') - 128;
    const double v = pixel->at('V') - 128;
    (*pixel)['R'] = clamped(y + std::round(1.4 * v));
    (*pixel)['G'] =
        clamped(y + std::round(-0.11 * 1.78 / 0.59 * u) + std::round(-0.3 * 1.4 / 0.59 * v));
    (*pixel)['B'] = clamped(y + std::round(1.78 * u));
}

// Luma of each pixel and the chroma that the pixels share.
void add_yuv(std::vector<Pixel>* pixels) {
    const auto mean = [&](char channel) {
        double sum = 0;
        for (const Pixel& pixel : *pixels) {
            sum += pixel.at(channel);
        }
        return std::floor(sum / static_cast<double>(pixels->size()));
    };
    double u, v;
    if (pixels->front().count('Y') != 0) {
        u = mean('U');
        v = mean('V');
    } else {
        for (Pixel& pixel : *pixels) {
            pixel['Y'] = luma_of(pixel);
        }
        u = clamped(std::round(128 + (mean('B') - mean('Y')) / 1.78));
        v = clamped(std::round(128 + (mean('R') - mean('Y')) / 1.4));
    }
    for (Pixel& pixel : *pixels) {
        pixel['U'] = u;
        pixel['V'] = v;
    }
}

int central(int outer, int inner, bool on_a_pair) {
    const int start = (outer - inner) / 2;
    return on_a_pair ? start - start % 2 : start;
}

}  // namespace

int picture_size(Size size, int format) {
    const int pixels = size.width * size.height;
    return format == fourcc("IYUV")   ? pixels * 3 / 2
           : format == fourcc("YUY2") ? pixels * 2
                                      : pixels * static_cast<int>(name_of(format).size());
}

Picture reference_convert(const Picture& source, Size source_size, int source_format,
                          Size output_size, int result_format) {
    // Bytes of 3-byte pixels are taken as they stand: the source counts as in the result's order.
    if (name_of(source_format).size() == 3 && name_of(result_format).size() == 3) {
        source_format = result_format;
    }
    const int left = central(source_size.width, output_size.width, !is_packed(source_format));
    const int top =
        central(source_size.height, output_size.height, source_format == fourcc("IYUV"));
    const int block_width = is_packed(result_format) ? 1 : 2;
    const int block_height = result_format == fourcc("IYUV") ? 2 : 1;

    Picture result(static_cast<size_t>(picture_size(output_size, result_format)));
    const auto put = [&](int at, const Pixel& pixel, char channel) {
        result.at(static_cast<size_t>(at)) = static_cast<unsigned char>(pixel.at(channel));
    };
    for (int y = 0; y < output_size.height; y += block_height) {
        for (int x = 0; x < output_size.width; x += block_width) {
            std::vector<Pixel> block;
            for (int i = 0; i < block_width * block_height; ++i) {
                block.push_back(read_pixel(source, source_size, source_format,
                                           left + x + i % block_width, top + y + i / block_width));
            }
            if (!is_rgb(result_format)) {
                add_yuv(&block);
            } else if (!is_rgb(source_format)) {
                add_rgb(&block.front());
            }
            const int pixel_at = y * output_size.width + x;
            if (is_packed(result_format)) {
                const std::string layout = name_of(result_format);
                const int bytes = static_cast<int>(layout.size());
                for (int i = 0; i < bytes; ++i) {
                    put(pixel_at * bytes + i, block.front(), layout[static_cast<size_t>(i)]);
                }
            } else if (result_format == fourcc("YUY2")) {
                put(2 * pixel_at, block[0], 'Y');
                put(2 * pixel_at + 1, block[0], 'U');
                put(2 * pixel_at + 2, block[1], 'Y');
                put(2 * pixel_at + 3, block[1], 'V');
            } else {
                for (int i = 0; i < 4; ++i) {
                    put(pixel_at + i / 2 * output_size.width + i % 2, block[static_cast<size_t>(i)],
                        'Y');
                }
                const int pixels = output_size.width * output_size.height;
                const int chroma_at = pixels + y / 2 * (output_size.width / 2) + x / 2;
                put(chroma_at, block[0], 'U');
                put(chroma_at + pixels / 4, block[0], 'V');
            }
        }
    }
    return result;
}
