#include "avc/rbsp.h"

#include <algorithm>
#include <cstddef>

#include "avc/BitStreamReader.h"

namespace zolt {

std::vector<unsigned char> rbsp_bytes(const unsigned char* nal, int size, int max_bytes) {
    std::vector<unsigned char> bytes;
    const auto limit = static_cast<std::size_t>(std::max(0, std::min(size, max_bytes)));
    bytes.reserve(limit);
    int zeros = 0;
    for (int i = 0; i < size && bytes.size() < limit; ++i) {
        if (zeros >= 2 && nal[i] == 3) {
            zeros = 0;
            continue;
        }
        zeros = nal[i] == 0 ? zeros + 1 : 0;
        bytes.push_back(nal[i]);
    }
    return bytes;
}

std::uint32_t read_ue(BitStreamReader& reader) {
    return static_cast<std::uint32_t>(std::min<std::uint64_t>(reader.ReadExpGolomb(), UINT32_MAX));
}

std::uint32_t read_log2_field(BitStreamReader& reader, std::uint32_t log2_minus4) {
    return reader.ReadUnsInt4(static_cast<int>(std::min(log2_minus4, 32U)) + 4);
}

}  // namespace zolt
