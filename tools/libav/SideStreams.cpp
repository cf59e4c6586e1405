#include "libav/SideStreams.h"

#include <algorithm>
#include <new>

namespace zolt {

void SideStreams::keep(int index) {
    const std::lock_guard<std::mutex> lock(mutex_);
    kept_.push_back(index);
}

void SideStreams::settle() {
    const std::lock_guard<std::mutex> lock(mutex_);
    settled_ = true;
    packets_.erase(std::remove_if(packets_.begin(), packets_.end(),
                                  [this](const auto& packet) { return !is_kept(*packet); }),
                   packets_.end());
}

void SideStreams::push(const AVPacket& packet) {
    const std::lock_guard<std::mutex> lock(mutex_);
    if (settled_ && !is_kept(packet)) {
        return;
    }
    LibavPtr<AVPacket> reference(av_packet_clone(&packet));
    if (!reference) {
        throw std::bad_alloc();
    }
    packets_.push_back(std::move(reference));
}

bool SideStreams::pop(AVPacket* packet) {
    const std::lock_guard<std::mutex> lock(mutex_);
    if (packets_.empty()) {
        return false;
    }
    av_packet_move_ref(packet, packets_.front().get());
    packets_.pop_front();
    return true;
}

bool SideStreams::is_kept(const AVPacket& packet) const {
    return std::find(kept_.begin(), kept_.end(), packet.stream_index) != kept_.end();
}

}  // namespace zolt
