#include "color/ColorConverter.h"

#include <algorithm>
#include <climits>
#include <cstdint>
#include <cstring>
#include <numeric>

#include "color/color_rows.h"
#include "support/ErrMgr.h"
#include "support/Util.h"

using namespace zolt;

namespace {

// Formats that differ in nothing but channel order share a class and its conversions.
enum FormatClass { kClassBGRA, kClassBGR, kClassAYUV, kClassYUY2, kClassIYUV, kFormatClasses };

struct FormatInfo {
    int code;
    FormatClass format_class;
    int min_width_multiple, min_height_multiple;
    Rgba offsets;
    int pair_bytes;  // bytes of two pixels
};

constexpr FormatInfo kFormats[] = {
    {ColorConverter::kBGRA, kClassBGRA, 1, 1, {2, 1, 0, 3}, 8},
    {ColorConverter::kRGBA, kClassBGRA, 1, 1, {0, 1, 2, 3}, 8},
    {ColorConverter::kARGB, kClassBGRA, 1, 1, {1, 2, 3, 0}, 8},
    {ColorConverter::kBGR, kClassBGR, 1, 1, {2, 1, 0, 3}, 6},
    {ColorConverter::kRGB, kClassBGR, 1, 1, {0, 1, 2, 3}, 6},
    {ColorConverter::kAYUV, kClassAYUV, 1, 1, {0, 0, 0, 0}, 8},
    {ColorConverter::kYUY2, kClassYUY2, 2, 1, {0, 0, 0, 0}, 4},
    {ColorConverter::kIYUV, kClassIYUV, 2, 2, {0, 0, 0, 0}, 3},
};

constexpr char kClassName[] = "ColorConverter";
constexpr char kFactoryName[] = "GetNewColorConverter";

const FormatInfo* find_format(int code) {
    for (const FormatInfo& format : kFormats) {
        if (format.code == code) {
            return &format;
        }
    }
    return nullptr;
}

// Bytes of a picture of positive size; exact as far as int reaches, above it beyond.
long long picture_bytes(int width, int height, const FormatInfo& format) {
    const long long pixels = static_cast<long long>(width) * height;
    return pixels > INT_MAX ? pixels : pixels * format.pair_bytes / 2;
}

// The least common multiple of what is asked (at least `needed`) and what is needed.
int common_multiple(int asked, int needed) {
    const long long multiple =
        std::lcm(static_cast<long long>(std::max(asked, needed)), static_cast<long long>(needed));
    return static_cast<int>(std::min<long long>(multiple, INT_MAX));
}

// Copies width x height bytes between planes of the given strides.
void copy_plane(const std::uint8_t* from, int from_stride, std::uint8_t* to, int to_stride,
                int width, int height) {
    for (int y = 0; y < height; ++y) {
        std::memcpy(to + y * to_stride, from + y * from_stride, static_cast<std::size_t>(width));
    }
}

// The centred start of `inner` samples within `outer`, on a multiple of `multiple`.
int central_start(int outer, int inner, int multiple) {
    return (outer - inner) / 2 / multiple * multiple;
}

}  // namespace

ColorConverter* ColorConverter::GetNewColorConverter(int srcWidth, int srcHeight, int srcFormat,
                                                     int outFormat, int widthMultiple,
                                                     int heightMultiple) {
    if (srcWidth < 1 || srcHeight < 1) {
        ErrMgr::AddErr(kClassName, kFactoryName, nullptr,
                       "Source dimensions (%d,%d) must be positive", srcWidth, srcHeight);
        return nullptr;
    }
    char code[5];
    const FormatInfo* source = find_format(srcFormat);
    if (source == nullptr) {
        ErrMgr::AddErr(kClassName, kFactoryName, nullptr, "Source color format undefined: %s",
                       Util::FourccToString(srcFormat, code));
        return nullptr;
    }
    const FormatInfo* result = find_format(outFormat);
    if (result == nullptr) {
        ErrMgr::AddErr(kClassName, kFactoryName, nullptr, "Result color format undefined: %s",
                       Util::FourccToString(outFormat, code));
        return nullptr;
    }
    widthMultiple = common_multiple(widthMultiple, result->min_width_multiple);
    heightMultiple = common_multiple(heightMultiple, result->min_height_multiple);
    const int outWidth = srcWidth / widthMultiple * widthMultiple;
    const int outHeight = srcHeight / heightMultiple * heightMultiple;
    if (outWidth < 1 || outHeight < 1) {
        ErrMgr::AddErr(
            kClassName, kFactoryName, nullptr,
            "Source dimensions (%d,%d) too small to be the requested/required multiple of (%d,%d)",
            srcWidth, srcHeight, widthMultiple, heightMultiple);
        return nullptr;
    }
    if (picture_bytes(srcWidth, srcHeight, *source) > INT_MAX ||
        picture_bytes(outWidth, outHeight, *result) > INT_MAX) {
        ErrMgr::AddErr(kClassName, kFactoryName, nullptr, "Source dimensions (%d,%d) are too large",
                       srcWidth, srcHeight);
        return nullptr;
    }
    return new ColorConverter(srcWidth, srcHeight, srcFormat, outWidth, outHeight, outFormat);
}

