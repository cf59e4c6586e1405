#include "avc/ParameterSets.h"

#include <vector>

#include "avc/rbsp.h"

namespace zolt {
namespace {

// More than any valid set takes, but for one with explicit slice groups for every macroblock.
constexpr int kMaxBytes = 65536;

}  // namespace

void ParameterSets::add_seq_par_set(const unsigned char* nal, int size) {
    const auto set = SequenceParameterSet::read(rbsp_bytes(nal, size, kMaxBytes));
    if (set.is_valid && set.seq_parameter_set_id < seq_par_sets_.size()) {
        seq_par_sets_[set.seq_parameter_set_id] = set;
    }
}

void ParameterSets::add_pic_par_set(const unsigned char* nal, int size) {
    const std::vector<unsigned char> bytes = rbsp_bytes(nal, size, kMaxBytes);
    if (bytes.empty()) {
        return;
    }
    const auto set =
        PictureParameterSet::read(bytes.data() + 1, static_cast<int>(bytes.size()) - 1);
    if (set.is_valid && set.pic_parameter_set_id < pic_par_sets_.size() &&
        set.seq_parameter_set_id < seq_par_sets_.size()) {
        pic_par_sets_[set.pic_parameter_set_id] = set;
    }
}

const SequenceParameterSet* ParameterSets::seq_par_set(std::uint64_t id) const {
    return id < seq_par_sets_.size() && seq_par_sets_[id] ? &*seq_par_sets_[id] : nullptr;
}

const PictureParameterSet* ParameterSets::pic_par_set(std::uint64_t id) const {
    return id < pic_par_sets_.size() && pic_par_sets_[id] ? &*pic_par_sets_[id] : nullptr;
}

}  // namespace zolt
