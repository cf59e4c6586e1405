#include <algorithm>
#include <cstdio>
#include <cstdlib>

#include "encoder/CEncoder.h"
#include "encoder/errors.h"

namespace {

// Allocates count elements and ends the process when there is no memory for them.
template <typename T>
void allocate(zolt::AlignedBuffer<T>& buffer, std::size_t count, const char* name) {
    if (!buffer.allocate(count)) {
        memError(name);
    }
}

constexpr std::size_t size(int count) {
    return static_cast<std::size_t>(count);
}

// Room behind the planes for accesses wider than the last element.
constexpr std::size_t kSlack = 64;

// The largest picture that any level allows, and its longest side: sqrt(8 * MaxFS) macroblocks
// (Table A-1, clause A.3.1).
constexpr int kMaxMacroblocks = 139264;
constexpr int kMaxSide = 16880;

// Ends the process unless a picture of this size can be coded; returns the width.
int checked_width(int width, int height) {
    if (width < 16 || height < 16) {
        exitOnError("Picture size must be at least 16x16", -1);
    }
    if (width > kMaxSide || height > kMaxSide || (width / 16) * (height / 16) > kMaxMacroblocks) {
        exitOnError("Picture size must be at most 139264 macroblocks and 16880 samples a side", -1);
    }
    return width;
}

// Keeps bit positions inside 31 bits, whatever the picture size.
constexpr std::int64_t kMaxNalBytes = 1 << 27;

}  // namespace

CEncoder::CEncoder(int width, int height, const zolt::Kernels* kernels)
    : picture(checked_width(width, height), height, kernels ? *kernels : zolt::best_kernels()),
      rows(picture),
      rate_control(width, height) {
    allocate_memory();
}

CEncoder::~CEncoder() {
    free_memory();
}

// The picture and the first worker have theirs already.
void CEncoder::allocate_memory() {
    allocBitBuff();
    allocate(g_sps, 1, "allocate_memory: g_sps");
    allocate(g_pps, 1, "allocate_memory: g_pps");
}

void CEncoder::free_memory() {
    g_sps.release();
    g_pps.release();
    freeBitBuff();
}

void CEncoder::allocBitBuff() {
    const std::int64_t samples = std::int64_t{picture.g_width} * picture.g_height;
    g_nal_buf_size =
        static_cast<int>(std::clamp<std::int64_t>(samples * 3 / 2, 20000, kMaxNalBytes));
    g_nal_emul_size = static_cast<int>(std::min<std::int64_t>(samples / 100 + 100, kMaxNalBytes));
    nal.allocate(size(g_nal_buf_size) + Wavefront::row_bytes(picture.g_mb_width),
                 "allocBitBuff: g_nal_buf");
    allocate(g_nal_emul_pos, size(g_nal_emul_size), "allocBitBuff: g_nal_emul_pos");
}

void CEncoder::freeBitBuff() {
    nal.release();
    g_nal_emul_pos.release();
}

Picture::Picture(int width, int height, const zolt::Kernels& kernels)
    : g_kernels(&kernels),
      g_width(width),
      g_height(height),
      g_mb_width(width / 16),
      g_mb_height(height / 16),
      g_width16(width / 16 * 16),
      g_height16(height / 16 * 16),
      g_cwidth(g_width16 / 2),
      g_cheight(g_height16 / 2),
      g_num_mbs(g_mb_width * g_mb_height),
      g_blk_width(g_width16 / 4),
      g_blk_height(g_height16 / 4) {
    initDiamond(16, 1, 1);
    allocGlobal();
    allocGlobal2();
    allocImageBuffers();
    allocFramePred();
}

Picture::~Picture() {
    freeFramePred();
    freeImageBuffers();
    freeGlobal2();
    freeGlobal();
}

void Picture::allocGlobal() {
    allocate(g_slp, 1, "allocFirst(): g_slp");
}

void Picture::freeGlobal() {
    g_slp.release();
}

void Picture::allocGlobal2() {
    const std::size_t mbs = size(g_num_mbs);
    const std::size_t blocks = size(g_blk_width) * size(g_blk_height);
    allocate(g_i4mode, size(g_blk_width + 2) * size(g_blk_height + 1), "allocGlobal2: g_i4mode");
    allocate(g_mb_mode, mbs, "allocGlobal2: g_mb_mode");
    allocate(g_mb_qp, mbs, "allocGlobal2: g_mb_qp");
    allocate(g_blk_ref, blocks, "allocGlobal2: g_blk_ref");
    allocate(g_blk_mvx, blocks, "allocGlobal2: g_blk_mvx");
    allocate(g_blk_mvy, blocks, "allocGlobal2: g_blk_mvy");
    allocate(g_lf_data, mbs, "allocGlobals2: g_lf_data");
    allocate(g_coded_blocks, mbs, "allocGlobal2: g_coded_blocks");
    allocate(g_cnum_l, blocks, "allocGlobal2:g_cnum_l");
    allocate(g_cnum_u, blocks / 4, "allocGlobal2:g_cnum_u");
    allocate(g_cnum_v, blocks / 4, "allocGlobal2:g_cnum_v");
}

void Picture::freeGlobal2() {
    g_i4mode.release();
    g_mb_mode.release();
    g_mb_qp.release();
    g_blk_ref.release();
    g_blk_mvx.release();
    g_blk_mvy.release();
    g_lf_data.release();
    g_coded_blocks.release();
    g_cnum_l.release();
    g_cnum_u.release();
    g_cnum_v.release();
}

void Picture::allocImageBuffers() {
    const std::size_t picture = size(g_size_Y) + 2 * size(g_size_U);
    allocate(g_alloc_images, 2 * picture + kSlack, "allocImageBuffers: g_alloc_images");
    g_cur_y = g_alloc_images + g_origin_luma;
    g_cur_u = g_alloc_images + g_size_Y + g_origin_chroma;
    g_cur_v = g_cur_u + g_size_U;
    g_ref_y = g_cur_y + picture;
    g_ref_u = g_cur_u + picture;
    g_ref_v = g_cur_v + picture;
    allocate(g_mv_array, size(g_num_mbs), "allocImageBuffers: g_mv_array");
}

void Picture::freeImageBuffers() {
    g_alloc_images.release();
    g_mv_array.release();
    g_cur_y = g_cur_u = g_cur_v = nullptr;
    g_ref_y = g_ref_u = g_ref_v = nullptr;
}

void Picture::allocFramePred() {
    allocate(g_half_planes, 3 * size(g_size_Y) + kSlack, "allocFramePred: g_half_planes");
    g_half_v_L0 = g_half_planes + g_origin_luma;
    g_half_h_L0 = g_half_v_L0 + g_size_Y;
    g_half_hv_L0 = g_half_h_L0 + g_size_Y;
    allocate(g_me_mb_L0, size(g_num_mbs), "allocFramePred: g_me_mb_L0");
}

void Picture::freeFramePred() {
    g_half_planes.release();
    g_me_mb_L0.release();
    g_half_v_L0 = g_half_h_L0 = g_half_hv_L0 = nullptr;
}

MacroblockCoder::MacroblockCoder(Picture& shared) : picture(shared), g_kernels(shared.g_kernels) {
    allocate(g_visit_L0, size(shared.g_visit_dim) * size(shared.g_visit_dim),
             "allocFramePred: g_visit_L0");
}

void exitOnError(const char* msg, int status) {
    std::fprintf(stderr, "%s\n", msg);
    std::exit(status);
}

void memError(const char* what) {
    std::fprintf(stderr, "Memory allocation failed for: %s\n", what);
    std::exit(106);
}
