#pragma once

#include <memory>

#include "kernels/Kernels.h"
#include "media/fourcc.h"

namespace zolt {
struct Rgba;
}

// Converts uncompressed pictures from one colour format to another and crops them centrally to a
// size that is a multiple of a block size. Never scales, never flips. One thread at a time; the
// lookup tables behind it are shared by all converters.
//
// Pictures are stored top row first, without padding between rows. Samples are 8 bits, full range.
// IYUV holds w x h luma samples, then (w / 2) x (h / 2) U and as many V; YUY2 holds pixel pairs Y0
// U Y1 V. A picture of odd size has pixels without a chroma sample of their own: they take the last
// one of their row or column, or 128 where the picture has none at all.
class ColorConverter {
public:
    static constexpr int kBGRA = zolt::fourcc("BGRA");
    static constexpr int kRGBA = zolt::fourcc("RGBA");
    static constexpr int kARGB = zolt::fourcc("ARGB");
    static constexpr int kBGR = zolt::fourcc("BGR ");
    static constexpr int kRGB = zolt::fourcc("RGB ");
    static constexpr int kAYUV = zolt::fourcc("AYUV");
    static constexpr int kYUY2 = zolt::fourcc("YUY2");
    static constexpr int kIYUV = zolt::fourcc("IYUV");

    // A new converter, owned by the caller, for source pictures of the given size in pixels. Its
    // output is the largest central part whose sides are multiples of the common multiple of what
    // is asked and what the result format needs. Null, with a report to the error manager, for a
    // size that is not positive, too small or too large, and for an undefined format.
    static ColorConverter* GetNewColorConverter(int srcWidth, int srcHeight, int srcFormat,
                                                int outFormat, int widthMultiple,
                                                int heightMultiple);

    // Converter of a given output size, which lies within the source's and is a multiple of what
    // the result format needs; GetNewColorConverter chooses it so. With other arguments Convert
    // does nothing.
    ColorConverter(int srcWidth, int srcHeight, int srcFormat, int outWidth, int outHeight,
                   int outFormat);
    ColorConverter(const ColorConverter&) = delete;
    ColorConverter& operator=(const ColorConverter&) = delete;
    ~ColorConverter() = default;

    // Converts one picture, of GetBufferSize bytes of the source's size and format, into the output
    // buffer. An undefined format leaves the buffer as it was: all 0.
    void Convert(const unsigned char* source);

    // Whether the output is the source as it stands, so that Convert only copies it.
    bool KeepsPictures() const {
        return conversion != nullptr && sourceFormat == resultFormat && !NeedsCropping();
    }

    int GetOutputWidth() const { return outputWidth; }
    int GetOutputHeight() const { return outputHeight; }
    // The converted picture: owned by the converter, overwritten by the next Convert.
    unsigned char* GetOutputBuffer() const { return outputBuffer.get(); }
    int GetOutputSize() const { return outputSize; }
    // Alpha of pixels whose source has none.
    int GetAlphaValue() const { return alphaValue; }

    // 1 when the format is none of the eight, else 0.
    static int ColorFormatUndefined(int format);
    // What the sides of a picture must be multiples of; 0 for an undefined format.
    static int GetMinWidthMultiple(int format);
    static int GetMinHeightMultiple(int format);
    // Positions of the channels in a pixel; all 0 for formats without them.
    static void GetOffsetsRGBA(int format, int* r, int* g, int* b, int* a);
    // Bytes of a picture; 0 for an undefined format, a size that is not positive, and a picture
    // beyond the range of int.
    static int GetBufferSize(int width, int height, int format);
    // Bytes of a picture that are read of it, at most GetBufferSize: its planes.
    static int GetReadSize(int width, int height, int format);
    // The value rounded down to the format's minimum multiple; 0 for an undefined format.
    static int RoundDownWidth(int width, int format);
    static int RoundDownHeight(int height, int format);
    // A new black picture, owned by the caller as an array; null where GetBufferSize is 0.
    static unsigned char* GetNewBlankImage(int width, int height, int format);
    // Converts one pixel.
    static void RGB2YUV(unsigned char r, unsigned char g, unsigned char b, unsigned char* y,
                        unsigned char* u, unsigned char* v);

