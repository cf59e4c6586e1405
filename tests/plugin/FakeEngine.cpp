#include "FakeEngine.h"

#include <algorithm>
#include <cstdio>

#include "encoder/CEncoder.h"

std::vector<std::string> FakeEngine::calls;
std::vector<unsigned char> FakeEngine::frame;
const void* FakeEngine::address = nullptr;
int FakeEngine::alive = 0;

std::string FakeEngine::take_calls() {
    std::string text;
    for (const std::string& call : calls) {
        text += call + " ";
    }
    calls.clear();
    return text;
}

namespace {

void note(const char* call) {
    FakeEngine::calls.emplace_back(call);
}

void note(const char* call, double value) {
    char text[80];
    std::snprintf(text, sizeof text, "%s=%.10g", call, value);
    FakeEngine::calls.emplace_back(text);
}

}  // namespace

// The rooms of the engine hold no more than the size.
Picture::Picture(int width, int height, const zolt::Kernels&) : g_width(width), g_height(height) {}
Picture::~Picture() = default;
Wavefront::Wavefront(Picture& shared) : picture(shared) {}
void Wavefront::run_worker(int worker) {
    note("worker", worker);
}
RateControl::RateControl(int, int) {}

CEncoder::CEncoder(int width, int height, const zolt::Kernels*)
    : picture(width, height, zolt::scalar_kernels()), rows(picture), rate_control(width, height) {
    note("width", width);
    note("height", height);
    nal.g_nal_buf.allocate(16);
    ++FakeEngine::alive;
}

CEncoder::~CEncoder() {
    --FakeEngine::alive;
}

void CEncoder::set_qp(int q) {
    note("qp", q);
}

int CEncoder::set_bit_rate(int bps) {
    note("bit_rate", bps);
    return 0;
}

double CEncoder::set_frame_rate(double fps) {
    note("frame_rate", fps);
    return 0;
}

unsigned CEncoder::set_intra_period(int n) {
    note("intra", n);
    g_intra_period = static_cast<unsigned>(n);
    return 0;
}

unsigned CEncoder::set_inter_period(int n) {
    note("inter", n);
    return 0;
}

void CEncoder::initialize_encoder() {
    note("initialize");
}

void CEncoder::encode_sps() {
    note("sps");
    const std::uint8_t unit[] = {0x47, 1, 2};
    std::copy(unit, unit + 3, nal.g_nal_buf.data());
    nal.g_nal_bitpos = 24;
}

void CEncoder::encode_pps() {
    note("pps");
    const std::uint8_t unit[] = {0x48, 3};
    std::copy(unit, unit + 2, nal.g_nal_buf.data());
    nal.g_nal_bitpos = 16;
}

void CEncoder::encode_frame(const void* frame) {
    note("encode");
    FakeEngine::address = frame;
    const auto* bytes = static_cast<const unsigned char*>(frame);
    FakeEngine::frame.assign(bytes, bytes + picture.g_width * picture.g_height * 3 / 2);
    nal.g_nal_buf[0] = g_frame_counter % g_intra_period == 0 ? 0x65 : 0x41;
    nal.g_nal_buf[1] = static_cast<std::uint8_t>(g_frame_counter);
    nal.g_nal_bitpos = 16;
    ++g_frame_counter;
    if (g_worker_pool != nullptr) {
        note("threads", g_worker_pool->threads());
        g_worker_pool->run(rows, 2);
    }
}

int CEncoder::copy_nal_unit(void* dst, int max) const {
    const int size = std::min(get_nal_size(), max);
    std::copy_n(nal.g_nal_buf.data(), size, static_cast<std::uint8_t*>(dst));
    return size;
}

void CEncoder::ResetNALUnit() {
    note("reset");
    nal.g_nal_bitpos = 0;
}
