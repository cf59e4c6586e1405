#include "encoder/kernels/Kernels.h"

namespace zolt {

const Kernels& best_kernels() {
    return scalar_kernels();
}

}  // namespace zolt
