// Compiled for AVX2: nothing but intrinsics and functions of this file, of deblock_simd.h and of
// avx2.h, so that no inline function that other files share is emitted with instructions that an
// older processor lacks.
#include "kernels/avx2.h"
#include "kernels/deblock_simd.h"
#include "kernels/families.h"

namespace zolt {
namespace {

struct Avx2 {
    // tC0 of an edge's four segments, in the lowest bytes.
    static __m128i segment_tc0(const std::int8_t* tc0, std::uint32_t strengths) {
        std::int32_t by_strength;
        __builtin_memcpy(&by_strength, tc0, sizeof by_strength);
        return _mm_shuffle_epi8(_mm_cvtsi32_si128(by_strength),
                                _mm_cvtsi32_si128(static_cast<int>(strengths)));
    }

    static void transpose_16x16(const std::uint8_t* src, std::ptrdiff_t src_stride,
                                std::uint8_t* dst, std::ptrdiff_t dst_stride) {
        // Rows n and n + 8 in the lanes of one vector; after three steps either lane has its half
        // of two columns.
        __m256i v[8];
        for (int y = 0; y < 8; ++y) {
            v[y] = join(load_16(src + y * src_stride), load_16(src + (y + 8) * src_stride));
        }
        for (int step = 0; step < 3; ++step) {
            __m256i mixed[8];
            for (int i = 0; i < 4; ++i) {
                mixed[2 * i] = _mm256_unpacklo_epi8(v[i], v[i + 4]);
                mixed[2 * i + 1] = _mm256_unpackhi_epi8(v[i], v[i + 4]);
            }
            for (int i = 0; i < 8; ++i) {
                v[i] = mixed[i];
            }
        }
        for (int i = 0; i < 8; ++i) {
            const __m256i columns = _mm256_permute4x64_epi64(v[i], _MM_SHUFFLE(3, 1, 2, 0));
            store_16(dst + 2 * i * dst_stride, low_lane(columns));
            store_16(dst + (2 * i + 1) * dst_stride, high_lane(columns));
        }
    }
};

}  // namespace

void avx2::fill_deblock(Kernels& table) {
    fill_deblock_kernels<Avx2>(table);
}

}  // namespace zolt
