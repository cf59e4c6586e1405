#include "avc/rbsp.h"

#include <algorithm>
#include <cstddef>

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

}  // namespace zolt