ColorConverter::ColorConverter(int srcWidth, int srcHeight, int srcFormat, int outWidth,
                               int outHeight, int outFormat)
    : sourceWidth(srcWidth),
      sourceHeight(srcHeight),
      sourceFormat(srcFormat),
      outputWidth(outWidth),
      outputHeight(outHeight),
      resultFormat(outFormat),
      outputSize(GetBufferSize(outWidth, outHeight, outFormat)),
      outputBuffer(std::make_unique<unsigned char[]>(static_cast<std::size_t>(outputSize))),
      conversion(outWidth <= srcWidth && outHeight <= srcHeight && outputSize > 0 &&
                         GetBufferSize(srcWidth, srcHeight, srcFormat) > 0 &&
                         RoundDownWidth(outWidth, outFormat) == outWidth &&
                         RoundDownHeight(outHeight, outFormat) == outHeight
                     ? FindConversion(srcFormat, outFormat)
                     : nullptr) {
    if (conversion != nullptr) {
        cropX = central_start(srcWidth, outWidth, GetMinWidthMultiple(srcFormat));
        cropY = central_start(srcHeight, outHeight, GetMinHeightMultiple(srcFormat));
    }
    GetOffsetsRGBA(srcFormat, &sourceOffsetR, &sourceOffsetG, &sourceOffsetB, &sourceOffsetA);
    GetOffsetsRGBA(outFormat, &resultOffsetR, &resultOffsetG, &resultOffsetB, &resultOffsetA);
    FillTablesRGB2YUV();
    FillTablesYUV2RGB();
}

void ColorConverter::Convert(const unsigned char* source) {
    if (conversion != nullptr) {
        (this->*conversion)(source);
    }
}

int ColorConverter::ColorFormatUndefined(int format) {
    return find_format(format) == nullptr;
}

int ColorConverter::GetMinWidthMultiple(int format) {
    const FormatInfo* info = find_format(format);
    return info == nullptr ? 0 : info->min_width_multiple;
}

int ColorConverter::GetMinHeightMultiple(int format) {
    const FormatInfo* info = find_format(format);
    return info == nullptr ? 0 : info->min_height_multiple;
}

void ColorConverter::GetOffsetsRGBA(int format, int* r, int* g, int* b, int* a) {
    const FormatInfo* info = find_format(format);
    const Rgba offsets = info == nullptr ? Rgba{0, 0, 0, 0} : info->offsets;
    *r = offsets.r;
    *g = offsets.g;
    *b = offsets.b;
    *a = offsets.a;
}

int ColorConverter::GetBufferSize(int width, int height, int format) {
    const FormatInfo* info = find_format(format);
    if (info == nullptr || width < 1 || height < 1) {
        return 0;
    }
    const long long bytes = picture_bytes(width, height, *info);
    return bytes > INT_MAX ? 0 : static_cast<int>(bytes);
}

int ColorConverter::GetReadSize(int width, int height, int format) {
    const int bytes = GetBufferSize(width, height, format);
    // Planes of odd size are rounded down one by one, the picture as a whole.
    return format == kIYUV && bytes > 0 ? width * height + 2 * ((width / 2) * (height / 2)) : bytes;
}

