#pragma once

#include <algorithm>
#include <cstdint>

#include "avc/BitStreamReader.h"

namespace zolt {

// ue(v) in 32 bits; only codes that are no valid syntax element exceed them.
inline std::uint32_t read_ue(BitStreamReader& reader) {
    return static_cast<std::uint32_t>(std::min<std::uint64_t>(reader.ReadExpGolomb(), UINT32_MAX));
}

}  // namespace zolt
