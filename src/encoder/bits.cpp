#include <algorithm>
#include <cassert>
#include <cstring>

#include "encoder/BitWriter.h"
#include "encoder/CEncoder.h"
#include "encoder/bitops.h"
#include "encoder/errors.h"

namespace {

struct ExpGolombLengths {
    std::uint16_t length[256];
};

constexpr ExpGolombLengths make_exp_golomb_lengths() {
    ExpGolombLengths table{};
    for (int v = 0; v < 256; ++v) {
        int bits = 0;
        for (int x = v + 1; x > 1; x >>= 1) {
            ++bits;
        }
        table.length[v] = static_cast<std::uint16_t>(2 * bits + 1);
    }
    return table;
}

// Length of the Exp-Golomb code of 0..255 (clause 9.1).
constexpr ExpGolombLengths uvlc_unsigned_len_tab = make_exp_golomb_lengths();

// Bytes that a write_bits may touch behind the last one that it writes to.
constexpr std::size_t kSlack = 64;

}  // namespace

void BitWriter::allocate(std::size_t size, const char* name) {
    if (!g_nal_buf.allocate(size + kSlack)) {
        memError(name);
    }
    g_nal_bitpos = 0;
}

void BitWriter::reset() {
    std::memset(g_nal_buf, 0, (g_nal_bitpos + 7) / 8);
    g_nal_bitpos = 0;
}

void BitWriter::write_uvlc_unsigned(unsigned v) {
    if (v < 256) {
        write_bits(v + 1, uvlc_unsigned_len_tab.length[v]);
        return;
    }
    assert(v < 0xffffffffu);
    const int significant = zolt::bit_length(v + 1);
    write_bits(0, significant - 1);
    write_bits(v + 1, significant);
}

void BitWriter::write_uvlc_signed(int v) {
    const unsigned magnitude = v < 0 ? 0u - static_cast<unsigned>(v) : static_cast<unsigned>(v);
    write_uvlc_unsigned(v > 0 ? 2 * magnitude - 1 : 2 * magnitude);
}

int BitWriter::uvlc_unsigned_length(unsigned v) {
    return v < 256 ? uvlc_unsigned_len_tab.length[v] : 2 * zolt::bit_length(v + 1) - 1;
}

// Reads whole windows: a buffer's slack is there to be read as well.
void BitWriter::append(const BitWriter& other) {
    const std::uint8_t* bytes = other.g_nal_buf;
    unsigned left = other.g_nal_bitpos;
    for (; left >= kMaxWrite; left -= kMaxWrite) {
        write_bits(zolt::load_big_endian(bytes) >> (64 - kMaxWrite), kMaxWrite);
        bytes += kMaxWrite / 8;
    }
    if (left > 0) {
        const int length = static_cast<int>(left);
        write_bits(zolt::load_big_endian(bytes) >> (64 - length), length);
    }
}

void CEncoder::encode_sps() {
    writeNALbyte(0, 2, 7);
    writeSPS();
    writeNALUnit();
}

void CEncoder::encode_pps() {
    writeNALbyte(0, 2, 8);
    writePPS();
    writeNALUnit();
}

int CEncoder::copy_nal_unit(void* dst, int max) const {
    const int size = std::max(std::min(get_nal_size(), max), 0);
    std::memcpy(dst, nal.g_nal_buf, static_cast<std::size_t>(size));
    return size;
}

void CEncoder::ResetNALUnit() {
    nal.reset();
}

unsigned char* CEncoder::GetNALUnit(int* bits) const {
    *bits = static_cast<int>(nal.g_nal_bitpos);
    return nal.g_nal_buf;
}

// nal_unit() header, clause 7.3.1.
void CEncoder::writeNALbyte(unsigned forbidden_zero_bit, unsigned nal_ref_idc,
                            unsigned nal_unit_type) {
    nal.write_bits(forbidden_zero_bit, 1);
    nal.write_bits(nal_ref_idc, 2);
    nal.write_bits(nal_unit_type, 5);
}

