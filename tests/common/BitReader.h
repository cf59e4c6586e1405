#pragma once

#include <cstddef>
#include <cstdint>
#include <stdexcept>
#include <vector>

namespace zolt_test {

// Reads the syntax elements of a NAL unit or of plain bytes. Throws std::out_of_range at their end.
class BitReader {
public:
    BitReader(const std::uint8_t* bytes, std::size_t size) : bytes_(bytes, bytes + size) {}

    // Reads what follows the header byte of a NAL unit, without its emulation prevention bytes.
    static BitReader of_nal(const std::uint8_t* nal, std::size_t size) {
        BitReader reader(nal, 0);
        int zeros = 0;
        for (std::size_t i = 1; i < size; ++i) {
            if (zeros >= 2 && nal[i] == 3) {
                zeros = 0;
                continue;
            }
            zeros = nal[i] == 0 ? zeros + 1 : 0;
            reader.bytes_.push_back(nal[i]);
        }
        return reader;
    }

    unsigned u(int count) {
        unsigned value = 0;
        for (; count > 0; --count, ++position_) {
            value = value << 1 | (bytes_.at(position_ / 8) >> (7 - position_ % 8) & 1u);
        }
        return value;
    }

    unsigned ue() {
        int zeros = 0;
        while (u(1) == 0) {
            ++zeros;
        }
        return (1u << zeros) - 1 + u(zeros);
    }

    int se() {
        const unsigned k = ue();
        return k % 2 != 0 ? static_cast<int>(k / 2) + 1 : -static_cast<int>(k / 2);
    }

    std::size_t position() const { return position_; }
    std::size_t bits_left() const { return 8 * bytes_.size() - position_; }

private:
    std::vector<std::uint8_t> bytes_;
    std::size_t position_ = 0;
};

// The slice header of this encoder's streams (clause 7.3.3).
struct SliceHeader {
    unsigned nal_byte, slice_type, frame_num, idr_pic_id, pic_order_cnt_lsb;
    int qp;

    SliceHeader(unsigned first_byte, BitReader& reader) : nal_byte(first_byte), idr_pic_id(0) {
        const bool idr = (nal_byte & 31) == 5;
        reader.ue();  // first_mb_in_slice
        slice_type = reader.ue();
        reader.ue();  // pic_parameter_set_id
        frame_num = reader.u(16);
        if (idr) {
            idr_pic_id = reader.ue();
        }
        pic_order_cnt_lsb = reader.u(16);
        // P: no override, no reordering; IDR: no_output_of_prior_pics_flag, long_term_reference_
        // flag; otherwise adaptive_ref_pic_marking_mode_flag.
        reader.u((slice_type == 0 ? 2 : 0) + (idr ? 2 : 1));
        qp = 41 + reader.se();
    }
};

}  // namespace zolt_test
