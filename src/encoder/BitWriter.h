#pragma once

#include <cstddef>
#include <cstdint>

#include "encoder/AlignedBuffer.h"
#include "encoder/bitops.h"

// A bit position in a buffer, and what is written there: the NAL unit under construction, or the
// macroblocks of one row, which another writer then appends to it.
class BitWriter {
public:
    // size: bytes that may be written to.
    void allocate(std::size_t size, const char* name);
    void release() { g_nal_buf.release(); }

    // Writes the low `length` (1..kMaxWrite) bits of value, most significant first; the other bits
    // of value must be 0. Clears at least the bit that follows and the rest of its byte, which is
    // what the next write builds on.
    static constexpr int kMaxWrite = 56;
    void write_bits(std::uint64_t value, int length) {
        std::uint8_t* byte = g_nal_buf + (g_nal_bitpos >> 3);
        const std::uint64_t window =
            static_cast<std::uint64_t>(*byte) << 56 | value << (64 - (g_nal_bitpos & 7) - length);
        zolt::store_big_endian(byte, window);
        g_nal_bitpos += static_cast<unsigned>(length);
    }
    // ue(v) and se(v), clauses 9.1 and 9.1.1.
    void write_uvlc_unsigned(unsigned v);
    void write_uvlc_signed(int v);
    // Bits of ue(v).
    static int uvlc_unsigned_length(unsigned v);

    // Writes all that another writer holds.
    void append(const BitWriter& other);

    // Goes back to the start; nothing is left of what was written.
    void reset();

    zolt::AlignedBuffer<std::uint8_t> g_nal_buf;
    unsigned g_nal_bitpos = 0;  // bits written
};