// seq_parameter_set_data(), clause 7.3.2.1.1, for frame_mbs_only_flag 1 and no cropping.
void CEncoder::writeSPS() {
    const seq_par_set_t& sps = *g_sps;
    nal.write_bits(sps.profile_idc, 8);
    nal.write_bits(sps.constraint_set0_flag, 1);
    nal.write_bits(sps.constraint_set1_flag, 1);
    nal.write_bits(sps.constraint_set2_flag, 1);
    nal.write_bits(sps.reserved_zero_5bits, 5);
    nal.write_bits(sps.level_idc, 8);
    nal.write_uvlc_unsigned(sps.seq_parameter_set_id);
    nal.write_uvlc_unsigned(sps.log2_max_frame_num_minus4);
    nal.write_uvlc_unsigned(sps.pic_order_cnt_type);
    nal.write_uvlc_unsigned(sps.log2_max_pic_order_cnt_lsb_minus4);
    nal.write_uvlc_unsigned(sps.num_ref_frames);
    nal.write_bits(sps.gaps_in_frame_num_value_allowed_flag, 1);
    nal.write_uvlc_unsigned(sps.pic_width_in_mbs_minus1);
    nal.write_uvlc_unsigned(sps.pic_height_in_map_units_minus1);
    nal.write_bits(sps.frame_mbs_only_flag, 1);
    nal.write_bits(sps.direct_8x8_inference_flag, 1);
    nal.write_bits(sps.frame_cropping_flag, 1);
    nal.write_bits(sps.vui_parameters_present_flag, 1);
}

// pic_parameter_set_rbsp(), clause 7.3.2.2, for one slice group.
void CEncoder::writePPS() {
    const pic_par_set_t& pps = *g_pps;
    nal.write_uvlc_unsigned(pps.pic_parameter_set_id);
    nal.write_uvlc_unsigned(pps.seq_parameter_set_id);
    nal.write_bits(pps.entropy_coding_mode_flag, 1);
    nal.write_bits(pps.pic_order_present_flag, 1);
    nal.write_uvlc_unsigned(pps.num_slice_groups_minus1);
    nal.write_uvlc_unsigned(pps.num_ref_idx_l0_active_minus1);
    nal.write_uvlc_unsigned(pps.num_ref_idx_l1_active_minus1);
    nal.write_bits(pps.weighted_pred_flag, 1);
    nal.write_bits(pps.weighted_bipred_idc, 2);
    nal.write_uvlc_signed(pps.pic_init_qp_minus26);
    nal.write_uvlc_signed(pps.pic_init_qs_minus26);
    nal.write_uvlc_signed(pps.chroma_qp_index_offset);
    nal.write_bits(pps.deblocking_filter_control_present_flag, 1);
    nal.write_bits(pps.constrained_intra_pred_flag, 1);
    nal.write_bits(pps.redundant_pic_cnt_present_flag, 1);
}

// rbsp_trailing_bits() and emulation_prevention_three_byte (clauses 7.3.2.11, 7.4.1.1).
bool CEncoder::writeNALUnit() {
    nal.write_bits(1, 1);
    const int bytes = get_nal_size();

    int insertions = 0;
    for (int i = 0; i + 2 < bytes;) {
        if (nal.g_nal_buf[i + 2] > 3) {
            i += 3;
        } else if (nal.g_nal_buf[i] == 0 && nal.g_nal_buf[i + 1] == 0) {
            if (insertions == g_nal_emul_size) {
                return false;
            }
            g_nal_emul_pos[insertions++] = i + 2;
            i += 2;
        } else {
            ++i;
        }
    }
    if (bytes + insertions > g_nal_buf_size) {
        return false;
    }

    int end = bytes;
    for (int k = insertions; k > 0; --k) {
        const int position = g_nal_emul_pos[k - 1];
        std::memmove(nal.g_nal_buf + position + k, nal.g_nal_buf + position,
                     static_cast<std::size_t>(end - position));
        nal.g_nal_buf[position + k - 1] = 3;
        end = position;
    }
    nal.g_nal_bitpos = static_cast<unsigned>(bytes + insertions) * 8;
    return true;
}
