#pragma once

#include <cstddef>

class IConfigVideoAvc;

namespace zolt {

// SliceQPY (ITU-T H.264 clause 7.4.3) of `nal`, a bare slice NAL unit of a progressive stream with
// the parameter sets of `stream`, pic_order_cnt_type 0, and no reordering, weighting or marking
// commands in its slice headers.
int slice_qp(IConfigVideoAvc& stream, const unsigned char* nal, std::size_t size);

}  // namespace zolt
