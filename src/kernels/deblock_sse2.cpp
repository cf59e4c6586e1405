#include <cstring>

#include "kernels/deblock_simd.h"
#include "kernels/families.h"

namespace zolt {
namespace {

struct Sse2 {
    // tC0 of an edge's four segments, in the lowest bytes.
    static __m128i segment_tc0(const std::int8_t* tc0, std::uint32_t strengths) {
        std::int8_t segments[4];
        for (int i = 0; i < 4; ++i) {
            segments[i] = tc0[strengths >> (8 * i) & 0xff];
        }
        std::int32_t packed;
        std::memcpy(&packed, segments, sizeof packed);
        return _mm_cvtsi32_si128(packed);
    }

    static void transpose_16x16(const std::uint8_t* src, std::ptrdiff_t src_stride,
                                std::uint8_t* dst, std::ptrdiff_t dst_stride) {
        __m128i v[16];
        for (int y = 0; y < 16; ++y) {
            v[y] = Lines::load(src + y * src_stride).v;
        }
        for (int step = 0; step < 4; ++step) {
            interleave(v);
        }
        for (int x = 0; x < 16; ++x) {
            Lines{v[x]}.store(dst + x * dst_stride);
        }
    }
};

}  // namespace

void sse2::fill_deblock(Kernels& table) {
    fill_deblock_kernels<Sse2>(table);
}

}  // namespace zolt