int ColorConverter::RoundDownWidth(int width, int format) {
    const int multiple = GetMinWidthMultiple(format);
    return multiple == 0 ? 0 : Util::RoundDown(width, multiple);
}

int ColorConverter::RoundDownHeight(int height, int format) {
    const int multiple = GetMinHeightMultiple(format);
    return multiple == 0 ? 0 : Util::RoundDown(height, multiple);
}

unsigned char* ColorConverter::GetNewBlankImage(int width, int height, int format) {
    const int bytes = GetBufferSize(width, height, format);
    if (bytes == 0) {
        return nullptr;
    }
    // Every packed format repeats a pattern of at most four bytes.
    std::uint8_t pattern[4] = {0, 0, 0, 0};
    int period = 1;
    switch (format) {
        case kAYUV:
            put_ayuv(pattern, kOpaque, 0, kNeutralChroma, kNeutralChroma);
            period = 4;
            break;
        case kARGB:
        case kBGRA:
        case kRGBA:
            pattern[format == kARGB ? 0 : 3] = kOpaque;
            period = 4;
            break;
        case kYUY2:
            pattern[1] = kNeutralChroma;
            period = 2;
            break;
        default:
            break;
    }
    unsigned char* image = new unsigned char[static_cast<std::size_t>(bytes)];
    for (int i = 0; i < bytes; ++i) {
        image[i] = pattern[i % period];
    }
    if (format == kIYUV) {
        const int luma_bytes = width * height;
        std::memset(image + luma_bytes, kNeutralChroma, static_cast<size_t>(bytes - luma_bytes));
    }
    return image;
}

void ColorConverter::RGB2YUV(unsigned char r, unsigned char g, unsigned char b, unsigned char* y,
                             unsigned char* u, unsigned char* v) {
    FillTablesRGB2YUV();
    const int luma_value = luma(r, g, b);
    *y = static_cast<std::uint8_t>(luma_value);
    *u = chroma_u(b, luma_value);
    *v = chroma_v(r, luma_value);
}

void ColorConverter::FillTablesRGB2YUV() {
    fill_tables_rgb_to_yuv();
}

void ColorConverter::FillTablesYUV2RGB() {
    fill_tables_yuv_to_rgb();
}

ColorConverter::Conversion ColorConverter::FindConversion(int srcFormat, int outFormat) {
    static constexpr Conversion kConversions[kFormatClasses][kFormatClasses] = {
        {&ColorConverter::Convert_BGRA_to_BGRA, &ColorConverter::Convert_BGRA_to_BGR,
         &ColorConverter::Convert_BGRA_to_AYUV, &ColorConverter::Convert_BGRA_to_YUY2,
         &ColorConverter::Convert_BGRA_to_IYUV},
        {&ColorConverter::Convert_BGR_to_BGRA, &ColorConverter::Convert_BGR_to_BGR,
         &ColorConverter::Convert_BGR_to_AYUV, &ColorConverter::Convert_BGR_to_YUY2,
         &ColorConverter::Convert_BGR_to_IYUV},
        {&ColorConverter::Convert_AYUV_to_BGRA, &ColorConverter::Convert_AYUV_to_BGR,
         &ColorConverter::Convert_AYUV_to_AYUV, &ColorConverter::Convert_AYUV_to_YUY2,
         &ColorConverter::Convert_AYUV_to_IYUV},
        {&ColorConverter::Convert_YUY2_to_BGRA, &ColorConverter::Convert_YUY2_to_BGR,
         &ColorConverter::Convert_YUY2_to_AYUV, &ColorConverter::Convert_YUY2_to_YUY2,
         &ColorConverter::Convert_YUY2_to_IYUV},
        {&ColorConverter::Convert_IYUV_to_BGRA, &ColorConverter::Convert_IYUV_to_BGR,
         &ColorConverter::Convert_IYUV_to_AYUV, &ColorConverter::Convert_IYUV_to_YUY2,
         &ColorConverter::Convert_IYUV_to_IYUV},
    };
    const FormatInfo* source = find_format(srcFormat);
    const FormatInfo* result = find_format(outFormat);
    return source == nullptr || result == nullptr
               ? nullptr
               : kConversions[source->format_class][result->format_class];
}

