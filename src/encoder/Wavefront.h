#pragma once

#include <atomic>
#include <cstddef>
#include <memory>

#include "encoder/BitWriter.h"
#include "encoder/MacroblockCoder.h"
#include "encoder/Picture.h"
#include "encoder/WorkerPool.h"

// The macroblock rows of a picture, coded by any number of workers with the same bits as by one.
//
// Workers claim rows from the top and run through them from left to right. Macroblock (x, r) is
// done when it is coded and (x - 1, r - 1) is deblocked after it; the last one of a row also when
// the row's bits are appended to the NAL unit. It waits for (x + 2, r - 1) to be done, or for the
// whole row above near its end. So
// - prediction finds its neighbours above coded and their samples not yet deblocked: each worker
//   deblocks the row above its own, behind the macroblocks that it codes;
// - macroblocks are deblocked in an order in which each comes after its left, upper left, upper and
//   upper right neighbours, as in raster order (clause 8.7);
// - rows end in order, and each worker appends its own.
// A worker never waits for a row that nobody has begun, so that workers may also run one after
// another.
class Wavefront {
public:
    explicit Wavefront(Picture& shared);

    // Makes room for that many workers, at most one a row; keeps what is there. Ends the process
    // when there is no memory. Not while a picture is coded.
    void allocate_workers(int workers);

    // slice_data(), clause 7.3.4, and deblocking, by so many workers on the threads of the pool,
    // which is not asked for one worker. Returns false when the NAL unit might not have held one of
    // the macroblocks; it has to be discarded then. capacity: bits that it can hold; the buffer has
    // room for row_bytes() more.
    bool code_slice_data(BitWriter& nal, unsigned capacity, WorkerPool* pool, int workers);

    // One worker's share of the picture.
    void run_worker(int worker);

    // The most bytes that a row of macroblocks can take.
    static std::size_t row_bytes(int mb_width);

    // One for each worker that there is room for.
    std::unique_ptr<std::unique_ptr<MacroblockCoder>[]> coders;
    int coder_count = 0;

private:
    // The macroblocks of a row that are done, from the left. On a cache line of its own.
    struct alignas(64) Progress {
        std::atomic<int> done{0};
    };

    bool code_row(MacroblockCoder& coder, int mb_y);
    void begin_row(MacroblockCoder& coder);
    bool end_row(MacroblockCoder& coder, unsigned last_start);
    bool wait_for(const std::atomic<int>& done, int count) const;

    Picture& picture;
    std::unique_ptr<Progress[]> m_rows;
    std::atomic<int> m_next_row{0};     // the row that nobody has claimed yet
    std::atomic<bool> m_failed{false};  // the NAL unit is full: every worker stops

    // Owned by the worker whose row is next to end; handed on with the row's progress.
    BitWriter* m_nal = nullptr;
    unsigned m_capacity = 0;
    int m_skip_run = 0;    // skipped macroblocks since the last coded one
    bool m_direct = true;  // one worker, which writes into the NAL unit
};
