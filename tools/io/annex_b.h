#pragma once

namespace zolt {

// What stands before each NAL unit of the Annex B streams that the tools write: start_code_prefix
// and zero_byte, clause B.1.1.
constexpr unsigned char kStartCode[] = {0, 0, 0, 1};

}  // namespace zolt
