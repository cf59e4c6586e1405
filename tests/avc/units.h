#pragma once

#include "avc/BitStreamWriter.h"

namespace zolt {

// A sequence parameter set with 16-bit frame_num and pic_order_cnt_lsb.
inline BitStreamWriter seq_par_set(unsigned id, bool frame_mbs_only, bool is_444 = false) {
    BitStreamWriter bits;
    bits.u(8, 0x67).u(8, is_444 ? 244 : 77).u(8, 0).u(8, 31).ue(id);
    if (is_444) {
        bits.ue(3).u(1, 1).ue(0).ue(0).u(1, 0).u(1, 1).u(1, 1).se(5).se(-13).u(11, 0);
    }
    bits.ue(12).ue(0).ue(12).ue(1).u(1, 0).ue(10).ue(8).u(1, frame_mbs_only);
    return bits.u(frame_mbs_only ? 3 : 4, 0).trailing();
}

struct PicParSetFields {
    unsigned id = 0;
    unsigned seq_par_set_id = 0;
    bool is_cabac = false;
    int slice_group_type = -1;  // none
    bool weighted_pred = false;
    unsigned weighted_bipred_idc = 0;
    bool redundant_pic_cnt_present = false;
};

inline BitStreamWriter pic_par_set(const PicParSetFields& fields) {
    BitStreamWriter bits;
    bits.u(8, 0x68).ue(fields.id).ue(fields.seq_par_set_id).u(1, fields.is_cabac).u(1, 1);
    bits.ue(fields.slice_group_type < 0 ? 0 : 2);
    if (fields.slice_group_type >= 0) {
        bits.ue(static_cast<unsigned>(fields.slice_group_type));
    }
    switch (fields.slice_group_type) {
        case 0:
            bits.ue(4).ue(5).ue(600);
            break;
        case 2:
            bits.ue(0).ue(9).ue(3).ue(44);
            break;
        case 4:
            bits.u(1, 1).ue(40);
            break;
        case 6:
            bits.ue(98);
            for (int unit = 0; unit < 99; ++unit) {
                bits.u(2, static_cast<unsigned>(unit) % 3);
            }
            break;
        default:
            break;
    }
    bits.ue(2).ue(1).u(1, fields.weighted_pred).u(2, fields.weighted_bipred_idc);
    bits.se(-3).se(0).se(2).u(1, 1).u(1, 0).u(1, fields.redundant_pic_cnt_present);
    return bits.trailing();
}

// An IDR slice of the parameter sets above, up to and with the data behind slice_qp_delta.
inline BitStreamWriter idr_slice(unsigned set_id, unsigned idr_pic_id, unsigned first_mb = 0) {
    BitStreamWriter bits;
    bits.u(8, 0x65).ue(first_mb).ue(7).ue(set_id).u(16, 0).ue(idr_pic_id).u(16, 0).se(0);
    return bits.u(2, 0).se(4).u(20, 0xabcde).trailing();
}

}  // namespace zolt