void ColorConverter::Convert_BGRA_to_BGRA(const unsigned char* source) {
    if (sourceFormat == resultFormat) {
        CopyRows(source, 4);
    } else {
        RgbToRgb<4, 4>(source);
    }
}

void ColorConverter::Convert_BGRA_to_BGR(const unsigned char* source) {
    RgbToRgb<4, 3>(source);
}

void ColorConverter::Convert_BGRA_to_AYUV(const unsigned char* source) {
    RgbToAyuv<4>(source);
}

void ColorConverter::Convert_BGRA_to_YUY2(const unsigned char* source) {
    RgbToYuy2<4>(source);
}

void ColorConverter::Convert_BGRA_to_IYUV(const unsigned char* source) {
    RgbToIyuv(source, 4, best_kernels().rgb32_rows_to_iyuv);
}

void ColorConverter::Convert_BGR_to_BGRA(const unsigned char* source) {
    RgbToRgb<3, 4>(source);
}

void ColorConverter::Convert_BGR_to_BGR(const unsigned char* source) {
    CopyRows(source, 3);
}

void ColorConverter::Convert_BGR_to_AYUV(const unsigned char* source) {
    RgbToAyuv<3>(source);
}

void ColorConverter::Convert_BGR_to_YUY2(const unsigned char* source) {
    RgbToYuy2<3>(source);
}

void ColorConverter::Convert_BGR_to_IYUV(const unsigned char* source) {
    RgbToIyuv(source, 3, best_kernels().rgb24_rows_to_iyuv);
}

void ColorConverter::Convert_AYUV_to_BGRA(const unsigned char* source) {
    AyuvToRgb<4>(source);
}

void ColorConverter::Convert_AYUV_to_BGR(const unsigned char* source) {
    AyuvToRgb<3>(source);
}

void ColorConverter::Convert_AYUV_to_AYUV(const unsigned char* source) {
    CopyRows(source, 4);
}

void ColorConverter::Convert_AYUV_to_YUY2(const unsigned char* source) {
    ForEachRow(source, 4, 2, [&](const std::uint8_t* from, std::uint8_t* to) {
        ayuv_row_to_yuy2(from, to, outputWidth);
    });
}

void ColorConverter::Convert_AYUV_to_IYUV(const unsigned char* source) {
    YuvToIyuv(source, 4, best_kernels().ayuv_rows_to_iyuv);
}

void ColorConverter::Convert_YUY2_to_BGRA(const unsigned char* source) {
    Yuy2ToRgb<4>(source);
}

void ColorConverter::Convert_YUY2_to_BGR(const unsigned char* source) {
    Yuy2ToRgb<3>(source);
}

void ColorConverter::Convert_YUY2_to_AYUV(const unsigned char* source) {
    ForEachYuy2Row(source, 4, [&](const PairedRow& row, std::uint8_t* to) {
        paired_row_to_pixels<4>(row, to, outputWidth, [](std::uint8_t* pixel, int y, int u, int v) {
            put_ayuv(pixel, kOpaque, y, u, v);
        });
    });
}

void ColorConverter::Convert_YUY2_to_YUY2(const unsigned char* source) {
    CopyRows(source, 2);
}

void ColorConverter::Convert_YUY2_to_IYUV(const unsigned char* source) {
    YuvToIyuv(source, 2, best_kernels().yuy2_rows_to_iyuv);
}

void ColorConverter::Convert_IYUV_to_BGRA(const unsigned char* source) {
    IyuvToRgb<4>(source);
}

void ColorConverter::Convert_IYUV_to_BGR(const unsigned char* source) {
    IyuvToRgb<3>(source);
}

void ColorConverter::Convert_IYUV_to_AYUV(const unsigned char* source) {
    ForEachIyuvRow(source, 4, [&](const PairedRow& row, std::uint8_t* to) {
        paired_row_to_pixels<4>(row, to, outputWidth, [](std::uint8_t* pixel, int y, int u, int v) {
            put_ayuv(pixel, kOpaque, y, u, v);
        });
    });
}

