#include "kernels/Kernels.h"

#if defined(__x86_64__) || defined(__i386__)
#define ZOLT_X86 1
#include "kernels/x86_tables.h"
#endif

namespace zolt {

const Kernels& best_kernels() {
    return *(kernel_tables().end() - 1);
}

KernelTables kernel_tables() {
    struct Tables {
        Kernels table[4] = {scalar_kernels()};
        int count = 1;

        Tables() {
#ifdef ZOLT_X86
            __builtin_cpu_init();
            if (__builtin_cpu_supports("sse2")) {
                table[count] = with_sse2_color(with_sse2(table[count - 1]));
                ++count;
            }
            if (__builtin_cpu_supports("avx2")) {
                table[count] = with_avx2_color(with_avx2(table[count - 1]));
                ++count;
            }
            // Processors with VBMI do not lower their clock for 512-bit vectors as older ones do.
            if (__builtin_cpu_supports("avx512bw") && __builtin_cpu_supports("avx512vl") &&
                __builtin_cpu_supports("avx512dq") && __builtin_cpu_supports("avx512vbmi")) {
                table[count] = with_avx512(table[count - 1]);
                ++count;
            }
#endif
        }
    };
    static const Tables tables;
    return {tables.table, tables.table + tables.count};
}

}  // namespace zolt
