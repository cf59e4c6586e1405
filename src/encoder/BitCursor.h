#pragma once

#include <cassert>
#include <cstdint>

#include "encoder/BitWriter.h"
#include "encoder/bitops.h"

// Appends many short codes to a BitWriter, whose position and last bits it holds; between the
// constructor and end() the BitWriter itself is left alone. A function that puts many codes copies
// the cursor to a local variable, which stays in registers, and back.
class BitCursor {
public:
    explicit BitCursor(const BitWriter& bits)
        : m_byte(bits.g_nal_buf + (bits.g_nal_bitpos >> 3)),
          m_window(static_cast<std::uint64_t>(*m_byte) << 56),
          m_free(64 - (bits.g_nal_bitpos & 7)) {}

    // Hands the position back. All that was put has been flushed.
    void end(BitWriter& bits) const {
        bits.g_nal_bitpos = static_cast<unsigned>(8 * (m_byte - bits.g_nal_buf)) + (64 - m_free);
    }

    // Bits that can be put after flush() or a reserve() of as many.
    static constexpr unsigned kRoom = 56;

    // Makes room for `length` (up to kRoom) bits.
    void reserve(unsigned length) {
        if (m_free <= length) {
            flush();
        }
    }
    // Puts the low `length` bits of value, most significant first; the other bits of value must be
    // 0. Room must be there.
    void put(std::uint64_t value, unsigned length) {
        assert(m_free > length && value >> length == 0);
        m_free -= length;
        m_window |= value << m_free;
    }
    // ue(v) and se(v), clauses 9.1 and 9.1.1, for values of up to 28 bits; room is made for them.
    void put_ue(unsigned v) {
        const unsigned length = 2 * static_cast<unsigned>(zolt::bit_length(v + 1)) - 1;
        reserve(length);
        put(v + 1, length);
    }
    void put_se(int v) {
        put_ue(v > 0 ? 2 * static_cast<unsigned>(v) - 1 : 2 * (0 - static_cast<unsigned>(v)));
    }
    // Writes all that was put; what is left in the window is the last, unfinished byte.
    void flush() {
        zolt::store_big_endian(m_byte, m_window);
        const unsigned whole = (64 - m_free) >> 3;
        m_byte += whole;
        m_window <<= 8 * whole;
        m_free += 8 * whole;
    }

private:
    std::uint8_t* m_byte;    // where the window belongs
    std::uint64_t m_window;  // bits that are put, from the top
    unsigned m_free;         // other bits of the window, all 0: 1..64
};