void ColorConverter::Convert_IYUV_to_YUY2(const unsigned char* source) {
    ForEachIyuvRow(source, 2, [&](const PairedRow& row, std::uint8_t* to) {
        paired_row_to_yuy2(row, to, outputWidth);
    });
}

void ColorConverter::Convert_IYUV_to_IYUV(const unsigned char* source) {
    std::uint8_t* to = outputBuffer.get();
    if (!NeedsCropping()) {
        std::memcpy(to, source, static_cast<std::size_t>(outputSize));
        return;
    }
    copy_plane(source + cropY * sourceWidth + cropX, sourceWidth, to, outputWidth, outputWidth,
               outputHeight);
    source += sourceWidth * sourceHeight;
    to += outputWidth * outputHeight;
    const int chroma_width = sourceWidth / 2;
    const int out_width = outputWidth / 2;
    const int out_height = outputHeight / 2;
    for (int plane = 0; plane < 2; ++plane) {
        copy_plane(source + cropY / 2 * chroma_width + cropX / 2, chroma_width, to, out_width,
                   out_width, out_height);
        source += chroma_width * (sourceHeight / 2);
        to += out_width * out_height;
    }
}

template <int kFrom, int kTo>
void ColorConverter::RgbToRgb(const unsigned char* source) {
    const Rgba in = SourceOffsets();
    const Rgba out = ResultOffsets();
    ForEachRow(source, kFrom, kTo, [&](const std::uint8_t* from, std::uint8_t* to) {
        rgb_row_to_rgb<kFrom, kTo>(from, in, to, out, outputWidth);
    });
}

template <int kFrom>
void ColorConverter::RgbToAyuv(const unsigned char* source) {
    const Rgba in = SourceOffsets();
    ForEachRow(source, kFrom, 4, [&](const std::uint8_t* from, std::uint8_t* to) {
        rgb_row_to_ayuv<kFrom>(from, in, to, outputWidth);
    });
}

template <int kFrom>
void ColorConverter::RgbToYuy2(const unsigned char* source) {
    const Rgba in = SourceOffsets();
    ForEachRow(source, kFrom, 2, [&](const std::uint8_t* from, std::uint8_t* to) {
        rgb_row_to_yuy2<kFrom>(from, in, to, outputWidth);
    });
}

void ColorConverter::RgbToIyuv(const unsigned char* source, int pixelBytes,
                               Kernels::RgbConversion kernel) {
    const RgbOffsets at = {sourceOffsetR, sourceOffsetG, sourceOffsetB};
    ForEachRowPair(source, pixelBytes,
                   [&](const std::uint8_t* upper, const std::uint8_t* lower, const IyuvRows& to) {
                       kernel(upper, lower, at, to, outputWidth);
                   });
}

void ColorConverter::YuvToIyuv(const unsigned char* source, int pixelBytes,
                               Kernels::YuvConversion kernel) {
    ForEachRowPair(source, pixelBytes,
                   [&](const std::uint8_t* upper, const std::uint8_t* lower, const IyuvRows& to) {
                       kernel(upper, lower, to, outputWidth);
                   });
}

template <int kTo>
void ColorConverter::AyuvToRgb(const unsigned char* source) {
    const Rgba out = ResultOffsets();
    ForEachRow(source, 4, kTo, [&](const std::uint8_t* from, std::uint8_t* to) {
        ayuv_row_to_rgb<kTo>(from, to, out, outputWidth);
    });
}

template <int kTo>
void ColorConverter::Yuy2ToRgb(const unsigned char* source) {
    const Rgba out = ResultOffsets();
    ForEachYuy2Row(source, kTo, [&](const PairedRow& row, std::uint8_t* to) {
        paired_row_to_rgb<kTo>(row, to, out, outputWidth);
    });
}

template <int kTo>
void ColorConverter::IyuvToRgb(const unsigned char* source) {
    const Rgba out = ResultOffsets();
    ForEachIyuvRow(source, kTo, [&](const PairedRow& row, std::uint8_t* to) {
        paired_row_to_rgb<kTo>(row, to, out, outputWidth);
    });
}

bool ColorConverter::NeedsCropping() const {
    return sourceWidth != outputWidth || sourceHeight != outputHeight;
}

