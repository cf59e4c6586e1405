// Runs the operations that the input spells on a reader of the rest of the input, and holds every
// result and position against a plain string of bits.

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <vector>

#include "avc/BitStreamReader.h"
#include "check.h"

namespace {

using zolt::check;

// The reader by its definition.
class Model {
public:
    explicit Model(const std::vector<unsigned char>& bytes) {
        for (const unsigned char byte : bytes) {
            for (int bit = 7; bit >= 0; --bit) {
                bits_.push_back(byte >> bit & 1);
            }
        }
    }

    long size() const { return static_cast<long>(bits_.size()); }
    bool holds(long pos) const { return pos >= 0 && pos < size(); }
    long left(long pos) const { return holds(pos) ? size() - pos : 0; }

    std::uint64_t bits(long pos, int n) const {
        std::uint64_t value = 0;
        for (int i = 0; i < n; ++i) {
            value = value << 1 | bits_[static_cast<std::size_t>(pos + i)];
        }
        return value;
    }

    // ue(v) at *pos, which it moves.
    std::uint64_t exp_golomb(long* pos) const {
        long zeros = 0;
        while (holds(*pos + zeros) && bits(*pos + zeros, 1) == 0) {
            ++zeros;
        }
        const long suffix = *pos + zeros + 1;
        if (!holds(*pos + zeros) || zeros > 32 || suffix + zeros > size()) {
            *pos = size();
            return 0;
        }
        *pos = suffix + zeros;
        return (std::uint64_t{1} << zeros) - 1 + bits(suffix, static_cast<int>(zeros));
    }

private:
    std::vector<unsigned char> bits_;
};

void read_bits(BitStreamReader& reader, const Model& model, int kind, int n) {
    static constexpr int kWidths[] = {8, 16, 32, 64};
    const int width = kWidths[kind % 4];
    const bool is_signed = kind >= 4;
    const long pos = reader.GetBitPos();
    const bool fits = n >= 1 && n <= width && n <= model.left(pos);
    std::uint64_t expected = fits ? model.bits(pos, n) : 0;
    if (is_signed && fits && n < 64 && expected >> (n - 1) != 0) {
        expected -= std::uint64_t{1} << n;
    }
    std::uint64_t value = 0;
    switch (kind) {
        case 0:
            value = reader.ReadUnsInt1(n);
            break;
        case 1:
            value = reader.ReadUnsInt2(n);
            break;
        case 2:
            value = reader.ReadUnsInt4(n);
            break;
        case 3:
            value = reader.ReadUnsInt8(n);
            break;
        case 4:
            value = static_cast<std::uint64_t>(std::int64_t{reader.ReadInt1(n)});
            break;
        case 5:
            value = static_cast<std::uint64_t>(std::int64_t{reader.ReadInt2(n)});
            break;
        case 6:
            value = static_cast<std::uint64_t>(std::int64_t{reader.ReadInt4(n)});
            break;
        default:
            value = static_cast<std::uint64_t>(reader.ReadInt8(n));
            break;
    }
    check(value == expected, "the value of a fixed-width read");
    check(reader.GetBitPos() == (fits ? pos + n : pos), "the position behind a fixed-width read");
}

void read_code(BitStreamReader& reader, const Model& model, bool is_signed) {
    long pos = reader.GetBitPos();
    const std::uint64_t code = model.exp_golomb(&pos);
    if (is_signed) {
        const auto half = static_cast<std::int64_t>(code / 2);
        check(reader.ReadSignedExpGolomb() == (code % 2 != 0 ? half + 1 : -half), "an se(v)");
    } else {
        check(reader.ReadExpGolomb() == code, "a ue(v)");
    }
    check(reader.GetBitPos() == pos, "the position behind an Exp-Golomb code");
}

void skip(BitStreamReader& reader, const Model& model, bool whole_bytes, int n) {
    const long pos = reader.GetBitPos();
    const long end = pos + (whole_bytes ? 8L : 1L) * n;
    const bool may_reach_end = whole_bytes && pos % 8 == 0;
    const bool fits = n >= 0 && (may_reach_end ? end <= model.size() : end < model.size());
    const int status = whole_bytes ? reader.SkipBytes(n) : reader.SkipBits(n);
    check(status == (fits ? 0 : 1), "the status of a skip");
    check(reader.GetBitPos() == (fits ? end : pos), "the position behind a skip");
}

void copy_bytes(BitStreamReader& reader, const Model& model, int n) {
    const long pos = reader.GetBitPos();
    const bool fits =
        n >= 0 && pos >= 0 && (n == 0 ? pos <= model.size() : 8L * n <= model.left(pos));
    std::vector<unsigned char> copy(static_cast<std::size_t>(std::max(n, 0)), 0xa5);
    const int status = reader.ReadBytes(copy.data(), n);
    if (n != 0 || pos % 8 == 0) {
        check(status == (fits ? 0 : 1), "the status of a copy");
    }
    check(reader.GetBitPos() == (fits ? pos + 8L * n : pos), "the position behind a copy");
    for (std::size_t i = 0; i < copy.size(); ++i) {
        const std::uint64_t expected = fits ? model.bits(pos + 8 * static_cast<long>(i), 8)
                                       : pos % 8 == 0 ? 0
                                                      : 0xa5;
        check(copy[i] == expected, "the bytes of a copy");
    }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const unsigned char* input, std::size_t size) {
    // Half of the input is pairs of operation and operand, the rest is what they read.
    const std::size_t num_operations = size / 4;
    const std::vector<unsigned char> bytes(input + 2 * num_operations, input + size);
    const Model model(bytes);
    BitStreamReader reader(bytes.data(), static_cast<int>(bytes.size()));
    for (std::size_t i = 0; i < num_operations; ++i) {
        const int operation = input[2 * i] % 16;
        const int operand = static_cast<signed char>(input[2 * i + 1]);
        const long pos = reader.GetBitPos();
        if (operation < 8) {
            read_bits(reader, model, operation, operand);
        } else if (operation < 10) {
            read_code(reader, model, operation == 9);
        } else if (operation < 12) {
            skip(reader, model, operation == 11, operand);
        } else if (operation == 12) {
            copy_bytes(reader, model, operand);
        } else if (operation == 13) {
            const bool expected = model.holds(pos) && model.bits(pos, 1) != 0;
            check(reader.ReadBoolean() == expected, "a boolean");
        } else if (operation == 14) {
            reader.AlignNextByte();
            check(reader.GetBitPos() == (pos + 7) / 8 * 8 || pos < 0, "an alignment");
        } else {
            reader.SetBitPos(static_cast<long>(operand) * operand * operand);
        }
        check(reader.GetNumBytesRead() >= reader.GetBytePos(), "the count of bytes");
    }
    return 0;
}
