#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <vector>

#include "Pool.h"
#include "encoder/CEncoder.h"

namespace zolt_bench {

// A part of a picture's coding and the time that it took, once a repetition.
struct Part {
    const char* name;
    int row, column;  // of the macroblock; -1: the part is of the row or of the picture
    int detail;       // see TimedPicture
    std::vector<double> nanoseconds;
};

// Codes the pictures of a stream with the engine and takes the time of their parts:
//
//   before   NAL and slice header, rate control, clearing of maps, edges of the reference
//   half     half-sample rows that a row of macroblocks may need; detail: their number
//   begin    an empty buffer for a row's bits
//   step     code_macroblock, then filter_mb of the macroblocks that become ready; detail: the row
//            of the half-sample planes at which those end that the macroblock needs
//   append   a row's bits to the NAL unit
//   filter   filter_mb of the last row
//   after    stop bit, emulation prevention, rate control
//   one      the slice data as one worker codes them
//   several  the slice data as the workers of a pool do
//   start    from the pool's call to the start of its last worker
//
// Each part from `before` to `after` is timed on one thread, in the order in which one of several
// workers goes through a row.
class TimedPicture {
public:
    TimedPicture(CEncoder& engine, Pool& pool);

    // Codes the next picture of the engine's stream, then so many times more in parts, on one
    // worker and on the pool. Throws std::runtime_error when the NAL units differ.
    void code(const std::uint8_t* frame, int repetitions);

    const std::vector<Part>& parts() const { return m_parts; }

private:
    using Clock = std::chrono::steady_clock;
    enum class How { kInParts, kOneWorker, kPool };

    void repeat(How how);
    void code_in_parts();
    void append_row(MacroblockCoder& coder);
    void restart_clock() { m_last = Clock::now(); }
    void note(const char* name, int row = -1, int column = -1, int detail = 0);
    void note_time(const char* name, int row, int column, int detail, double nanoseconds);

    CEncoder& m_engine;
    Picture& m_picture;
    Pool& m_pool;
    double m_clock_cost;  // nanoseconds that a note takes itself
    Clock::time_point m_last;
    std::vector<Part> m_parts;
    std::size_t m_next = 0;  // of m_parts, in this repetition

    // What the picture was coded with, and its NAL unit.
    const std::uint8_t* m_frame = nullptr;
    RateControl m_rate_control;
    rc_picture_t m_coming{};
    std::vector<_mv> m_vectors;
    std::vector<std::uint8_t> m_unit;
    int m_skip_run = 0;
};

}  // namespace zolt_bench