Rgba ColorConverter::SourceOffsets() const {
    return {sourceOffsetR, sourceOffsetG, sourceOffsetB, sourceOffsetA};
}

Rgba ColorConverter::ResultOffsets() const {
    return {resultOffsetR, resultOffsetG, resultOffsetB, resultOffsetA};
}

// The output's part of a packed picture, bytes as they stand.
void ColorConverter::CopyRows(const unsigned char* source, int pixelBytes) {
    if (!NeedsCropping()) {
        std::memcpy(outputBuffer.get(), source, static_cast<std::size_t>(outputSize));
        return;
    }
    ForEachRow(source, pixelBytes, pixelBytes, [&](const std::uint8_t* from, std::uint8_t* to) {
        std::memcpy(to, from,
                    static_cast<std::size_t>(outputWidth) * static_cast<std::size_t>(pixelBytes));
    });
}

// Calls kernel(from, to) with the start of every output row in two packed pictures.
template <class RowKernel>
void ColorConverter::ForEachRow(const unsigned char* source, int sourceBytes, int resultBytes,
                                RowKernel kernel) {
    for (int y = 0; y < outputHeight; ++y) {
        kernel(source + ((cropY + y) * sourceWidth + cropX) * sourceBytes,
               outputBuffer.get() + y * outputWidth * resultBytes);
    }
}

// Calls kernel(upper, lower, to) with the start of every pair of output rows in a packed source and
// in a 4:2:0 result.
template <class RowKernel>
void ColorConverter::ForEachRowPair(const unsigned char* source, int sourceBytes,
                                    RowKernel kernel) {
    std::uint8_t* y_plane = outputBuffer.get();
    std::uint8_t* u_plane = y_plane + outputWidth * outputHeight;
    std::uint8_t* v_plane = u_plane + (outputWidth / 2) * (outputHeight / 2);
    for (int y = 0; y < outputHeight; y += 2) {
        const std::uint8_t* from = source + ((cropY + y) * sourceWidth + cropX) * sourceBytes;
        std::uint8_t* to = y_plane + y * outputWidth;
        const int chroma_at = y / 2 * (outputWidth / 2);
        kernel(from, from + sourceWidth * sourceBytes,
               IyuvRows{to, to + outputWidth, u_plane + chroma_at, v_plane + chroma_at});
    }
}

// Calls kernel(row, to) for every output row of a YUY2 source and a packed result.
template <class RowKernel>
void ColorConverter::ForEachYuy2Row(const unsigned char* source, int resultBytes,
                                    RowKernel kernel) {
    const int chroma_count = (sourceWidth - cropX) / 2;
    ForEachRow(source, 2, resultBytes, [&](const std::uint8_t* from, std::uint8_t* to) {
        kernel(chroma_count > 0 ? PairedRow{from, 2, from + kYuy2U, from + kYuy2V, 4, chroma_count}
                                : PairedRow{from, 2, &kNeutralChroma, &kNeutralChroma, 0, 1},
               to);
    });
}

// Calls kernel(row, to) for every output row of a 4:2:0 source and a packed result.
template <class RowKernel>
void ColorConverter::ForEachIyuvRow(const unsigned char* source, int resultBytes,
                                    RowKernel kernel) {
    const int chroma_width = sourceWidth / 2;
    const int chroma_height = sourceHeight / 2;
    const bool has_chroma = chroma_width > 0 && chroma_height > 0;
    const std::uint8_t* u_plane = source + sourceWidth * sourceHeight;
    const std::uint8_t* v_plane = u_plane + chroma_width * chroma_height;
    for (int y = cropY; y < cropY + outputHeight; ++y) {
        const int at = std::min(y / 2, chroma_height - 1) * chroma_width + cropX / 2;
        const std::uint8_t* from = source + y * sourceWidth + cropX;
        kernel(has_chroma
                   ? PairedRow{from, 1, u_plane + at, v_plane + at, 1, chroma_width - cropX / 2}
                   : PairedRow{from, 1, &kNeutralChroma, &kNeutralChroma, 0, 1},
               outputBuffer.get() + (y - cropY) * outputWidth * resultBytes);
    }
}
