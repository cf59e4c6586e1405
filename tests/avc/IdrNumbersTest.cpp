#include "avc/IdrNumbers.h"

#include <gtest/gtest.h>

#include "avc/BitStreamWriter.h"

namespace zolt {
namespace {

using Unit = std::vector<unsigned char>;

SequenceParameterSet set_of_frames() {
    SequenceParameterSet set;
    set.is_valid = true;
    set.frame_mbs_only_flag = true;
    set.log2_max_frame_num_minus4 = 12;
    return set;
}

// A slice whose data are the bits of `data`, so that every alignment of the stop bit occurs.
Unit slice(unsigned header_byte, std::uint64_t id, int data_bits, std::uint64_t data) {
    BitStreamWriter bits;
    bits.u(8, header_byte).ue(0).ue(7).ue(0).u(16, 0);
    if ((header_byte & 31) == 5) {
        bits.ue(id);
    }
    return bits.u(data_bits, data).trailing().escaped();
}

TEST(IdrNumbers, NeighboursDifferAndNothingElseChanges) {
    for (int data_bits = 1; data_bits <= 60; ++data_bits) {
        for (const std::uint64_t data : {0x0ull, 0x5A5A5A5A5A5A5A5ull, 0xFFFFFFFFFFFFFFFull}) {
            SCOPED_TRACE(std::to_string(data_bits) + " bits of " + std::to_string(data));
            IdrNumbers numbers;
            for (const std::uint64_t expected : {0, 1, 0, 1}) {
                Unit nal = slice(0x65, 0, data_bits, data);
                numbers.pass(nal, set_of_frames());
                EXPECT_EQ(nal, slice(0x65, expected, data_bits, data));
            }
        }
    }
}

TEST(IdrNumbers, StayWhereTheyDifferAlready) {
    IdrNumbers numbers;
    const SequenceParameterSet set = set_of_frames();
    const auto pass = [&](const Unit& nal, const Unit& expected) {
        Unit passed = nal;
        numbers.pass(passed, set);
        EXPECT_EQ(passed, expected);
    };
    const Unit first = slice(0x65, 0, 9, 77);
    const Unit second = slice(0x65, 1, 9, 77);
    const Unit third = slice(0x65, 2, 9, 77);
    const Unit other = slice(0x41, 0, 9, 77);
    pass(first, first);
    pass(second, second);
    pass(second, third);  // begun anew after one: counts on from there
    pass(third, slice(0x65, 3, 9, 77));
    pass(other, other);
    pass(first, first);
    pass(other, other);
    pass(first, first);
    pass(slice(0x65, 65535, 9, 77), slice(0x65, 65535, 9, 77));
    pass(slice(0x65, 65535, 9, 77), first);
}

TEST(IdrNumbers, WhatCannotBeReadStays) {
    IdrNumbers numbers;
    for (const Unit& nal : {Unit{}, Unit{0x65}, Unit{0x65, 0}, Unit{0x65, 0x88, 0x80, 0, 0}}) {
        for (int times = 0; times < 2; ++times) {
            Unit passed = nal;
            numbers.pass(passed, set_of_frames());
            EXPECT_EQ(passed, nal);
        }
    }
}

}  // namespace
}  // namespace zolt
