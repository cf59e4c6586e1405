#include "encoder/Wavefront.h"

#include <algorithm>
#include <new>

#include "encoder/errors.h"
#include "encoder/idle.h"

namespace {

// Macroblocks by which a row stays behind the one above it, the one being coded included.
constexpr int kLead = 3;

}  // namespace

Wavefront::Wavefront(Picture& shared)
    : coders(new (std::nothrow) std::unique_ptr<MacroblockCoder>[shared.g_mb_height]),
      picture(shared),
      m_rows(new (std::nothrow) Progress[shared.g_mb_height]) {
    if (coders == nullptr || m_rows == nullptr) {
        memError("Wavefront: rows");
    }
    allocate_workers(1);
}

std::size_t Wavefront::row_bytes(int mb_width) {
    return static_cast<std::size_t>(mb_width) * MacroblockCoder::kMaxMacroblockBits / 8 + 1;
}

void Wavefront::allocate_workers(int workers) {
    for (; coder_count < workers; ++coder_count) {
        coders[coder_count].reset(new (std::nothrow) MacroblockCoder(picture));
        if (coders[coder_count] == nullptr) {
            memError("Wavefront: coders");
        }
    }
    for (int n = 0; n < workers && workers > 1; ++n) {
        if (coders[n]->row_bits.g_nal_buf == nullptr) {
            coders[n]->row_bits.allocate(row_bytes(picture.g_mb_width), "Wavefront: row_bits");
        }
    }
}

bool Wavefront::code_slice_data(BitWriter& nal, unsigned capacity, WorkerPool* pool, int workers) {
    workers = std::clamp(workers, 1, picture.g_mb_height);
    allocate_workers(workers);
    for (int row = 0; row < picture.g_mb_height; ++row) {
        m_rows[row].done.store(0, std::memory_order_relaxed);
    }
    m_nal = &nal;
    m_capacity = capacity;
    m_skip_run = 0;
    m_direct = workers == 1;
    m_failed.store(false, std::memory_order_relaxed);
    m_next_row.store(0, std::memory_order_release);
    if (workers == 1) {
        run_worker(0);
    } else {
        pool->run(*this, workers);
    }
    return !m_failed.load(std::memory_order_acquire);
}

void Wavefront::run_worker(int worker) {
    MacroblockCoder& coder = *coders[worker];
    int mb_y;
    do {
        mb_y = m_next_row.fetch_add(1, std::memory_order_acq_rel);
    } while (mb_y < picture.g_mb_height && code_row(coder, mb_y));
}

// Codes and appends a row, and deblocks the one above it. Returns false when the picture is given
// up.
bool Wavefront::code_row(MacroblockCoder& coder, int mb_y) {
    const int width = picture.g_mb_width;
    const int last = width - 1;
    begin_row(coder);
    for (int mb_x = 0; mb_x < last; ++mb_x) {
        if (mb_y > 0 && !wait_for(m_rows[mb_y - 1].done, std::min(mb_x + kLead, width))) {
            return false;
        }
        coder.code_macroblock(mb_x, mb_y);
        if (mb_y > 0 && mb_x > 0 && !m_direct) {
            coder.filter_mb(mb_x - 1, mb_y - 1);
        }
        m_rows[mb_y].done.store(mb_x + 1, std::memory_order_release);
    }

    if (mb_y > 0 && !wait_for(m_rows[mb_y - 1].done, width)) {
        return false;
    }
    const unsigned last_start = coder.bits->g_nal_bitpos;
    coder.code_macroblock(last, mb_y);
    if (mb_y > 0) {
        for (int mb_x = m_direct ? 0 : std::max(last - 1, 0); mb_x < width; ++mb_x) {
            coder.filter_mb(mb_x, mb_y - 1);
        }
    }
    if (!end_row(coder, last_start)) {
        m_failed.store(true, std::memory_order_release);
        return false;
    }
    if (mb_y == picture.g_mb_height - 1) {
        for (int mb_x = 0; mb_x < width; ++mb_x) {
            coder.filter_mb(mb_x, mb_y);
        }
    }
    m_rows[mb_y].done.store(width, std::memory_order_release);
    return true;
}

void Wavefront::begin_row(MacroblockCoder& coder) {
    if (m_direct) {
        coder.bits = m_nal;
        coder.g_skip_run = m_skip_run;
        coder.keep_first_run = false;
        return;
    }
    coder.bits = &coder.row_bits;
    coder.row_bits.reset();
    coder.g_skip_run = 0;
    coder.keep_first_run = picture.g_slp->sliceType == P_SLICE;
    coder.first_run = -1;
}

// Appends the row to the NAL unit. last_start: the position of the row's last macroblock. Positions
// only grow, so when that one had room, every other had. Returns false when it had none.
bool Wavefront::end_row(MacroblockCoder& coder, unsigned last_start) {
    if (m_direct) {
        m_skip_run = coder.g_skip_run;
        return last_start + MacroblockCoder::kMaxMacroblockBits <= m_capacity;
    }
    const bool has_run = coder.first_run >= 0;  // a macroblock of a P slice is not skipped
    const unsigned run = static_cast<unsigned>(m_skip_run + std::max(coder.first_run, 0));
    unsigned start = m_nal->g_nal_bitpos + last_start;
    if (has_run && last_start > 0) {
        start += static_cast<unsigned>(BitWriter::uvlc_unsigned_length(run));
    }
    if (start + MacroblockCoder::kMaxMacroblockBits > m_capacity) {
        return false;
    }
    if (has_run) {
        m_nal->write_uvlc_unsigned(run);
    }
    m_nal->append(coder.row_bits);
    m_skip_run = coder.g_skip_run + (has_run ? 0 : m_skip_run);
    return true;
}

bool Wavefront::wait_for(const std::atomic<int>& done, int count) const {
    for (zolt::Idle idle; done.load(std::memory_order_acquire) < count; idle.wait()) {
        if (m_failed.load(std::memory_order_acquire)) {
            return false;
        }
    }
    return true;
}