    // Fill the tables behind the two directions, once per process and safe from any thread.
    static void FillTablesRGB2YUV();
    static void FillTablesYUV2RGB();

private:
    using Conversion = void (ColorConverter::*)(const unsigned char*);
    static Conversion FindConversion(int srcFormat, int outFormat);

    // One conversion per pair of format classes; BGRA stands for every 4-byte RGB format, BGR for
    // the 3-byte ones.
    void Convert_BGRA_to_BGRA(const unsigned char* source);
    void Convert_BGRA_to_BGR(const unsigned char* source);
    void Convert_BGRA_to_AYUV(const unsigned char* source);
    void Convert_BGRA_to_YUY2(const unsigned char* source);
    void Convert_BGRA_to_IYUV(const unsigned char* source);
    void Convert_BGR_to_BGRA(const unsigned char* source);
    void Convert_BGR_to_BGR(const unsigned char* source);
    void Convert_BGR_to_AYUV(const unsigned char* source);
    void Convert_BGR_to_YUY2(const unsigned char* source);
    void Convert_BGR_to_IYUV(const unsigned char* source);
    void Convert_AYUV_to_BGRA(const unsigned char* source);
    void Convert_AYUV_to_BGR(const unsigned char* source);
    void Convert_AYUV_to_AYUV(const unsigned char* source);
    void Convert_AYUV_to_YUY2(const unsigned char* source);
    void Convert_AYUV_to_IYUV(const unsigned char* source);
    void Convert_YUY2_to_BGRA(const unsigned char* source);
    void Convert_YUY2_to_BGR(const unsigned char* source);
    void Convert_YUY2_to_AYUV(const unsigned char* source);
    void Convert_YUY2_to_YUY2(const unsigned char* source);
    void Convert_YUY2_to_IYUV(const unsigned char* source);
    void Convert_IYUV_to_BGRA(const unsigned char* source);
    void Convert_IYUV_to_BGR(const unsigned char* source);
    void Convert_IYUV_to_AYUV(const unsigned char* source);
    void Convert_IYUV_to_YUY2(const unsigned char* source);
    void Convert_IYUV_to_IYUV(const unsigned char* source);

    template <int kFrom, int kTo>
    void RgbToRgb(const unsigned char* source);
    template <int kFrom>
    void RgbToAyuv(const unsigned char* source);
    template <int kFrom>
    void RgbToYuy2(const unsigned char* source);
    void RgbToIyuv(const unsigned char* source, int pixelBytes,
                   zolt::Kernels::RgbConversion kernel);
    void YuvToIyuv(const unsigned char* source, int pixelBytes,
                   zolt::Kernels::YuvConversion kernel);
    template <int kTo>
    void AyuvToRgb(const unsigned char* source);
    template <int kTo>
    void Yuy2ToRgb(const unsigned char* source);
    template <int kTo>
    void IyuvToRgb(const unsigned char* source);

    bool NeedsCropping() const;
    zolt::Rgba SourceOffsets() const;
    zolt::Rgba ResultOffsets() const;
    void CopyRows(const unsigned char* source, int pixelBytes);
    template <class RowKernel>
    void ForEachRow(const unsigned char* source, int sourceBytes, int resultBytes,
                    RowKernel kernel);
    template <class RowKernel>
    void ForEachRowPair(const unsigned char* source, int sourceBytes, RowKernel kernel);
    template <class RowKernel>
    void ForEachYuy2Row(const unsigned char* source, int resultBytes, RowKernel kernel);
    template <class RowKernel>
    void ForEachIyuvRow(const unsigned char* source, int resultBytes, RowKernel kernel);

    const int sourceWidth, sourceHeight, sourceFormat;
    const int outputWidth, outputHeight, resultFormat;
    const int outputSize;                           // bytes of outputBuffer
    std::unique_ptr<unsigned char[]> outputBuffer;  // the converted picture
    int cropX = 0, cropY = 0;                       // the output's top left pixel in the source
    // Byte offsets of the channels in a pixel (GetOffsetsRGBA).
    int sourceOffsetR, sourceOffsetG, sourceOffsetB, sourceOffsetA;
    int resultOffsetR, resultOffsetG, resultOffsetB, resultOffsetA;
    const int alphaValue = 255;
    const Conversion conversion;  // null: Convert does nothing
};
