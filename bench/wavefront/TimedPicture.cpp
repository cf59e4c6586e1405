#include "TimedPicture.h"

#include <algorithm>
#include <stdexcept>

namespace zolt_bench {
namespace {

double nanoseconds(std::chrono::steady_clock::duration duration) {
    return std::chrono::duration<double, std::nano>(duration).count();
}

double clock_cost() {
    constexpr int kCalls = 1001;
    std::vector<double> costs(kCalls);
    auto last = std::chrono::steady_clock::now();
    for (double& cost : costs) {
        const auto now = std::chrono::steady_clock::now();
        cost = nanoseconds(now - last);
        last = now;
    }
    std::nth_element(costs.begin(), costs.begin() + kCalls / 2, costs.end());
    return costs[kCalls / 2];
}

}  // namespace

TimedPicture::TimedPicture(CEncoder& engine, Pool& pool)
    : m_engine(engine),
      m_picture(engine.picture),
      m_pool(pool),
      m_clock_cost(clock_cost()),
      m_rate_control(engine.rate_control) {
    engine.rows.allocate_workers(std::min(pool.threads(), m_picture.g_mb_height));
    BitWriter& row_bits = engine.rows.coders[0]->row_bits;
    if (row_bits.g_nal_buf == nullptr) {
        row_bits.allocate(Wavefront::row_bytes(m_picture.g_mb_width), "bench_wavefront: row_bits");
    }
}

void TimedPicture::code(const std::uint8_t* frame, int repetitions) {
    const int mbs = m_picture.g_num_mbs;
    m_parts.clear();
    m_frame = frame;
    m_rate_control = m_engine.rate_control;
    m_vectors.assign(m_picture.g_me_mb_L0.data(), m_picture.g_me_mb_L0.data() + mbs);
    m_coming = m_engine.rate_control_picture();
    m_engine.encode_frame(frame);
    m_coming.inter = m_engine.g_pic_type == P_SLICE;
    m_coming.gop_pos = m_engine.g_gop_pos;
    m_unit.assign(m_engine.get_nal_buffer(), m_engine.get_nal_buffer() + m_engine.get_nal_size());

    m_picture.manageRefBuffers();  // its reference is the reference again
    m_picture.g_frame = frame;
    for (int n = 0; n < repetitions; ++n) {
        m_next = 0;
        repeat(How::kInParts);
        repeat(How::kOneWorker);
        repeat(How::kPool);
    }
    m_picture.g_frame = nullptr;
    m_picture.manageRefBuffers();
    m_engine.reset_nal_buffer();
}

// What CEncoder::code_picture does, beginning with the rate controller's state at that time.
void TimedPicture::repeat(How how) {
    const rc_stream_t stream = m_engine.rate_control_stream();
    const unsigned capacity = static_cast<unsigned>(m_engine.g_nal_buf_size) * 8;
    std::copy(m_vectors.begin(), m_vectors.end(), m_picture.g_me_mb_L0.data());
    RateControl rate_control = m_rate_control;
    m_engine.reset_nal_buffer();

    restart_clock();
    if (m_engine.g_rc_enable) {
        rate_control.FrameLevelRateControl(stream, m_coming);
    }
    m_engine.writeNALbyte(0, 2, m_engine.g_idr_flag ? 5 : 1);
    m_engine.writeSliceHeader();
    m_picture.initFrameParams();
    if (m_coming.inter) {
        m_picture.framePredInitP();
    }
    if (how == How::kInParts) {
        note("before");
        code_in_parts();
    } else if (how == How::kOneWorker) {
        restart_clock();
        m_engine.rows.code_slice_data(m_engine.nal, capacity, nullptr, 1);
        note("one");
    } else {
        restart_clock();
        m_engine.rows.code_slice_data(m_engine.nal, capacity, &m_pool, m_pool.threads());
        note("several");
        note_time("start", -1, -1, 0, m_pool.start_nanoseconds());
    }

    restart_clock();
    const int bits = static_cast<int>(m_engine.nal.g_nal_bitpos);
    m_engine.writeNALUnit();
    if (m_engine.g_rc_enable) {
        rate_control.UpdateFrameLevelRateControl(stream, m_coming, m_picture.g_mbQp, bits,
                                                 m_engine.sum_of_distortions(),
                                                 m_picture.g_num_mbs);
    }
    if (how == How::kInParts) {
        note("after");
    }
    const std::uint8_t* unit = m_engine.get_nal_buffer();
    if (!std::equal(m_unit.begin(), m_unit.end(), unit, unit + m_engine.get_nal_size())) {
        throw std::runtime_error("a repetition gave another NAL unit");
    }
}

// What Wavefront::code_row does for one of several workers. The half-sample rows are built before
// the row that may need them, since it cannot be told from outside how long a macroblock builds.
void TimedPicture::code_in_parts() {
    const int width = m_picture.g_mb_width;
    const int height = m_picture.g_mb_height;
    constexpr int kMargin = 3;  // as in diamond.cpp
    MacroblockCoder& coder = *m_engine.rows.coders[0];
    m_skip_run = 0;
    for (int row = 0; row < height; ++row) {
        if (m_coming.inter) {
            const int built = m_picture.g_half_rows_end.load();
            restart_clock();
            m_picture.make_half_pixel_sds(
                std::min(16 * row + 17 + m_picture.g_search_range,
                         m_picture.g_height16 + m_picture.g_pad_luma - kMargin));
            note("half", row, -1, m_picture.g_half_rows_end.load() - built);
        }
        restart_clock();
        coder.bits = &coder.row_bits;
        coder.row_bits.reset();
        coder.g_skip_run = 0;
        coder.keep_first_run = m_coming.inter;
        coder.first_run = -1;
        note("begin", row);
        for (int column = 0; column < width; ++column) {
            coder.code_macroblock(column, row);
            if (row > 0 && column > 0) {
                coder.filter_mb(column - 1, row - 1);
            }
            if (row > 0 && column == width - 1) {
                coder.filter_mb(column, row - 1);
            }
            const int needs =
                m_coming.inter ? 16 * row + m_picture.g_me_mb_L0[row * width + column].y + 17 : 0;
            note("step", row, column, needs);
        }
        append_row(coder);
        note("append", row);
    }
    for (int column = 0; column < width; ++column) {
        coder.filter_mb(column, height - 1);
    }
    note("filter", height - 1);
}

void TimedPicture::append_row(MacroblockCoder& coder) {
    const bool has_run = coder.first_run >= 0;
    if (has_run) {
        m_engine.nal.write_uvlc_unsigned(static_cast<unsigned>(m_skip_run + coder.first_run));
    }
    m_engine.nal.append(coder.row_bits);
    m_skip_run = coder.g_skip_run + (has_run || !coder.keep_first_run ? 0 : m_skip_run);
}

// Notes the time since the clock was started or a part was noted.
void TimedPicture::note(const char* name, int row, int column, int detail) {
    const double time = nanoseconds(Clock::now() - m_last);
    note_time(name, row, column, detail, std::max(time - m_clock_cost, 0.0));
    restart_clock();
}

void TimedPicture::note_time(const char* name, int row, int column, int detail, double time) {
    if (m_next == m_parts.size()) {
        m_parts.push_back({name, row, column, detail, {}});
    }
    m_parts[m_next++].nanoseconds.push_back(time);
}

}  // namespace zolt_bench
